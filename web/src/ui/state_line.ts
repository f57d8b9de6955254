// SPDX-License-Identifier: Apache-2.0
// The line at the bottom: the connection, what has become of the last save, language and colours.
import type { ConnectionState } from "../connection/connection.js";
import { lastingStore } from "../storage.js";
import { button, element } from "./dom.js";
import { LANGUAGES, currentLanguage, text } from "./text.js";
import { THEMES, type Theme, chosenTheme, useTheme } from "./theme.js";

export class StateLine {
  readonly element: HTMLElement;
  #connection = element("span", { className: "connection", role: "status" });
  #document = element("span", { className: "document", role: "status" });
  #cancel: HTMLButtonElement;
  #theme: HTMLSelectElement;

  /** `keepDrafts` is waited for before the page is loaded again in another language. */
  constructor(
    private keepDrafts: () => Promise<void>,
    cancelSave: () => void,
  ) {
    this.#cancel = button(text("action.cancel"), cancelSave);
    this.#theme = select(
      text("page.theme"),
      Object.fromEntries(THEMES.map((theme) => [theme, text(`theme.${theme}`)])),
      chosenTheme(),
      (theme) => useTheme(theme as Theme),
    );
    const language = select(text("page.language"), LANGUAGES, currentLanguage(), (chosen) => void this.#speak(chosen));
    this.element = element("footer", { className: "status-line state" }, this.#connection, this.#document, this.#cancel, language, this.#theme);
  }

  connection(state: ConnectionState): void {
    this.#connection.dataset.state = state;
    const isNone = ["unreachable", "refused", "closed"].includes(state);
    this.#connection.textContent = text(isNone ? "connection.none" : `connection.${state}`);
  }

  document(status: string, canCancel: boolean): void {
    if (this.#document.textContent !== status) {
      this.#document.textContent = status;
    }
    this.#cancel.hidden = !canCancel;
  }

  focus(): void {
    this.#theme.focus();
  }

  async #speak(language: string): Promise<void> {
    lastingStore.setItem("language", language);
    await this.keepDrafts();
    location.reload();
  }
}

function select(
  label: string,
  choices: Record<string, string>,
  chosen: string,
  changed: (value: string) => void,
): HTMLSelectElement {
  const options = Object.entries(choices).map(([value, name]) => element("option", { value, selected: value === chosen }, name));
  const made = element("select", { "aria-label": label, title: label }, ...options);
  made.addEventListener("change", () => changed(made.value));
  return made;
}
