// SPDX-License-Identifier: Apache-2.0
// The page once it is connected: files on the left, open documents in tabs, what has happened below.
import type { Client } from "../../client/src/index.js";
import { type ConnectionState } from "../connection/connection.js";
import { type Settings, fragmentOf } from "../connection/settings.js";
import { join } from "../files/paths.js";
import { ask } from "./dialog.js";
import { button, element } from "./dom.js";
import type { Messages } from "./messages.js";
import { OpenDocument, type Surroundings } from "./open_document.js";
import { Tabs } from "./tabs.js";
import { text } from "./text.js";

export class Workspace {
  readonly element = element("div", { className: "workspace" });
  #documents: OpenDocument[] = [];
  #active: OpenDocument | undefined;
  #tabs = new Tabs(
    (one) => this.#activate(one),
    (one) => void this.#close(one),
  );
  #files = element("nav", { className: "files", "aria-label": text("files.title") });
  #panels = element("main", { className: "panels" });

  constructor(
    private around: { client: Client; settings: Settings },
    private messages: Messages,
  ) {
    this.element.append(this.#files, element("div", { className: "documents" }, this.#tabs.element, this.#panels));
    this.connection("connected");
    this.#update();
    void this.#listFiles();
  }

  /** Shows the document at `path`, which is read unless it is open. */
  open(path: string): void {
    let one = this.#documents.find((other) => other.path === path);
    if (!one) {
      one = new OpenDocument(path, this.#surroundings());
      this.#documents.push(one);
      this.#panels.append(one.panel);
    }
    this.#activate(one);
  }

  /** Tells what has become of the connection. */
  connection(state: ConnectionState): void {
    this.element.dataset.state = state;
  }

  #surroundings(): Surroundings {
    const { around } = this;
    return {
      get client() {
        return around.client;
      },
      tell: (message, kind) => this.messages.tell(message, kind),
      update: () => this.#update(),
    };
  }

  #activate(one: OpenDocument | undefined): void {
    this.#active = one;
    this.#update();
  }

  async #close(one: OpenDocument): Promise<void> {
    if (one.isUnsaved) {
      const choices = [
        { value: "discard", label: text("document.close.discard") },
        { value: "", label: text("action.cancel"), isDefault: true },
      ];
      const title = text("document.close.title", { name: one.name });
      if (!(await ask({ title, message: text("document.close.message"), choices }))) {
        return;
      }
    }
    const index = this.#documents.indexOf(one);
    this.#documents.splice(index, 1);
    one.close();
    this.#activate(this.#active === one ? (this.#documents[index] ?? this.#documents[index - 1]) : this.#active);
  }

  #update(): void {
    this.#tabs.show(this.#documents, this.#active);
    for (const one of this.#documents) {
      one.panel.hidden = one !== this.#active;
    }
    const mark = this.#active?.isUnsaved ? "\u25cf " : "";
    document.title = this.#active ? `${mark}${this.#active.name} - ${text("page.title")}` : text("page.title");
    history.replaceState(null, "", location.pathname + location.search + fragmentOf(this.around.settings, this.#active?.path));
  }

  async #listFiles(): Promise<void> {
    for (const root of await this.around.client.roots()) {
      const { entries } = await this.around.client.list(root);
      const files = entries.filter((entry) => entry.kind === "file");
      this.#files.append(...files.map(({ name }) => button(name, () => this.open(join(root, name)))));
    }
  }
}
