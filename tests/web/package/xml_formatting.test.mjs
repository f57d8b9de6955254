// SPDX-License-Identifier: Apache-2.0
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "../room.mjs";
import { generateXml, generator } from "./generated.mjs";

const { EditorState, copiedLayout, findXmlError, formatXml, history, keepLayout, layout, redo, undo, withoutLayout } =
  await room(
    "package/xml_formatting.ts",
    "package/xml_scanner.ts",
    "npm:@codemirror/state",
    "npm:@codemirror/commands",
  );

class Editor {
  constructor(xml) {
    const formatted = formatXml(xml);
    const extensions = [layout(formatted), history({ newGroupDelay: 0 }), EditorState.lineSeparator.of("\n")];
    this.state = EditorState.create({ doc: formatted.text, extensions });
  }

  change(changes) {
    this.state = this.state.update({ changes }).state;
  }

  run(command) {
    return command({ state: this.state, dispatch: (transaction) => (this.state = transaction.state) });
  }

  get shown() {
    return this.state.sliceDoc();
  }

  get saved() {
    return withoutLayout(this.state);
  }
}

test("elements that hold elements are laid out, text is left alone", () => {
  assert.equal(
    formatXml(`<?xml version="1.0"?><a><b><c/><!-- d --></b><e>text<f/></e><g></g></a>`).text,
    `<?xml version="1.0"?>\n<a>\n  <b>\n    <c/>\n    <!-- d -->\n  </b>\n  <e>text<f/></e>\n  <g></g>\n</a>`,
  );
});

test("nothing is put in where white space means something or stands already", () => {
  for (const xml of [
    "<a>\n <b/>\n</a>",
    '<a xml:space="preserve"><b><c/></b></a>',
    "<a>x<b><c/></b></a>",
    "<a><![CDATA[x]]><b/></a>",
    "<a>&#32;<b/></a>",
  ]) {
    assert.equal(formatXml(xml).text, xml);
  }
});

test("what is deep does not take space by its square", () => {
  const xml = `${"<a>".repeat(20_000)}<b/>${"</a>".repeat(20_000)}`;
  assert.ok(formatXml(xml).text.length < 40 * xml.length);
});

test("every document comes back from its layout", () => {
  for (let seed = 0; seed < 1000; ++seed) {
    const xml = generateXml(generator(seed));
    const editor = new Editor(xml);
    assert.equal(editor.saved, xml);
    assert.equal(findXmlError(editor.shown), undefined);
  }
});

test("what is typed is kept and the layout is not, wherever it is typed", () => {
  const editor = new Editor("<a><b/></a>");
  assert.equal(editor.shown, "<a>\n  <b/>\n</a>");
  editor.change({ from: 5, insert: "x" }); // in the middle of the layout
  assert.equal(editor.saved, "<a>x<b/></a>");
  editor.change({ from: 3, insert: "y" }); // at its beginning
  editor.change({ from: editor.shown.indexOf("<b"), insert: "\n\n" }); // at its end
  assert.equal(editor.saved, "<a>yx\n\n<b/></a>");
});

test("layout that was deleted is layout again when that is undone", () => {
  const editor = new Editor("<a><b/><c/></a>");
  const { shown } = editor;
  editor.change({ from: 2, to: shown.indexOf("<c") + 1, insert: "!" });
  assert.equal(editor.saved, "<a!c/></a>");
  editor.run(undo);
  assert.equal(editor.shown, shown);
  assert.equal(editor.saved, "<a><b/><c/></a>");
  editor.run(redo);
  assert.equal(editor.saved, "<a!c/></a>");
});

test("the layout is saved when that is asked for", () => {
  const editor = new Editor("<a><b/></a>");
  editor.state = editor.state.update({ effects: keepLayout.of(null) }).state;
  assert.equal(editor.saved, "<a>\n  <b/>\n</a>");
});

test("layout that is copied into another editor is layout there", () => {
  const source = new Editor("<a><b/><c><d/></c></a>");
  const target = new Editor("<a><b/></a>");
  const [from, to] = [source.shown.indexOf("  <c>"), source.shown.indexOf("</a>")];
  const at = target.shown.indexOf("</a>");
  const changes = { from: at, insert: source.shown.slice(from, to) };
  target.state = target.state.update({ changes, effects: copiedLayout(source.state, { from, to }, at) }).state;
  assert.equal(target.shown, source.shown);
  assert.equal(target.saved, source.saved);
});

// Each character with whether it is layout: what the editor is to keep account of.
test("any edits, undone and done again, save what was edited", () => {
  for (let seed = 0; seed < 400; ++seed) {
    const next = generator(seed);
    const editor = new Editor(generateXml(next));
    const { gaps } = formatXml(editor.saved);
    const inGap = (index) => gaps.findLastIndex((at) => at <= index) % 2 === 0;
    let characters = Array.from({ length: editor.shown.length }, (_, index) => [editor.shown[index], inGap(index)]);
    const states = [];
    const saved = () => characters.map(([character, isLayout]) => (isLayout ? "" : character)).join("");
    for (let count = 0; count < 12; ++count) {
      const from = next(characters.length + 1);
      const to = Math.min(characters.length, from + next(3) * next(12));
      const insert = ["", "x", "\n  ", "<y>"][next(4)];
      if (from === to && insert === "") {
        continue;
      }
      states.push(characters);
      characters = [
        ...characters.slice(0, from),
        ...Array.from(insert, (one) => [one, false]),
        ...characters.slice(to),
      ];
      editor.change({ from, to, insert });
      assert.equal(editor.saved, saved(), `seed ${seed}, edit ${count}`);
    }
    const last = saved();
    const steps = states.length;
    while (states.length > 0) {
      characters = states.pop();
      editor.run(undo);
      assert.equal(editor.saved, saved(), `seed ${seed}, undone to ${states.length}`);
    }
    for (let count = 0; count < steps; ++count) {
      editor.run(redo);
    }
    assert.equal(editor.saved, last);
  }
});
