// SPDX-License-Identifier: Apache-2.0
// What the page's rooms agree on: a document as it was read, the view in which it is edited, and what
// a view may ask of the page around it. text/, package/ and images/ make views; ui/ shows them in tabs; save/
// takes their content, keeps their drafts and resolves their conflicts.
import type { Client, Document, ReadAnswer } from "../client/src/index.js";

/** A document as it was read, with what the file service says of it. */
export interface LoadedDocument {
  path: string;
  /** The token of the content that was read; "" when there is no such file yet. */
  version: string;
  /** A successful answer: of a text "data", of a package "parts" and "relationships". */
  answer: ReadAnswer;
  /** Texts: the charset that the file is in, and whether it begins with a byte-order mark. */
  charset?: string;
  byteOrderMark?: boolean;
  /** Texts: the charset in which a person wants to read it instead. */
  readAs?: string;
  /** Why the file cannot be read, where that is so: then there is a version, and no content. */
  unreadable?: string;
  /** Whether it changed during every attempt to read it: it is a state that has passed, and may be a torn one. */
  isChanging?: boolean;
  /** Whether it is an earlier version, and not what is saved now. */
  isEarlier?: boolean;
}

/** What a save sends: a package, or a text as the bytes of its file in `encoding`. */
export type DocumentContent =
  | { kind: "package"; content: Document }
  | { kind: "text"; content: string; encoding: string };

/** An open document, as one of the rooms shows it in its tab. */
export interface DocumentView {
  readonly element: HTMLElement;

  /** Whether it holds only some parts of a document that was removed or could not be read, which they must not replace. */
  readonly isRemnant?: boolean;

  /**
   * The document as it stands, for a save. Asks the person first where something must be decided, such as
   * what becomes of characters that the charset lacks. Nothing when the person thinks better of it.
   */
  content(): Promise<DocumentContent | undefined>;

  /**
   * What is unsaved, as a value that IndexedDB can store; given to the factory after a reload. A Blob in its member
   * `original` is stored apart, once for all drafts that have it, and may be missing after a crash. `sent` is the draft that
   * it was when it was sent to be saved, where that may have been done: what was undone since then belongs to it, too.
   */
  draft(sent?: unknown): unknown;

  /** Shows `loaded` instead, which somebody else saved; what is unsaved is given up. */
  replace(loaded: LoadedDocument): void;

  /** `content` is on disk now: what differs from it is unsaved. For views that tell what was changed. */
  saved?(content: DocumentContent): void;

  /** Both sides beside each other, for a person to put together. Rejects, saying why, where they cannot be shown. */
  compare(theirs: LoadedDocument): Promise<Comparison>;

  focus(): void;

  /** Lets go of what the view holds. It is not used afterwards. */
  close(): void;
}

export interface Comparison {
  readonly element: HTMLElement;
  /** Whether a person has put something together in it. */
  readonly isEdited: boolean;
  /** The view's content becomes what the comparison shows as the result. Throws where it has changed meanwhile. */
  apply(): void;
  /** Lets go of what the comparison holds, applied or not. */
  close(): void;
}

export interface Choice {
  /** What is returned when this one is chosen. */
  value: string;
  label: string;
  isDefault?: boolean;
}

/** What a view may ask of the page. */
export interface Page {
  readonly client: Client;
  /** Translates: the text of `key` in the person's language, with {name} replaced by values.name. */
  text(key: string, values?: Record<string, string | number>): string;
  /** To be called on every edit. */
  changed(): void;
  /** Asks in a modal dialog. Nothing when it is closed without a choice. */
  ask(question: { title: string; message: string; choices: Choice[] }): Promise<string | undefined>;
  /** Tells in a line that screen readers read out, too. */
  tell(message: string, kind?: "information" | "problem"): void;
  /** Reads the document again, a text as `charset`, after asking when something is unsaved. */
  reopen(charset?: string): void;
}

/** What shows documents of one kind. Drafts are what their views said was unsaved. */
export interface Room {
  /** Makes the view of a document, with the edits of `draft`. */
  open(loaded: LoadedDocument, page: Page, draft?: unknown): DocumentView | Promise<DocumentView>;

  /**
   * What a save sent when the view held `draft`; `later` is the view's draft by now. Parts that neither of them changes
   * are taken from `loaded`, what is saved now. Nothing where it cannot be told, such as where a save asks first.
   */
  contentOf(draft: unknown, later: unknown, loaded: LoadedDocument): Promise<DocumentContent | undefined>;
}
