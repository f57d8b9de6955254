// SPDX-License-Identifier: Apache-2.0
// The saves of one document: one under way at a time, the latest content counts, each one names the version
// that it is based on, and nothing that somebody else saved is overwritten unseen.
import type { DocumentContent, LoadedDocument } from "../document_view.js";
import { isSame } from "./same.js";

export interface SaveResult {
  isSaved: boolean;
  /** The version that the save made, where the host tells it. */
  version?: string;
}

/** What a Saver needs of the document and its surroundings. */
export interface SaveTarget {
  /** What is unsaved, as it is stored; `sent` as in DocumentView. */
  draft(sent?: unknown): unknown;
  /** The document as it stands; nothing when the person thinks better of saving it. */
  content(): Promise<DocumentContent | undefined>;
  /** Has it saved if the document still has the version `base`. Throws when no answer came. */
  write(content: DocumentContent, base: string): Promise<SaveResult>;
  /** `content` is on disk now. */
  saved(content: DocumentContent): void;
  /** What is saved now, also where that cannot be read; nothing where there is no such file any more. */
  load(): Promise<LoadedDocument | undefined>;
  /** Shows what somebody else saved instead of what is unsaved. */
  replace(theirs: LoadedDocument): void;
  /** Asks what to do about what somebody else saved (nothing: removed). Nothing: not now; "again": look once more. */
  resolve(theirs: LoadedDocument | undefined): Promise<"mine" | "theirs" | "again" | undefined>;
  /** One of the members of the saver has changed. */
  update(): void;
}

/** A state of the document that may have been sent to be saved. */
export interface Sent {
  draft: unknown;
  /** What was sent then; nothing where that cannot be told. */
  content(): Promise<DocumentContent | undefined>;
}

/** What an earlier life of the page left unsaved. */
export interface Unsaved {
  /** What it held last. */
  held: Sent;
  /** What it had sent, where it is not known what became of that. */
  sent?: Sent;
}

/** The host answered that it did not save, though nobody else has. */
export class SaveRefused extends Error {}

export class Saver {
  #edits: number;
  #savedEdits = 0;
  #running: Promise<boolean> | undefined;
  #isWantedAgain = false;
  #hasTheirs = false;
  // What may have been saved without the page knowing, and after how many edits that was. The last one is stored.
  #sent: (Sent & { edits: number })[] = [];

  /** `version` is what the document is based on, and `unsaved` how it already differs from that. */
  constructor(
    private target: SaveTarget,
    private version: string,
    unsaved?: Unsaved,
  ) {
    this.#edits = unsaved ? 1 : 0;
    if (unsaved) {
      const { held, sent } = unsaved;
      this.#sent = [{ ...held, edits: 1 }, ...(sent ? [{ ...sent, edits: 0 }] : [])];
    }
  }

  /** The version that the document is based on. */
  get baseVersion(): string {
    return this.version;
  }

  get isUnsaved(): boolean {
    return this.#edits !== this.#savedEdits;
  }

  get isSaving(): boolean {
    return this.#running !== undefined;
  }

  /** Whether somebody else has saved, and it has not been decided what becomes of it. */
  get hasTheirs(): boolean {
    return this.#hasTheirs;
  }

  /** What is to be stored: what is unsaved, and what was sent last while it is not known what became of that. */
  draft(): { version: string; content: unknown; sent?: unknown } {
    const sent = this.#sent.at(-1)?.draft;
    return { version: this.version, content: this.target.draft(sent), ...(sent !== undefined && { sent }) };
  }

  /** To be called on every edit. */
  changed(): void {
    ++this.#edits;
    this.target.update();
  }

