// SPDX-License-Identifier: Apache-2.0
// When a document's draft is stored: soon after an edit, but the rarer the longer it takes.

const SOONEST = 250; // ms after an edit
const LATEST = 10_000;
const SHARE = 20; // a draft may take up to so small a part of the time

/** What `store` and `remove` do takes effect in the order in which they are called, also before they are done. */
export interface Keeping {
  /** Stores what is unsaved. */
  store(): Promise<void>;
  remove(): Promise<void>;
  /** A draft could not be stored; said once. */
  failed(reason: unknown): void;
}

export class DraftKeeper {
  #timer: ReturnType<typeof setTimeout> | undefined;
  #last: Promise<void> = Promise.resolve();
  #taken = 0; // ms that the last draft took
  #hasFailed = false;

  constructor(private keeping: Keeping) {}

  /** Whether an edit would be lost with the page now. */
  get isPending(): boolean {
    return this.#timer !== undefined || this.#hasFailed;
  }

  /** To be called on every edit. */
  changed(): void {
    this.#timer ??= setTimeout(() => void this.flush(), Math.min(LATEST, Math.max(SOONEST, SHARE * this.#taken)));
  }

  /** Stores the draft now, if an edit is not stored yet. */
  flush(): Promise<void> {
    if (this.#timer !== undefined) {
      this.#stop();
      this.#start(async () => {
        const begin = performance.now();
        await this.keeping.store();
        this.#taken = performance.now() - begin;
      });
    }
    return this.#last;
  }

  /** Removes the draft: nothing is unsaved. */
  clear(): Promise<void> {
    this.#stop();
    this.#start(() => this.keeping.remove());
    return this.#last;
  }

  #stop(): void {
    clearTimeout(this.#timer);
    this.#timer = undefined;
  }

  // At once, since the page may be left before an earlier one is done, and its draft must not outlive a save.
  #start(action: () => Promise<void>): void {
    const done = action();
    done.catch(() => {}); // it is looked at when those before it are done
    this.#last = this.#last.then(() => done).then(
      () => void (this.#hasFailed = false),
      (reason: unknown) => {
        if (!this.#hasFailed) {
          this.#hasFailed = true;
          this.keeping.failed(reason);
        }
      },
    );
  }
}
