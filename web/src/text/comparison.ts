// SPDX-License-Identifier: Apache-2.0
// Two states of a text beside each other: theirs, and the person's own, which becomes the result.
import { MergeView } from "@codemirror/merge";
import { ChangeSet, EditorState, type Extension, type Text } from "@codemirror/state";
import { EditorView } from "@codemirror/view";
import { element, mergeArrow } from "../ui/dom.js";

export interface Side {
  label: string;
  doc: Text;
  extensions: Extension;
}

export class TextComparison {
  readonly element = element("div", { className: "text-comparison" });
  #merge: MergeView;
  #changes: ChangeSet;

  /** `take` is what the arrows say that bring a change over from theirs. */
  constructor(theirs: Side, mine: Side, take: string) {
    this.#changes = ChangeSet.empty(mine.doc.length);
    const collect = EditorView.updateListener.of((update) => {
      this.#changes = this.#changes.compose(update.changes);
    });
    const labels = element("div", { className: "labels" });
    labels.append(element("span", {}, theirs.label), element("span", {}, mine.label));
    this.element.append(labels);
    this.#merge = new MergeView({
      a: { doc: theirs.doc, extensions: [theirs.extensions, EditorState.readOnly.of(true)] },
      b: { doc: mine.doc, extensions: [mine.extensions, collect] },
      parent: this.element,
      revertControls: "a-to-b",
      renderRevertControl: () => mergeArrow(take),
      collapseUnchanged: { margin: 3, minSize: 6 },
      // Where texts differ much, rather a coarse answer than none.
      diffConfig: { scanLimit: 500, timeout: 1000 },
    });
  }

  /** What was changed of the person's own text. */
  get changes(): ChangeSet {
    return this.#changes;
  }

  get result(): EditorState {
    return this.#merge.b.state;
  }

  close(): void {
    this.#merge.destroy();
  }
}