  /**
   * Saves the document as it stands. True when that is on disk. While a save is under way it is followed by one
   * more, however often this is called. Rejects with what `write` and `load` throw, and with SaveRefused.
   */
  save(): Promise<boolean> {
    if (this.#running) {
      this.#isWantedAgain = true;
      return this.#running;
    }
    this.#running = this.#saveWhileWanted().finally(() => {
      this.#running = undefined;
      this.target.update();
    });
    this.target.update();
    return this.#running;
  }

  /** To be called when the file may have changed: shows what is saved now where nothing is unsaved. */
  async followTheirs(): Promise<"same" | "shown" | "kept"> {
    let base: string;
    let theirs: LoadedDocument | undefined;
    do {
      await this.#running?.catch(() => undefined);
      base = this.version;
      theirs = await this.target.load();
    } while (this.#running || this.version !== base); // What a save has replaced meanwhile is not shown again.
    return theirs && theirs.unreadable === undefined ? this.noticed(theirs) : "same"; // or there is nothing to show
  }

  /** To be called when `theirs` was found to be saved now, while no save was under way. */
  async noticed(theirs: LoadedDocument): Promise<"same" | "shown" | "kept"> {
    const base = this.version;
    if (theirs.version === base || (await this.#isOwn(theirs))) {
      return "same";
    }
    if (this.#running || this.version !== base) {
      return "same"; // a save finds out for itself
    }
    if (this.isUnsaved) {
      this.#hasTheirs = true;
      this.target.update();
      return "kept";
    }
    this.#show(theirs);
    return "shown";
  }

  async #saveWhileWanted(): Promise<boolean> {
    let isSaved: boolean;
    do {
      this.#isWantedAgain = false;
      isSaved = await this.#saveOnce();
    } while (isSaved && this.#isWantedAgain && this.isUnsaved);
    return isSaved;
  }

  async #saveOnce(): Promise<boolean> {
    for (;;) {
      const content = await this.target.content();
      if (!content) {
        return false;
      }
      const edits = this.#edits; // not before, since a view counts what is being typed when it is asked
      const earlier = this.#sent;
      const state = { content: async () => content, draft: this.draft().content, edits };
      // Each may be a large document. The first and the last are the likeliest to have been made.
      this.#sent = [...earlier.filter((one) => one.edits !== edits).slice(0, 3), state];
      const base = this.version;
      const result = await this.target.write(content, base);
      if (result.isSaved) {
        await this.#saved(edits, content, result);
        return true;
      }
      this.#sent = earlier; // A refused save has not been made.
      const decision = await this.#refused(base);
      if (decision !== "mine") {
        return decision === "theirs";
      }
    }
  }

  async #saved(edits: number, content: DocumentContent, { version }: SaveResult): Promise<void> {
    this.#savedEdits = edits;
    this.target.saved(content);
    this.target.update();
    if (version !== undefined) {
      this.#basedOn(version);
      return;
    }
    // Not what the file has now: that may be another's, and would be overwritten by the next save.
    const present = await this.target.load();
    if (present && isSame(present, content)) {
      this.#basedOn(present.version);
    }
  }

  async #refused(base: string): Promise<"mine" | "theirs" | undefined> {
    const theirs = await this.target.load();
    const version = theirs?.version ?? "";
    if (version === base) {
      throw new SaveRefused();
    }
    if (theirs && ((await this.#isOwn(theirs)) || this.version === version)) {
      return "mine"; // also where noticed() was the one to find it out
    }
    this.#hasTheirs = true;
    this.target.update();
    const decision = await this.target.resolve(theirs);
    if (decision === "theirs" && theirs) {
      this.#show(theirs);
    } else if (decision === "mine") {
      this.#basedOn(version);
    }
    return decision === "again" ? "mine" : decision; // on the base that it has, so that it is asked about again
  }

  // Whether `theirs` is what may have been sent, and so has been saved.
  async #isOwn(theirs: LoadedDocument): Promise<boolean> {
    const all = theirs.version === "" ? [] : this.#sent;
    for (const { content, edits } of all) {
      const sent = await content();
      if (all !== this.#sent) {
        return false;
      }
      if (sent && isSame(theirs, sent)) {
        this.#savedEdits = edits;
        this.target.saved(sent);
        this.#basedOn(theirs.version);
        return true;
      }
    }
    return false;
  }

  #show(theirs: LoadedDocument): void {
    this.target.replace(theirs);
    this.#savedEdits = this.#edits;
    this.#basedOn(theirs.version);
  }

  #basedOn(version: string): void {
    this.version = version;
    this.#sent = [];
    this.#hasTheirs = false;
    this.target.update();
  }
}
