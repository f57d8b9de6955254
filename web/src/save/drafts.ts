// SPDX-License-Identifier: Apache-2.0
// What is unsaved, kept by the browser (IndexedDB) so that it outlives a reload or a crash.
//
// A draft belongs to one window, by an id that is kept with the browser's tab; a window that lives holds a lock
// of the id's name. So drafts of a window that is gone can be told from those that another one is working on.
//
// What a draft was made from may be large, and stays as it is from edit to edit. It is stored once, in a database of
// its own: an older page that is still open would not let this one change the first.
import { sessionStore } from "../storage.js";

export interface Draft {
  window: string;
  path: string;
  /** The version that it is based on. */
  version: string;
  /** Those of the document that the view showed. */
  charset?: string;
  byteOrderMark?: boolean;
  readAs?: string;
  /** What the view needs to show it again. In the store, an id stands for the Blob `original` in it and in `sent`. */
  content: unknown;
  /** The same when the last save was sent, where it is not known what became of that save. */
  sent?: unknown;
}

/** What a draft was made from, by an id. */
interface Original {
  id: string;
  window: string;
  original: Blob;
}

interface Content {
  original?: Blob | string | undefined;
}

/** An original that is stored, or is being stored. */
interface Stored {
  id: string;
  original: Blob;
  stored: Promise<unknown>;
}

export class Drafts {
  #originals = new Map<string, Stored>(); // by path
  // Drafts of windows that are gone, by path, until this one has stored them, or does not need them any more.
  #left = new Map<string, { window: string; original: unknown }>();
  #failure: unknown; // why the drafts could not be taken, so that none may be replaced or removed

  /** Where the browser stores nothing, as when the disk is full, all that is asked of the drafts rejects. */
  static async open(window: WindowId): Promise<Drafts> {
    const drafts = Store.open("editor", "drafts", ["window", "path"]);
    return new Drafts(await drafts, await Store.open("editor originals", "originals", "id"), window);
  }

  private constructor(
    private drafts: Store,
    private originals: Store,
    private window: WindowId,
  ) {}

  async put(draft: Omit<Draft, "window">): Promise<void> {
    this.#requireTaken();
    const { content, sent } = draft as { content: Content; sent?: Content };
    const known = this.#store(draft.path, content?.original);
    const apart = (one: Content) => (known && one.original === content.original ? { ...one, original: known.id } : one);
    const stored = { ...draft, content: content && apart(content), ...(sent && { sent: apart(sent) }) };
    // Asked for at once, also while the original is being stored: the page may be about to go.
    const put = this.drafts.ask("readwrite", (store) => store.put({ ...stored, window: this.window.id }));
    await Promise.all([put, known?.stored]);
    await this.#letGo(draft.path);
  }

  async remove(path: string): Promise<void> {
    this.#requireTaken();
    await Promise.all([this.#removeOwn(path), this.#letGo(path)]);
  }

  /**
   * This window's drafts, and those of windows that are gone, which become this one's. Those that cannot be stored for
   * it stay where they are. Where this rejects, so does all that is asked later.
   */
  async take(): Promise<Draft[]> {
    try {
      return await this.#take();
    } catch (reason) {
      this.#failure = reason;
      throw reason;
    }
  }

  async #take(): Promise<Draft[]> {
    const all = (await this.drafts.ask("readonly", (store) => store.getAll())) as Draft[];
    const taken = new Map<string, Draft>();
    for (const draft of all) {
      const isOwn = draft.window === this.window.id;
      if (isOwn || (!taken.has(draft.path) && (await this.window.isGone(draft.window)))) {
        taken.set(draft.path, draft);
      }
    }
    await this.#takeOriginals(all, taken);
    for (const draft of taken.values()) {
      if (this.#left.has(draft.path)) {
        // Half of it stored would hide the whole of it.
        await this.put(draft).catch(() => this.#removeOwn(draft.path).catch(() => {}));
      }
    }
    return [...taken.values()];
  }

  #requireTaken(): void {
    if (this.#failure !== undefined) {
      throw this.#failure;
    }
  }

  async #removeOwn(path: string): Promise<void> {
    this.#store(path, undefined);
    await this.#delete(this.window.id, path);
  }

