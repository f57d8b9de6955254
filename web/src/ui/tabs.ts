// SPDX-License-Identifier: Apache-2.0
// The tabs of the open documents, after the WAI-ARIA pattern: one of them is in the order of the Tab key,
// the arrow keys go on from there, Delete closes.
import { button, element } from "./dom.js";
import type { OpenDocument } from "./open_document.js";
import { text } from "./text.js";

export class Tabs {
  readonly element = element("div", { role: "tablist", className: "tabs", "aria-label": text("tabs.title") });

  #shown: readonly OpenDocument[] = [];
  #active: OpenDocument | undefined;
  #looks = "";

  constructor(
    private select: (document: OpenDocument) => void,
    private close: (document: OpenDocument) => void,
  ) {
    this.element.addEventListener("keydown", (event) => this.#key(event));
  }

  show(documents: readonly OpenDocument[], active: OpenDocument | undefined): void {
    const looks = JSON.stringify([active?.id, ...documents.map((one) => [one.id, one.marks()])]);
    if (looks === this.#looks) {
      return;
    }
    this.#looks = looks;
    const hadFocus = this.element.contains(document.activeElement);
    this.#shown = documents;
    this.#active = active;
    this.element.replaceChildren(...documents.map((one) => this.#tab(one, one === active)));
    this.element.querySelector(".active")?.scrollIntoView({ block: "nearest", inline: "nearest" });
    if (hadFocus) {
      this.focus();
    }
  }

  focus(): void {
    this.element.querySelector<HTMLElement>('[aria-selected="true"]')?.focus();
  }

  #tab(one: OpenDocument, isActive: boolean): HTMLElement {
    const marks = one.marks();
    const label = element(
      "span",
      {
        role: "tab",
        id: `tab-${one.id}`,
        tabIndex: isActive ? 0 : -1,
        title: one.path,
        "aria-selected": isActive,
        "aria-controls": one.panel.id,
      },
      ...marks.map((mark) => element("span", { className: `mark ${mark}`, role: "img", "aria-label": text(`tabs.${mark}`) })),
      one.name,
    );
    label.addEventListener("click", () => this.select(one));
    label.addEventListener("auxclick", (event) => event.button === 1 && this.close(one));
    // For the mouse; a list of tabs may hold nothing else for screen readers, which have Delete.
    const close = button("×", () => this.close(one), {
      "aria-hidden": true,
      title: text("tabs.close", { name: one.name }),
      tabIndex: -1,
    });
    return element("div", { role: "presentation", className: isActive ? "tab active" : "tab" }, label, close);
  }

  #key(event: KeyboardEvent): void {
    const index = this.#shown.indexOf(this.#active!);
    const last = this.#shown.length - 1;
    const steps: Record<string, number> = {
      ArrowLeft: index > 0 ? index - 1 : last,
      ArrowRight: index < last ? index + 1 : 0,
      Home: 0,
      End: last,
    };
    const next = this.#shown[steps[event.key] ?? -1];
    if (next) {
      event.preventDefault();
      this.select(next);
      this.focus();
    } else if (event.key === "Delete" && this.#active) {
      event.preventDefault();
      this.close(this.#active);
    }
  }
}
