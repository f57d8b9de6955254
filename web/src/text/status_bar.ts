// SPDX-License-Identifier: Apache-2.0
// The line below a text: where the cursor is, and the form of the file, which is changed here, too.
import type { EditorState } from "@codemirror/state";
import type { Page } from "../document_view.js";
import { element } from "../ui/dom.js";
import { grouped } from "./charset_groups.js";
import { fileFormOf } from "./file_form.js";
import { LINE_ENDS, type LineEnd } from "./lines.js";

const LINE_END_NAMES: Record<LineEnd, string> = { "\n": "LF", "\r\n": "CRLF", "\r": "CR" };

export interface StatusBarActions {
  charsetChosen(name: string): void;
  lineEndChosen(lineEnd: LineEnd): void;
  byteOrderMarkChosen(isThere: boolean): void;
  wrapChosen(wraps: boolean): void;
}

export class StatusBar {
  readonly element = element("div", { className: "status-line text-status" });
  #position = element("span", { className: "position" });
  #charset = element("select");
  #lineEnd = element("select");
  #mark = element("input", { type: "checkbox" });
  #wrap = element("input", { type: "checkbox" });

  constructor(
    private page: Page,
    actions: StatusBarActions,
  ) {
    const markLabel = element("label", {}, this.#mark, page.text("text.mark"));
    const wrapLabel = element("label", {}, this.#wrap, page.text("text.wrap"));
    this.#charset.setAttribute("aria-label", page.text("text.charset"));
    this.#lineEnd.setAttribute("aria-label", page.text("text.lineEnds"));
    this.#lineEnd.append(
      ...LINE_ENDS.map((lineEnd) => element("option", { value: lineEnd }, LINE_END_NAMES[lineEnd])),
      element("option", { value: "mixed", disabled: true }, page.text("text.mixed")),
    );
    this.#charset.addEventListener("change", () => actions.charsetChosen(this.#charset.value));
    this.#lineEnd.addEventListener("change", () => actions.lineEndChosen(this.#lineEnd.value as LineEnd));
    this.#mark.addEventListener("change", () => actions.byteOrderMarkChosen(this.#mark.checked));
    this.#wrap.addEventListener("change", () => actions.wrapChosen(this.#wrap.checked));
    this.element.append(this.#position, wrapLabel, markLabel, this.#lineEnd, this.#charset);
  }

  /** Offers the charsets `names`. */
  offer(names: readonly string[], state: EditorState): void {
    const groups = grouped(names).map(([group, members]) => {
      const options = members.map((name) => element("option", { value: name }, name));
      return element("optgroup", { label: this.page.text(`text.group.${group}`) }, ...options);
    });
    this.#charset.replaceChildren(...groups);
    this.show(state);
  }

  show(state: EditorState): void {
    const { charset, byteOrderMark, lineEnds } = fileFormOf(state);
    const { head } = state.selection.main;
    const line = state.doc.lineAt(head);
    this.#position.textContent = this.page.text("text.position", { line: line.number, column: head - line.from + 1 });
    this.#showCharset(charset.name);
    this.#lineEnd.value = lineEnds.exceptions.size > 0 ? "mixed" : lineEnds.usual;
    this.#mark.checked = byteOrderMark && charset.mayHaveMark;
    this.#mark.disabled = !charset.mayHaveMark || state.readOnly;
    this.#lineEnd.disabled = state.readOnly;
  }

  // One that is not offered is shown all the same.
  #showCharset(name: string): void {
    if (this.#charset.value === name) {
      return;
    }
    this.#charset.value = name;
    if (this.#charset.value !== name) {
      this.#charset.prepend(element("option", { value: name }, name));
      this.#charset.value = name;
    }
  }
}