  async #letGo(path: string): Promise<void> {
    const left = this.#left.get(path);
    if (left) {
      await this.#delete(left.window, path);
      this.#left.delete(path);
      if (typeof left.original === "string") {
        this.#removeOriginal(left.original);
      }
    }
  }

  async #delete(window: string, path: string): Promise<void> {
    await this.drafts.ask("readwrite", (store) => store.delete([window, path]));
  }

  // Puts the Blobs of `taken` in the places of their ids, and removes those that are left of windows that are gone.
  async #takeOriginals(all: Draft[], taken: Map<string, Draft>): Promise<void> {
    const stored = (await this.originals.ask("readonly", (store) => store.getAll())) as Original[];
    const originals = new Map(stored.map((one) => [one.id, one]));
    const idOf = ({ content }: Draft) => (content as Content | undefined)?.original;
    for (const { id, window } of stored) {
      const isLeft = !all.some((draft) => idOf(draft) === id);
      if (isLeft && (window === this.window.id || (await this.window.isGone(window)))) {
        this.#removeOriginal(id);
      }
    }
    for (const draft of taken.values()) {
      const id = idOf(draft);
      const isOwn = draft.window === this.window.id;
      if (!isOwn) {
        this.#left.set(draft.path, { window: draft.window, original: id });
      }
      if (typeof id === "string") {
        const original = originals.get(id)?.original;
        for (const one of [draft.content, draft.sent] as (Content | undefined)[]) {
          if (one?.original === id) {
            one.original = original;
          }
        }
        if (original && isOwn) {
          this.#originals.set(draft.path, { id, original, stored: Promise.resolve() });
        }
      }
    }
  }

  // Stores `original` for the draft at `path`, unless it is stored, or being stored, already. Another one is removed.
  #store(path: string, original: Blob | string | undefined): Stored | undefined {
    const known = this.#originals.get(path);
    if (known?.original === original) {
      return known;
    }
    if (known) {
      this.#originals.delete(path);
      this.#removeOriginal(known.id);
    }
    if (!(original instanceof Blob)) {
      return undefined;
    }
    const id = newId();
    const stored = this.originals.ask("readwrite", (store) => store.put({ id, window: this.window.id, original }));
    const made = { id, original, stored };
    this.#originals.set(path, made);
    stored.catch(() => {
      if (this.#originals.get(path) === made) {
        this.#originals.delete(path); // so that the next draft tries again
      }
    });
    return made;
  }

  // One that remains is removed when the drafts are taken.
  #removeOriginal(id: string): void {
    this.originals.ask("readwrite", (store) => store.delete(id)).catch(() => {});
  }
}

class Store {
  static async open(database: string, name: string, keyPath: string | string[]): Promise<Store> {
    return new Store(await openDatabase(database, name, keyPath).catch((reason: Error) => reason), name);
  }

  private constructor(
    private database: IDBDatabase | Error,
    private name: string,
  ) {}

  async ask<Result>(
    mode: IDBTransactionMode,
    question: (store: IDBObjectStore) => IDBRequest<Result>,
  ): Promise<Result> {
    if (this.database instanceof Error) {
      throw this.database;
    }
    const transaction = this.database.transaction(this.name, mode);
    const request = question(transaction.objectStore(this.name));
    transaction.commit(); // not only when the request is done, and the page perhaps gone
    return new Promise((resolve, reject) => {
      transaction.oncomplete = () => resolve(request.result);
      transaction.onabort = transaction.onerror = () => reject(transaction.error ?? request.error);
    });
  }
}

async function openDatabase(database: string, store: string, keyPath: string | string[]): Promise<IDBDatabase> {
  const opening = indexedDB.open(database, 1);
  opening.onupgradeneeded = () => opening.result.createObjectStore(store, { keyPath });
  return resultOf(opening);
}

function resultOf<Result>(request: IDBRequest<Result>): Promise<Result> {
  return new Promise((resolve, reject) => {
    request.onsuccess = () => resolve(request.result);
    request.onerror = () => reject(request.error);
  });
}

export interface WindowId {
  readonly id: string;
  /** Whether the window that `id` stands for is no more. */
  isGone(id: string): Promise<boolean>;
}

const KEY = "window";
const PATIENCE = 1000; // ms that the page which was here before a reload may need to let go of its lock

/** This window's id: the one that it had before the page was loaded again, unless a copy of it has that. */
export async function ownWindow(): Promise<WindowId> {
  let id = sessionStore.getItem(KEY) ?? newId();
  const locks = navigator.locks as LockManager | undefined; // there is none without https or a loopback address
  if (locks && !(await hold(locks, id))) {
    id = newId(); // a copied tab, with all that was kept for it
    await hold(locks, id);
  }
  sessionStore.setItem(KEY, id);
  return {
    id,
    isGone: async (other) => {
      const held = (await locks?.query())?.held;
      return held !== undefined && !held.some(({ name }) => name === lockOf(other));
    },
  };
}

// Holds the lock until the page is gone. False when another page keeps it.
function hold(locks: LockManager, id: string): Promise<boolean> {
  return new Promise((resolve) => {
    const isHeld = () => new Promise<never>(() => resolve(true));
    locks.request(lockOf(id), { signal: AbortSignal.timeout(PATIENCE) }, isHeld).catch(() => resolve(false));
  });
}

function lockOf(id: string): string {
  return `window ${id}`;
}

function newId(): string {
  return crypto.getRandomValues(new Uint32Array(2)).join("-");
}
