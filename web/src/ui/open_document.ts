// SPDX-License-Identifier: Apache-2.0
// A document that is open: read, shown in a panel by the view of its kind, saved, and followed when somebody
// else saves it.
import { AskAgain, type Client, type Progress } from "../../client/src/index.js";
import type { DocumentContent, DocumentView, LoadedDocument, Page, Room } from "../document_view.js";
import { UnreadableDocument, load } from "../files/loading.js";
import { isImage, isPackage, nameOf } from "../files/paths.js";
import { resolveConflict } from "../save/conflict.js";
import { DraftKeeper } from "../save/draft_keeper.js";
import type { Draft, Drafts } from "../save/drafts.js";
import { SaveRefused, type SaveResult, Saver, type Unsaved } from "../save/saver.js";
import { browseVersions } from "../save/versions.js";
import { ask } from "./dialog.js";
import { button, element } from "./dom.js";
import { bytesText, currentLanguage, reasonText, text } from "./text.js";

/** What an open document needs of the page around it. */
export interface Surroundings {
  readonly client: Client;
  readonly drafts: Drafts;
  tell(message: string, kind?: "information" | "problem"): void;
  /** The document's marks or what it says of its saves have changed. */
  update(): void;
}

/** What there is to say of an open document beside its name. */
export type Mark = "unsaved" | "theirs";

const ANSWER_TIME = 10_000; // ms that a save's answer may take to begin, before it is asked for again,
const ANSWER_TIME_PER_MB = 200; // and what a long document takes to be written and read back, on a slow machine
const SLOW = 4_000; // ms without a sign of an answer, after which a reader is told
const PAUSE = 3_000; // ms between the tries of a save that nobody answers

let opened = 0;

export class OpenDocument {
  readonly id = ++opened;
  readonly panel = element("div", { role: "tabpanel", id: `panel-${this.id}`, className: "panel", tabIndex: -1 });
  readonly name: string;
  /** What has become of the last save, for the line of the page's state. */
  status = "";
  #view: DocumentView | undefined;
  #loaded: LoadedDocument | undefined;
  #saver: Saver | undefined;
  #reading: AbortController | undefined;
  #saving: AbortController | undefined;
  #chosenCharset: { found: string | undefined; readAs: string } | undefined;
  #keeper: DraftKeeper;
  #isBrowsing = false; // among earlier versions, which are compared with what is shown

