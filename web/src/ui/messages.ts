// SPDX-License-Identifier: Apache-2.0
// Lines that tell what has happened. Screen readers read them out, too.
import { button, element } from "./dom.js";
import { text } from "./text.js";

const SHOWN = 6000; // ms that an information stays; a problem stays until it is closed
const MOST = 4;

export class Messages {
  readonly element = element("div", { className: "messages" });
  #information = element("div", { role: "status" });
  #problems = element("div", { role: "alert" });

  constructor() {
    this.element.append(this.#problems, this.#information);
  }

  tell(message: string, kind: "information" | "problem" = "information"): void {
    const list = kind === "problem" ? this.#problems : this.#information;
    for (const shown of [...list.children]) {
      if (shown.firstChild?.textContent === message) {
        shown.remove(); // rather than twice
      }
    }
    const line = element("p", { className: kind }, element("span", {}, message));
    const close = button("\u00d7", () => line.remove(), { "aria-label": text("messages.close") });
    line.append(close);
    list.append(line);
    while (list.children.length > MOST) {
      list.firstElementChild?.remove();
    }
    if (kind === "information") {
      setTimeout(() => line.remove(), SHOWN);
    }
  }
}
