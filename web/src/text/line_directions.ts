// SPDX-License-Identifier: Apache-2.0
// A line begins on the side on which its first letter does: on the right in Hebrew and Arabic.
import { RangeSetBuilder } from "@codemirror/state";
import { Decoration, type DecorationSet, EditorView, ViewPlugin, type ViewUpdate } from "@codemirror/view";

const LINE = Decoration.line({ attributes: { dir: "auto" } });

/** Lets each line that is seen have its own direction, which the arrow keys follow. */
export const lineDirections = [
  EditorView.perLineTextDirection.of(true),
  ViewPlugin.fromClass(
    class {
      decorations: DecorationSet;

      constructor(view: EditorView) {
        this.decorations = seenLines(view);
      }

      update(update: ViewUpdate) {
        if (update.docChanged || update.viewportChanged) {
          this.decorations = seenLines(update.view);
        }
      }
    },
    { decorations: (plugin) => plugin.decorations },
  ),
];

function seenLines({ state, viewport }: EditorView): DecorationSet {
  const builder = new RangeSetBuilder<Decoration>();
  for (let at = viewport.from; at <= viewport.to; ) {
    const { from, to } = state.doc.lineAt(at);
    builder.add(from, from, LINE);
    at = to + 1;
  }
  return builder.finish();
}
