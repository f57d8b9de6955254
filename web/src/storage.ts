// SPDX-License-Identifier: Apache-2.0
// What the page remembers of its settings. Where the browser stores nothing, as when cookies are blocked, even to ask
// for its storage throws; then it is remembered until the page is left.

export type Store = Pick<Storage, "getItem" | "setItem">;

/** Ends with the browser's tab. */
export const sessionStore = storeIn(() => sessionStorage);
/** Outlives the browser. */
export const lastingStore = storeIn(() => localStorage);

/** A store in the browser's `storage`, and where that throws, in the page. It throws nothing itself. */
export function storeIn(storage: () => Store): Store {
  const kept = new Map<string, string>();
  return {
    getItem: (key) => {
      try {
        return kept.get(key) ?? storage().getItem(key);
      } catch {
        return null;
      }
    },
    setItem: (key, value) => {
      try {
        storage().setItem(key, value);
        kept.delete(key);
      } catch {
        kept.set(key, value);
      }
    },
  };
}