  /** `draft`: what is unsaved of an earlier life of the page. */
  constructor(
    readonly path: string,
    private around: Surroundings,
    private draft?: Draft,
  ) {
    this.name = nameOf(path);
    this.panel.setAttribute("aria-labelledby", `tab-${this.id}`);
    this.#keeper = new DraftKeeper({
      store: async () => this.#storeDraft(),
      remove: () => around.drafts.remove(path),
      failed: (reason) => around.tell(text("draft.failed", { name: this.name, reason: reasonText(reason) }), "problem"),
    });
    void this.read({ ...(draft && { draft }) });
  }

  get isUnsaved(): boolean {
    return this.#saver?.isUnsaved ?? this.draft !== undefined;
  }

  get isSaving(): boolean {
    return this.#saver?.isSaving ?? false;
  }

  /** Whether it is shown, and so can be saved. */
  get isShown(): boolean {
    return this.#saver !== undefined;
  }

  /** Whether an edit would be lost with the page now. */
  get isAtRisk(): boolean {
    return this.isUnsaved && this.#keeper.isPending;
  }

  marks(): Mark[] {
    return [...(this.isUnsaved ? ["unsaved" as const] : []), ...(this.#saver?.hasTheirs ? ["theirs" as const] : [])];
  }

  /** Reads the document and shows it; a text as `charset`, where that is given, or with a draft's edits. */
  async read({ charset, draft }: { charset?: string; draft?: Draft } = {}): Promise<void> {
    this.#reading?.abort();
    const reading = (this.#reading = new AbortController());
    this.#showProgress(reading);
    const slow = setTimeout(() => this.#readAmount(text("document.slow")), SLOW);
    try {
      const loaded = await this.#load(reading.signal, draft);
      const room = await roomOf(this.path);
      reading.signal.throwIfAborted();
      const readAs = charset ?? draft?.readAs;
      this.#chosenCharset = readAs === undefined ? undefined : { found: loaded.charset, readAs };
      const chosen = this.#asChosen(loaded);
      const view = await room.open(chosen, this.#page(), draft?.content);
      if (reading.signal.aborted) {
        view.close();
      }
      reading.signal.throwIfAborted();
      await this.#show(view, chosen, room, draft);
    } catch (error) {
      if (this.#reading === reading) {
        const again = () => void this.read({ ...(charset && { charset }), ...(draft && { draft }) });
        this.#showFailure(reading.signal.aborted ? text("document.cancelled") : this.#reasonOf(error), again);
      }
    } finally {
      clearTimeout(slow);
    }
  }

  /** Saves, and tells how that went. True when what the view holds is on disk. */
  async save(): Promise<boolean> {
    if (!this.#saver) {
      return false;
    }
    try {
      const isSaved = await this.#saver.save();
      if (isSaved) {
        this.#tellSaved();
      } else {
        this.#setStatus(this.isUnsaved ? text("save.notyet") : "");
      }
      return isSaved;
    } catch (error) {
      this.#saveFailed(error);
      return false;
    }
  }

  cancelSave(): void {
    this.#saving?.abort();
  }

  /** To be called when the file may have changed. */
  async follow(): Promise<void> {
    const saver = this.#saver;
    if (!saver || saver.hasTheirs || this.#isBrowsing) {
      return;
    }
    try {
      const version = saver.isSaving ? "" : await this.around.client.version(this.path);
      if (version === saver.baseVersion) {
        return;
      }
      const wasUnsaved = saver.isUnsaved;
      const outcome = await saver.followTheirs();
      if (wasUnsaved && !saver.isUnsaved) {
        this.#tellSaved(); // a save that was given up, or that failed as it seemed
      }
      if (outcome !== "same") {
        const key = outcome === "shown" ? "document.reloaded" : "document.theirs";
        this.around.tell(text(key, { name: this.name }));
      }
    } catch {
      // There will be another notification, or a save that finds out.
    }
  }

  /** Shows the earlier versions. */
  async versions(): Promise<void> {
    if (!this.#view || !this.#loaded || !this.#saver) {
      return;
    }
    this.#isBrowsing = true;
    try {
      const isRestored = await browseVersions(this.around.client, this.#loaded, this.#view);
      if (isRestored && (await this.#saver.followTheirs()) === "kept") {
        this.around.tell(text("document.theirs", { name: this.name }));
      }
    } catch (error) {
      this.around.tell(this.#reasonOf(error), "problem");
    } finally {
      this.#isBrowsing = false;
    }
    await this.follow(); // what somebody saved meanwhile
  }

  focus(): void {
    (this.#view ?? this.panel).focus();
  }

  /** Stores what is unsaved, before the page goes. */
  async keep(): Promise<void> {
    await this.#keeper.flush();
  }

  /** What is unsaved is given up. */
  close(): void {
    this.#reading?.abort();
    this.#saver = undefined; // so that the end of its save stores nothing
    this.#saving?.abort();
    void this.#keeper.clear();
    this.#view?.close();
    this.panel.remove();
  }

  // With a draft, a document that was removed, or cannot be read, can still be shown, and saved anew.
  async #load(signal: AbortSignal, draft?: Draft): Promise<LoadedDocument> {
    const { client } = this.around;
    try {
      return await load(client, this.path, { signal, onProgress: (progress) => this.#readProgress(progress) });
    } catch (error) {
      if (draft && error instanceof UnreadableDocument) {
        const { charset = "UTF-8", byteOrderMark = false } = draft;
        return { ...this.#withoutContent(error), charset, byteOrderMark };
      }
      throw error;
    }
  }

  #withoutContent({ version, message }: UnreadableDocument): LoadedDocument {
    const answer = { status: true, ...(isPackage(this.path) ? { parts: [], relationships: [] } : { data: "" }) };
    return { path: this.path, version, answer, ...(version !== "" && { unreadable: message }) };
  }

  async #show(view: DocumentView, loaded: LoadedDocument, room: Room, draft?: Draft): Promise<void> {
    this.#view?.close();
    this.#view = view;
    this.#loaded = loaded;
    // What is left of a document alone is based on no version: a file that is there is looked at before it is replaced.
    const version = view.isRemnant ? "" : (draft ?? loaded).version;
    const saver = (this.#saver = this.#makeSaver(version, draft && unsavedOf(draft, loaded, room)));
    this.draft = undefined;
    const hasFocus = this.panel.contains(document.activeElement);
    this.panel.replaceChildren(view.element);
    if (hasFocus) {
      view.focus(); // which was there while the document was being read
    }
    this.#setStatus(loaded.isChanging ? text("document.changing") : "");
    if (!draft) {
      void this.#keeper.clear();
      return;
    }
    const outcome = await saver.noticed(loaded);
    if (saver.isUnsaved) {
      const { unreadable: reason } = loaded;
      const what = loaded.version === "" ? "removed" : "theirs";
      const key = outcome === "kept" && reason === undefined ? `document.restored.${what}` : "document.restored";
      this.around.tell(text(key, { name: this.name }));
      if (reason !== undefined) {
        this.around.tell(text("document.failed", { name: this.name, reason }), "problem");
      }
    }
  }

  // To be read in the charset that the person has chosen, unless it has been saved in another one since.
  #asChosen(loaded: LoadedDocument): LoadedDocument {
    const chosen = this.#chosenCharset;
    return chosen && chosen.found === loaded.charset ? { ...loaded, readAs: chosen.readAs } : loaded;
  }

  #makeSaver(version: string, unsaved?: Unsaved): Saver {
    const saver = new Saver(
      {
        draft: (sent) => this.#view!.draft(sent),
        content: () => this.#view!.content(),
        write: (content, base) => this.#write(content, base),
        saved: (content) => this.#view!.saved?.(content),
        load: () => this.#present(),
        replace: (theirs) => {
          this.#loaded = theirs;
          this.#view!.replace(theirs);
          this.#setStatus(theirs.isChanging ? text("document.changing") : "");
        },
        resolve: (theirs) => resolveConflict(this.name, this.#view!, theirs),
        update: () => {
          if (this.#saver === saver) {
            this.#updated(saver);
          }
        },
      },
      version,
      unsaved,
    );
    return saver;
  }

  #updated(saver: Saver): void {
    if (saver.isUnsaved) {
      this.#keeper.changed();
    } else {
      void this.#keeper.clear();
    }
    this.around.update();
  }

  // Asks again for as long as it takes, since what is sent is saved once however often it is asked for.
  async #write(content: DocumentContent, base: string): Promise<SaveResult> {
    const saving = (this.#saving = new AbortController());
    const options = {
      baseVersion: base,
      signal: saving.signal,
      timeout: ANSWER_TIME + (ANSWER_TIME_PER_MB * sizeOf(content)) / 1e6,
      onProgress: ({ direction, bytes, total }: Progress) => {
        const part = { done: bytesText(bytes), total: bytesText(total) };
        this.#setStatus(direction === "sent" && bytes < total ? text("save.progress", part) : text("save.waiting"));
      },
      onAskAgain: () => this.#setStatus(text("save.again")),
    };
    this.#setStatus(text("save.waiting"));
    this.#keeper.changed();
    void this.#keeper.flush(); // so that the draft tells what was sent, however soon the page is gone
    for (;;) {
      const { client } = this.around;
      try {
        return content.kind === "package"
          ? await client.save(this.path, content.content, options)
          : await client.save(this.path, content.content, { ...options, encoding: content.encoding });
      } catch (error) {
        if (saving.signal.aborted || !(error instanceof AskAgain || client.nats.isClosed())) {
          throw error;
        }
        this.#setStatus(text("save.again"));
        this.around.tell(text("save.noanswer", { name: this.name }), "problem");
        await pause(PAUSE, saving.signal);
      }
    }
  }

  // The document as it is saved now.
  async #present(): Promise<LoadedDocument | undefined> {
    try {
      return this.#asChosen(await load(this.around.client, this.path));
    } catch (error) {
      if (error instanceof UnreadableDocument) {
        return error.version === "" ? undefined : this.#withoutContent(error);
      }
      throw error;
    }
  }

  async #storeDraft(): Promise<void> {
    if (!this.#view || !this.#saver?.isUnsaved) {
      return;
    }
    const { charset, byteOrderMark, readAs } = this.#loaded ?? {};
    await this.around.drafts.put({
      path: this.path,
      ...this.#saver.draft(),
      ...(charset !== undefined && { charset }),
      ...(byteOrderMark !== undefined && { byteOrderMark }),
      ...(readAs !== undefined && { readAs }),
    });
  }

  #page(): Page {
    const { around } = this;
    return {
      get client() {
        return around.client;
      },
      text,
      changed: () => this.#saver?.changed(),
      ask,
      tell: (message, kind) => around.tell(message, kind),
      reopen: (charset) => void this.#reopen(charset),
    };
  }

  async #reopen(charset?: string): Promise<void> {
    const choices = [
      { value: "yes", label: text("document.reopen.yes") },
      { value: "", label: text("action.cancel"), isDefault: true },
    ];
    const title = text("document.reopen.title", { name: this.name });
    if (!this.isUnsaved || (await ask({ title, message: text("document.reopen.message"), choices }))) {
      await this.read(charset ? { charset } : {});
    }
  }

  #setStatus(status: string): void {
    this.status = status;
    this.around.update();
  }

  #tellSaved(): void {
    this.#setStatus(text("save.done", { time: new Date().toLocaleTimeString(currentLanguage()) }));
  }

  #saveFailed(error: unknown): void {
    if (this.#saving?.signal.aborted) {
      this.#setStatus(text("save.cancelled"));
      return;
    }
    this.#setStatus(text("save.failed"));
    const reason = error instanceof SaveRefused ? text("save.refused") : this.#reasonOf(error);
    this.around.tell(`${text("save.failed.name", { name: this.name })} ${reason}`, "problem");
  }

  #showProgress(reading: AbortController): void {
    const name = text("document.reading", { name: this.name });
    this.#showInstead(
      element("p", {}, name),
      element("progress", { "aria-label": name }),
      element("p", { className: "amount", role: "status" }),
      button(text("action.cancel"), () => reading.abort()),
    );
  }

  #readProgress({ direction, bytes, total }: Progress): void {
    const bar = this.panel.querySelector("progress");
    if (bar && direction === "received") {
      bar.max = total;
      bar.value = bytes;
      this.#readAmount(text("document.progress", { done: bytesText(bytes), total: bytesText(total) }));
    }
  }

  #readAmount(said: string): void {
    const line = this.panel.querySelector(".waiting > .amount");
    if (line) {
      line.textContent = said;
    }
  }

  #showFailure(reason: string, again: () => void): void {
    const line = element("p", { className: "problem", role: "alert" }, reason);
    this.#showInstead(line, button(text("action.retry"), again));
  }

  // In the place of the document; what had the focus leaves it to the panel.
  #showInstead(...content: HTMLElement[]): void {
    const hasFocus = this.panel.contains(document.activeElement);
    this.panel.replaceChildren(element("div", { className: "waiting" }, ...content));
    if (hasFocus) {
      this.panel.focus();
    }
  }

  #reasonOf(error: unknown): string {
    if (error instanceof AskAgain) {
      return text("connection.noworker");
    }
    return text("document.failed", { name: this.name, reason: reasonText(error) });
  }
}

function sizeOf({ kind, content }: DocumentContent): number {
  return kind === "text" ? content.length : content.parts.reduce((sum, part) => sum + part.content.length, 0);
}

function pause(milliseconds: number, signal: AbortSignal): Promise<void> {
  return new Promise((resolve, reject) => {
    const timer = setTimeout(resolve, milliseconds);
    signal.addEventListener("abort", () => {
      clearTimeout(timer);
      reject(signal.reason);
    });
  });
}

// The rooms are loaded when a document of theirs is opened.
async function roomOf(path: string): Promise<Room> {
  if (isPackage(path)) {
    return (await import("../package/index.js")).packages;
  }
  return isImage(path) ? (await import("../images/index.js")).images : (await import("../text/index.js")).texts;
}

function unsavedOf({ content, sent }: Draft, loaded: LoadedDocument, room: Room): Unsaved {
  const stateOf = (draft: unknown) => ({ draft, content: () => room.contentOf(draft, content, loaded) });
  return { held: stateOf(content), ...(sent !== undefined && { sent: stateOf(sent) }) };
}
