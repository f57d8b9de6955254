// SPDX-License-Identifier: Apache-2.0
// Marks the characters that the file's charset lacks, among those that are seen.
import { RangeSetBuilder } from "@codemirror/state";
import { Decoration, type DecorationSet, type EditorView, ViewPlugin, type ViewUpdate } from "@codemirror/view";
import { ByteSink } from "./charsets/index.js";
import { fileFormOf } from "./file_form.js";

/** `title` is what a character that is marked says when it is pointed at. */
export function lackingCharacters(title: (charset: string) => string) {
  return ViewPlugin.fromClass(
    class {
      decorations: DecorationSet;

      constructor(view: EditorView) {
        this.decorations = marks(view, title);
      }

      update(update: ViewUpdate) {
        const isSameCharset = fileFormOf(update.startState).charset === fileFormOf(update.state).charset;
        if (update.docChanged || update.viewportChanged || !isSameCharset) {
          this.decorations = marks(update.view, title);
        }
      }
    },
    { decorations: (plugin) => plugin.decorations },
  );
}

function marks(view: EditorView, title: (charset: string) => string): DecorationSet {
  const { charset } = fileFormOf(view.state);
  const builder = new RangeSetBuilder<Decoration>();
  if (!charset.canEncode) {
    return builder.finish();
  }
  const mark = Decoration.mark({ class: "lacking", attributes: { title: title(charset.name) } });
  for (const { from, to } of view.visibleRanges) {
    const text = view.state.sliceDoc(from, to);
    for (const lacking of charset.encode(text, new ByteSink(4 * text.length))) {
      builder.add(from + lacking.from, from + lacking.to, mark);
    }
  }
  return builder.finish();
}
