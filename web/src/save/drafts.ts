// SPDX-License-Identifier: Apache-2.0
// What is unsaved, kept by the browser (IndexedDB) so that it outlives a reload or a crash.
//
// A draft belongs to one window, by an id that is kept with the browser's tab; a window that lives holds a lock
// of the id's name. So drafts of a window that is gone can be told from those that another one is working on.
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
  /** What the view needs to show it again. */
  content: unknown;
  /** The same when the last save was sent, where it is not known what became of that save. */
  sent?: unknown;
}

const STORE = "drafts";

export class Drafts {
  /** Where the browser stores nothing, as when the disk is full, all that is asked of the drafts rejects. */
  static async open(window: WindowId): Promise<Drafts> {
    return new Drafts(await openDatabase().catch((reason: Error) => reason), window);
  }

  private constructor(
    private database: IDBDatabase | Error,
    private window: WindowId,
  ) {}

  async put(draft: Omit<Draft, "window">): Promise<void> {
    await this.#ask("readwrite", (store) => store.put({ ...draft, window: this.window.id }));
  }

  async remove(path: string): Promise<void> {
    await this.#ask("readwrite", (store) => store.delete([this.window.id, path]));
  }

  /** This window's drafts, and those of windows that are gone, which become this one's. */
  async take(): Promise<Draft[]> {
    const all = (await this.#ask("readonly", (store) => store.getAll())) as Draft[];
    const taken = new Map<string, Draft>();
    for (const draft of all) {
      const isOwn = draft.window === this.window.id;
      if (isOwn || (!taken.has(draft.path) && (await this.window.isGone(draft.window)))) {
        taken.set(draft.path, draft);
      }
    }
    for (const draft of [...taken.values()].filter(({ window }) => window !== this.window.id)) {
      await this.put(draft);
      await this.#ask("readwrite", (store) => store.delete([draft.window, draft.path]));
    }
    return [...taken.values()];
  }

  async #ask<Result>(
    mode: IDBTransactionMode,
    question: (store: IDBObjectStore) => IDBRequest<Result>,
  ): Promise<Result> {
    if (this.database instanceof Error) {
      throw this.database;
    }
    const transaction = this.database.transaction(STORE, mode);
    const request = question(transaction.objectStore(STORE));
    transaction.commit(); // not only when the request is done, and the page perhaps gone
    return new Promise((resolve, reject) => {
      transaction.oncomplete = () => resolve(request.result);
      transaction.onabort = transaction.onerror = () => reject(transaction.error ?? request.error);
    });
  }
}

async function openDatabase(): Promise<IDBDatabase> {
  const opening = indexedDB.open("editor", 1);
  opening.onupgradeneeded = () => opening.result.createObjectStore(STORE, { keyPath: ["window", "path"] });
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
