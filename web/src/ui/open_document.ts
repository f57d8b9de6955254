// SPDX-License-Identifier: Apache-2.0
// A document that is open: it is read, shown in a panel by the view of its kind, and followed when
// somebody else saves it.
import { AskAgain, type Client, type Progress } from "../../client/src/index.js";
import type { Choice, DocumentView, LoadedDocument, Page, ViewFactory } from "../document_view.js";
import { load } from "../files/loading.js";
import { isPackage, nameOf } from "../files/paths.js";
import { ask } from "./dialog.js";
import { button, element } from "./dom.js";
import { bytesText, text } from "./text.js";

/** What an open document needs of the page around it. */
export interface Surroundings {
  readonly client: Client;
  tell(message: string, kind?: "information" | "problem"): void;
  /** The document's marks have changed. */
  update(): void;
}

/** What there is to say of an open document beside its name. */
export type Mark = "unsaved" | "theirs";

let opened = 0;

export class OpenDocument {
  readonly id = ++opened;
  readonly panel = element("div", { role: "tabpanel", id: `panel-${this.id}`, className: "panel", tabIndex: -1 });
  readonly name: string;
  isUnsaved = false;
  #view: DocumentView | undefined;
  #loaded: LoadedDocument | undefined;
  #reading: AbortController | undefined;

  constructor(
    readonly path: string,
    private around: Surroundings,
  ) {
    this.name = nameOf(path);
    this.panel.setAttribute("aria-labelledby", `tab-${this.id}`);
    void this.read();
  }

  marks(): Mark[] {
    return this.isUnsaved ? ["unsaved"] : [];
  }

  get view(): DocumentView | undefined {
    return this.#view;
  }

  /** Reads the document and shows it; a text as `charset`, where that is given. */
  async read(charset?: string): Promise<void> {
    this.#reading?.abort();
    const reading = (this.#reading = new AbortController());
    this.#showProgress(reading);
    try {
      const loaded = await load(this.around.client, this.path, {
        signal: reading.signal,
        onProgress: (progress) => this.#progress(progress),
      });
      const open = await factoryOf(this.path);
      reading.signal.throwIfAborted();
      this.#view?.close();
      this.#loaded = { ...loaded, ...(charset && { charset }) };
      this.#view = open(this.#loaded, this.#page());
      this.panel.replaceChildren(this.#view.element);
      this.isUnsaved = false;
      this.around.update();
    } catch (error) {
      if (this.#reading === reading) {
        this.#showFailure(reading.signal.aborted ? text("document.cancelled") : this.#reasonOf(error));
      }
    }
  }

  focus(): void {
    (this.#view ?? this.panel).focus();
  }

  close(): void {
    this.#reading?.abort();
    this.#view?.close();
    this.panel.remove();
  }

  #page(): Page {
    const { around } = this;
    return {
      get client() {
        return around.client;
      },
      text,
      changed: () => this.#changed(),
      ask: (question: { title: string; message: string; choices: Choice[] }) => ask(question),
      tell: (message, kind) => around.tell(message, kind),
      reopen: (charset) => void this.#reopen(charset),
    };
  }

  #changed(): void {
    this.isUnsaved = true;
    this.around.update();
  }

  async #reopen(charset?: string): Promise<void> {
    const choices = [
      { value: "yes", label: text("document.reopen.yes") },
      { value: "", label: text("action.cancel"), isDefault: true },
    ];
    const title = text("document.reopen.title", { name: this.name });
    if (!this.isUnsaved || (await ask({ title, message: text("document.reopen.message"), choices }))) {
      await this.read(charset);
    }
  }

  #showProgress(reading: AbortController): void {
    const bar = element("progress", { "aria-label": text("document.reading", { name: this.name }) });
    const waiting = element(
      "div",
      { className: "waiting" },
      element("p", {}, text("document.reading", { name: this.name })),
      bar,
      element("p", { className: "amount" }),
      button(text("action.cancel"), () => reading.abort()),
    );
    this.panel.replaceChildren(waiting);
  }

  #progress({ direction, bytes, total }: Progress): void {
    const bar = this.panel.querySelector("progress");
    if (bar && direction === "received") {
      bar.max = total;
      bar.value = bytes;
      this.panel.querySelector(".amount")!.textContent = text("document.progress", {
        done: bytesText(bytes),
        total: bytesText(total),
      });
    }
  }

  #showFailure(reason: string): void {
    const again = button(text("action.retry"), () => void this.read());
    this.panel.replaceChildren(
      element("div", { className: "waiting" }, element("p", { className: "problem", role: "alert" }, reason), again),
    );
  }

  #reasonOf(error: unknown): string {
    if (error instanceof AskAgain) {
      return text("connection.noworker");
    }
    return text("document.failed", { name: this.name, reason: error instanceof Error ? error.message : String(error) });
  }
}

// The rooms are loaded when a document of theirs is opened.
async function factoryOf(path: string): Promise<ViewFactory> {
  return isPackage(path) ? (await import("../package/index.js")).openPackage : (await import("../text/index.js")).openText;
}
