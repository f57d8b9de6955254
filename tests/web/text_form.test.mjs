// SPDX-License-Identifier: Apache-2.0
// Line ends, charset and byte-order mark of a text, through edits and back.
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "./room.mjs";

const form = await room("../../tests/web/text_form.ts");
const { EditorState, LINE_ENDS, encodeFile, fileForm, fileFormOf, fromStored, history, piecesOf, redo, setFileForm, splitLines, storable, undo, uniform } = form;
const charsets = new form.Charsets(() => Promise.reject(new Error("no tables here")));
const UTF8 = await charsets.open("UTF-8");
const UTF16 = await charsets.open("UTF-16BE");

function stateOf(text, { charset = UTF8, byteOrderMark = false } = {}) {
  const { doc, lineEnds } = splitLines(text);
  return EditorState.create({ doc, extensions: [history({ newGroupDelay: 0 }), fileForm({ charset, byteOrderMark, lineEnds })] });
}

const textOf = (state) => [...piecesOf(state.doc, fileFormOf(state).lineEnds)].join("");
const bytesOf = (state) => Buffer.from(encodeFile(state.doc, fileFormOf(state)).bytes);

// The state behind an editor's command, which undo and redo are.
function after(state, command) {
  let result = state;
  command({ state, dispatch: (transaction) => (result = transaction.state) });
  return result;
}

function* pseudorandom(seed) {
  for (let state = seed; ; ) {
    state = (Math.imul(state, 1664525) + 1013904223) >>> 0;
    yield state / 2 ** 32;
  }
}

test("a text that is not edited keeps the end of each line", () => {
  for (const text of ["", "\n", "\r", "\r\n", "\n\r", "a\nb\r\nc\rd\r\r\n\n", "a\u0085b\u2028c\vd\r", "\r\r\r\n\n\n\r"]) {
    assert.equal(textOf(stateOf(text)), text, JSON.stringify(text));
  }
});

test("the usual end is the commonest, and LF where there is none", () => {
  assert.equal(splitLines("a\r\nb\r\nc\nd").lineEnds.usual, "\r\n");
  assert.equal(splitLines("a\rb\rc\nd").lineEnds.usual, "\r");
  assert.equal(splitLines("a").lineEnds.usual, "\n");
});

test("new lines end as usual, and those around them as they did", () => {
  const state = stateOf("a\r\nb\nc\r\nd");
  assert.equal(textOf(state.update({ changes: { from: 3, insert: "x\ny" } }).state), "a\r\nbx\r\ny\nc\r\nd");
  assert.equal(textOf(state.update({ changes: { from: 4, insert: "z\n" } }).state), "a\r\nb\nz\r\nc\r\nd");
});

test("a line end that is deleted comes back as it was when that is undone", () => {
  const state = stateOf("a\r\nb\nc\r\nd\re");
  const joined = state.update({ changes: { from: 1, to: 8 } }).state;
  assert.equal(textOf(joined), "ae");
  const undone = after(joined, undo);
  assert.equal(textOf(undone), "a\r\nb\nc\r\nd\re");
  assert.equal(textOf(after(undone, redo)), "ae");
});

test("edits of any kind, all undone, leave the bytes, whatever the line ends", () => {
  for (let seed = 1; seed <= 200; ++seed) {
    const random = pseudorandom(seed);
    const below = (limit) => Math.floor(random.next().value * limit);
    const text = Array.from({ length: 1 + below(12) }, () => "xy".repeat(below(3)) + LINE_ENDS[below(3)]).join("");
    const start = stateOf(text);
    let state = start;
    let edits = 0;
    for (let left = 1 + below(8); left > 0; --left) {
      const from = below(state.doc.length + 1);
      const to = Math.min(state.doc.length, from + below(5));
      const insert = state.toText(["", "q", "\n", "q\nr\n"][below(4)]);
      const effects = below(6) === 0 ? [setFileForm.of({ ...fileFormOf(state), lineEnds: uniform(LINE_ENDS[below(3)]) })] : [];
      if (from === to && insert.length === 0 && effects.length === 0) {
        continue;
      }
      state = state.update(effects.length > 0 ? { effects } : { changes: { from, to, insert } }).state;
      ++edits;
    }
    const end = textOf(state);
    assert.equal(end.replace(/\r\n?/g, "\n"), state.doc.toString(), `seed ${seed}`);
    for (let left = edits; left > 0; --left) {
      state = after(state, undo);
    }
    assert.equal(textOf(state), text, `seed ${seed}`);
    for (let left = edits; left > 0; --left) {
      state = after(state, redo);
    }
    assert.equal(textOf(state), end, `seed ${seed}`);
  }
});

test("another charset, mark or line end is undone as an edit is", () => {
  const state = stateOf("a\r\nb\nc\r\n", { byteOrderMark: true });
  const changed = state.update({ effects: setFileForm.of({ charset: UTF16, byteOrderMark: false, lineEnds: uniform("\r") }) }).state;
  assert.equal(bytesOf(changed).toString("hex"), "0061000d0062000d0063000d");
  assert.equal(bytesOf(after(changed, undo)).toString("latin1"), "\xef\xbb\xbfa\r\nb\nc\r\n");
});

test("line ends that were stored are those that they were", () => {
  const { lineEnds } = splitLines("a\r\nb\nc\r\nd\re\r\n");
  const stored = JSON.parse(JSON.stringify(storable(lineEnds)));
  const { doc } = splitLines("a\nb\nc\nd\ne\n");
  assert.equal([...piecesOf(doc, fromStored(lineEnds.usual, stored))].join(""), "a\r\nb\nc\r\nd\re\r\n");
});

test("what a charset lacks is counted, and the first of it is found, also far behind", () => {
  const before = "line\n".repeat(50_000);
  const { lacking } = encodeFile(stateOf(`${before}ab\ud800\n\udc00\ud800`).doc, fileFormOf(stateOf("")));
  assert.deepEqual({ ...lacking, characters: lacking.characters.size }, { characters: 2, count: 3, first: before.length + 2 });
  assert.equal(encodeFile(stateOf(before).doc, fileFormOf(stateOf(""))).lacking, undefined);
});

test("a draft tells what a save of it sends", async () => {
  const { ChangeSet, contentOf, makeDraft } = form;
  const draftOf = (charset) => {
    const state = stateOf("a\r\nb\nc\r\n\u6e2f", { charset, byteOrderMark: true });
    const changes = ChangeSet.of([{ from: 1, insert: "\n" }, { from: 2, to: 3 }], state.doc.length);
    const { state: edited } = state.update({ changes });
    const base = new Blob([Buffer.from("a\r\nb\nc\r\n\u6e2f")]); // in the charset that it was read in
    return { edited, draft: makeDraft(base, "UTF-8", changes, fileFormOf(edited)) };
  };
  for (const charset of [UTF8, UTF16]) {
    const { edited, draft } = draftOf(charset);
    const content = bytesOf(edited).toString("latin1");
    assert.deepEqual(await contentOf(structuredClone(draft), charsets), { kind: "text", content, encoding: charset.name });
  }
  const { draft } = draftOf(UTF8);
  const half = ChangeSet.of({ from: 0, insert: "\ud83d" }, 7).toJSON(); // of which a save asks
  assert.equal(await contentOf({ ...draft, changes: half }, charsets), undefined);
});
