// SPDX-License-Identifier: Apache-2.0
// The page once it is connected: files on the left, open documents in tabs, the state below.
import type { Client } from "../../client/src/index.js";
import type { ConnectionState } from "../connection/connection.js";
import { type Settings, fragmentOf } from "../connection/settings.js";
import { FileTree } from "../files/tree.js";
import type { Draft, Drafts } from "../save/drafts.js";
import { sessionStore } from "../storage.js";
import { ask } from "./dialog.js";
import { button, element, shortcutKey } from "./dom.js";
import type { Messages } from "./messages.js";
import { OpenDocument, type Surroundings } from "./open_document.js";
import { StateLine } from "./state_line.js";
import { Tabs } from "./tabs.js";
import { text } from "./text.js";

const OPEN = "open"; // sessionStore: which documents are open

export interface WorkspaceOptions {
  client: Client;
  settings: Settings;
  drafts: Drafts;
  messages: Messages;
}

export class Workspace {
  readonly element = element("div", { className: "workspace" });
  #documents: OpenDocument[] = [];
  #active: OpenDocument | undefined;
  #isUpdateWaiting = false;
  #isRestored = false;
  #tabs = new Tabs(
    (one) => this.#activate(one),
    (one) => void this.#close(one),
  );
  #tree = new FileTree({
    client: () => this.options.client,
    open: (path) => this.open(path).focus(),
    tell: (message, kind) => this.options.messages.tell(message, kind),
  });
  #state = new StateLine(
    () => this.keepDrafts(),
    () => this.#active?.cancelSave(),
  );
  #save = button(text("action.save"), () => void this.#active?.save(), { className: "main", title: text("action.save.title") });
  #versions = button(text("versions.button"), () => void this.#active?.versions());
  #link = button(text("document.link"), () => void this.#copyLink());
  #showFiles = button("\u2630", () => this.#toggleFiles(), { title: text("files.show"), "aria-label": text("files.show") });
  #panels = element("main", { className: "panels" });
  #welcome = element(
    "div",
    { className: "waiting" },
    element("h2", {}, text("page.untitled")),
    element("p", {}, text("page.welcome")),
    element("p", {}, text("page.welcome.keys")),
  );

  constructor(private options: WorkspaceOptions) {
    const tools = element("div", { className: "tools", role: "toolbar", "aria-label": text("page.tools") }, this.#save, this.#versions, this.#link);
    const title = element("h1", { className: "unseen" }, text("page.title"));
    const head = element("header", { className: "head" }, title, this.#showFiles, this.#tabs.element, tools);
    this.#panels.append(this.#welcome);
    this.element.append(head, this.#tree.element, this.#panels, this.#state.element);
    document.addEventListener("keydown", (event) => this.#key(event));
    addEventListener("pagehide", () => void this.keepDrafts());
    document.addEventListener("visibilitychange", () => void this.keepDrafts());
    addEventListener("beforeunload", (event) => {
      if (this.#documents.some((one) => one.isAtRisk)) {
        event.preventDefault();
      }
    });
    this.connection("connected");
    this.#listen();
    this.#activate(undefined);
    void this.#tree.start().catch(() => options.messages.tell(text("connection.noworker"), "problem"));
  }

  /** Opens what was open or unsaved before the page was loaded again, and `file`. */
  restore(drafts: Draft[], file?: string): void {
    const { paths = [], active } = JSON.parse(sessionStore.getItem(OPEN) ?? "{}") as { paths?: string[]; active?: string };
    for (const path of new Set([...paths, ...drafts.map((draft) => draft.path)])) {
      this.open(
        path,
        drafts.find((draft) => draft.path === path),
      );
    }
    const shown = file ?? active;
    if (shown) {
      this.open(shown);
    }
    this.#isRestored = true;
    this.#update();
  }

  /** Shows the document at `path`, which is read unless it is open. */
  open(path: string, draft?: Draft): OpenDocument {
    let one = this.#documents.find((other) => other.path === path);
    if (!one) {
      one = new OpenDocument(path, this.#surroundings(), draft);
      this.#documents.push(one);
      this.#panels.append(one.panel);
    }
    this.#activate(one);
    return one;
  }

  /** Tells what has become of the connection. */
  connection(state: ConnectionState): void {
    const wasLost = this.element.dataset.state === "lost";
    this.element.dataset.state = state;
    this.#state.connection(state);
    if (state === "lost" && !wasLost) {
      this.options.messages.tell(text("connection.lost.more"), "problem");
    } else if (state === "connected" && wasLost) {
      this.options.messages.tell(text("connection.back"));
      this.#catchUp();
    }
  }

  /** Goes on with another connection, in the place of one that has ended. */
  reconnected(client: Client, settings: Settings): void {
    void this.options.client.close(); // which would go on trying
    this.options = { ...this.options, client, settings };
    this.connection("connected");
    this.#listen();
    this.#catchUp();
  }

  /** Stores what is unsaved in the browser. */
  async keepDrafts(): Promise<void> {
    await Promise.all(this.#documents.map((one) => one.keep()));
  }

  #listen(): void {
    this.options.client.listen(({ filePath }) => {
      this.#tree.changed(filePath);
      void this.#documents.find((one) => one.path === filePath)?.follow();
    });
  }

  // While there was no connection, nothing told of changes.
  #catchUp(): void {
    void this.#tree.refresh();
    this.#documents.forEach((one) => void one.follow());
  }

  #surroundings(): Surroundings {
    const page = this;
    return {
      get client() {
        return page.options.client;
      },
      drafts: this.options.drafts,
      tell: (message, kind) => this.options.messages.tell(message, kind),
      update: () => this.#update(),
    };
  }

  #activate(one: OpenDocument | undefined): void {
    this.#active = one;
    this.element.classList.toggle("with-files", one === undefined); // in a small window, instead of the documents
    if (one) {
      this.#tree.show(one.path);
    }
    this.#updateNow();
  }

  async #close(one: OpenDocument): Promise<void> {
    if (one.isUnsaved) {
      const choice = await ask({
        title: text("document.close.title", { name: one.name }),
        message: text("document.close.message"),
        choices: [
          { value: "", label: text("action.cancel") },
          { value: "discard", label: text("document.close.discard") },
          { value: "save", label: text("action.save"), isDefault: true },
        ],
      });
      const isSettled = choice === "save" ? (await one.save()) && !one.isUnsaved : choice === "discard";
      if (!isSettled) {
        return; // also where more was typed during the save
      }
    }
    const index = this.#documents.indexOf(one);
    if (index < 0) {
      return; // it was closed twice while it was being saved
    }
    this.#documents.splice(index, 1);
    one.close();
    this.#activate(this.#active === one ? (this.#documents[index] ?? this.#documents[index - 1]) : this.#active);
  }

  // Edits come faster than they need to be seen in tabs and title.
  #update(): void {
    if (!this.#isUpdateWaiting) {
      this.#isUpdateWaiting = true;
      setTimeout(() => this.#updateNow());
    }
  }

  #updateNow(): void {
    this.#isUpdateWaiting = false;
    const active = this.#active;
    this.#tabs.show(this.#documents, active);
    this.#documents.forEach((one) => (one.panel.hidden = one !== active));
    this.#welcome.hidden = active !== undefined;
    this.#save.disabled = !active?.isShown;
    this.#versions.disabled = !active?.isShown;
    this.#link.disabled = !active;
    this.#state.document(active?.status ?? "", active?.isSaving ?? false);
    const title = active ? `${active.isUnsaved ? "\u25cf " : ""}${active.name} - ${text("page.title")}` : text("page.title");
    if (document.title !== title) {
      document.title = title;
    }
    const paths = this.#documents.map((one) => one.path);
    const open = JSON.stringify({ paths, active: active?.path });
    if (this.#isRestored && sessionStore.getItem(OPEN) !== open) {
      sessionStore.setItem(OPEN, open);
      history.replaceState(null, "", this.#address());
    }
  }

  #address(): string {
    return location.pathname + location.search + fragmentOf(this.options.settings, this.#active?.path);
  }

  async #copyLink(): Promise<void> {
    const link = new URL(this.#address(), location.href).href;
    try {
      await navigator.clipboard.writeText(link);
      this.options.messages.tell(text("document.link.copied"));
    } catch {
      this.options.messages.tell(text("document.link.shown", { link })); // a browser that does not let pages copy
    }
  }

  #toggleFiles(): void {
    if (this.element.classList.toggle("with-files")) {
      this.#tree.focus();
    }
  }

  #key(event: KeyboardEvent): void {
    const isCommand = (event.ctrlKey || event.metaKey) && !event.altKey && !event.shiftKey;
    const key = shortcutKey(event);
    if (isCommand && key === "s") {
      // Not again and again while it is held: each save makes an earlier version. Nor what is behind a dialog.
      if (!event.repeat && !document.querySelector("dialog")) {
        void this.#active?.save();
      }
    } else if (isCommand && key === "p") {
      this.element.classList.add("with-files");
      this.#tree.focusFilter();
    } else if (event.key === "F6") {
      this.#nextRoom(event.shiftKey ? -1 : 1);
    } else {
      return;
    }
    event.preventDefault();
  }

  #nextRoom(step: number): void {
    const rooms: [HTMLElement, () => void][] = [
      [this.#tree.element, () => this.#tree.focus()],
      [this.#tabs.element, () => this.#tabs.focus()],
      [this.#panels, () => this.#active?.focus()],
      [this.#state.element, () => this.#state.focus()],
    ];
    const index = rooms.findIndex(([room]) => room.contains(document.activeElement));
    rooms[(index + step + rooms.length) % rooms.length]![1]();
  }
}
