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
  /** The document as it stands; nothing when the person thinks better of saving it. */
  content(): Promise<DocumentContent | undefined>;
  /** Has it saved if the document still has the version `base`. Throws when no answer came. */
  write(content: DocumentContent, base: string): Promise<SaveResult>;
  /** `content` is on disk now. */
  saved(content: DocumentContent): void;
  /** What is saved now; nothing where there is no such file any more. */
  load(): Promise<LoadedDocument | undefined>;
  /** Shows what somebody else saved instead of what is unsaved. */
  replace(theirs: LoadedDocument): void;
  /** Asks what to do about what somebody else saved (nothing: removed). Nothing: not now. */
  resolve(theirs: LoadedDocument | undefined): Promise<"mine" | "theirs" | undefined>;
  /** One of the members of the saver has changed. */
  update(): void;
}

/** The host answered that it did not save, though nobody else has. */
export class SaveRefused extends Error {}

export class Saver {
  #edits: number;
  #savedEdits = 0;
  #running: Promise<boolean> | undefined;
  #isWantedAgain = false;
  #hasTheirs = false;
  // What was sent last, while it is not known whether it was saved, or as which version.
  #sent: DocumentContent | undefined;

  /** `version` is what the document is based on; `isUnsaved` where it already differs from that. */
  constructor(
    private target: SaveTarget,
    private version: string,
    isUnsaved = false,
  ) {
    this.#edits = isUnsaved ? 1 : 0;
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
    await this.#running?.catch(() => undefined);
    const theirs = await this.target.load();
    await this.#running?.catch(() => undefined);
    if (!theirs || theirs.version === this.version) {
      return "same";
    }
    if (this.#isOwn(theirs)) {
      this.#basedOn(theirs.version);
      return "same";
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
      const edits = this.#edits;
      const content = await this.target.content();
      if (!content) {
        return false;
      }
      const earlier = this.#sent;
      this.#sent = content;
      const result = await this.target.write(content, this.version);
      if (result.isSaved) {
        await this.#saved(edits, content, result);
        return true;
      }
      this.#sent = earlier; // A refused save has not been made.
      const decision = await this.#refused();
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

  async #refused(): Promise<"mine" | "theirs" | undefined> {
    const theirs = await this.target.load();
    const version = theirs?.version ?? "";
    if (version === this.version) {
      throw new SaveRefused();
    }
    if (theirs && this.#isOwn(theirs)) {
      this.#basedOn(version);
      return "mine";
    }
    this.#hasTheirs = true;
    this.target.update();
    const decision = await this.target.resolve(theirs);
    if (decision === "theirs" && theirs) {
      this.#show(theirs);
    } else if (decision === "mine") {
      this.#basedOn(version);
    }
    return decision;
  }

  #isOwn(theirs: LoadedDocument): boolean {
    return this.#sent !== undefined && isSame(theirs, this.#sent);
  }

  #show(theirs: LoadedDocument): void {
    this.target.replace(theirs);
    this.#savedEdits = this.#edits;
    this.#basedOn(theirs.version);
  }

  #basedOn(version: string): void {
    this.version = version;
    this.#sent = undefined;
    this.#hasTheirs = false;
    this.target.update();
  }
}
