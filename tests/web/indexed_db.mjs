// SPDX-License-Identifier: Apache-2.0
// As much of a browser's IndexedDB as the page uses, in memory. A question of it can be made to fail.

export class IndexedDb {
  /** Why a question is not answered: by the name of a store, "put", "delete" or "getAll", and what it is given. */
  fails = () => undefined;
  #databases = new Map();

  /** What a store of a database holds, by its keys as JSON. */
  held(database, store) {
    return this.#databases.get(database).get(store).values;
  }

  open(name) {
    const isNew = !this.#databases.has(name);
    const stores = this.#databases.get(name) ?? new Map();
    this.#databases.set(name, stores);
    const result = {
      createObjectStore: (store, { keyPath }) => stores.set(store, { keyPath: [keyPath].flat(), values: new Map() }),
      transaction: (store) => this.#transaction(store, stores.get(store)),
    };
    const request = { result };
    setTimeout(() => {
      if (isNew) {
        request.onupgradeneeded();
      }
      request.onsuccess();
    });
    return request;
  }

  #transaction(name, { keyPath, values }) {
    const transaction = { error: null, commit: () => {} };
    const asked = (question, given, answer) => {
      transaction.error = this.fails(name, question, given) ?? null;
      const request = { error: transaction.error, result: transaction.error ? undefined : answer() };
      setTimeout(() => (transaction.error ? transaction.onabort() : transaction.oncomplete()));
      return request;
    };
    transaction.objectStore = () => ({
      put: (value) => {
        const stored = structuredClone(value);
        return asked("put", value, () => void values.set(JSON.stringify(keyPath.map((key) => value[key])), stored));
      },
      delete: (key) => asked("delete", key, () => void values.delete(JSON.stringify([key].flat()))),
      getAll: () => asked("getAll", undefined, () => structuredClone([...values.values()])),
    });
    return transaction;
  }
}
