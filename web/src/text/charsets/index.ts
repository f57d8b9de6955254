// SPDX-License-Identifier: Apache-2.0
// The charsets that the page knows, under the host's names for them. Their tables are loaded when they are
// needed.
import type { Charset } from "./charset.js";
import { ESCAPED, openEscaped } from "./escaped.js";
import { TableCharset } from "./table.js";
import { UNICODE_FORMS } from "./unicode.js";

export * from "./charset.js";
export { ESCAPED };

/** Loads a file of the folder of tables. Rejects when there is none. */
export type TableLoader = (file: string) => Promise<Uint8Array>;

export class Charsets {
  #index: Promise<Record<string, string>> | undefined;
  #opened = new Map<string, Promise<Charset>>();

  constructor(private load: TableLoader) {}

  /** The names of all charsets that texts can be saved in. Those of ESCAPED can only be read. */
  async names(): Promise<string[]> {
    return [...UNICODE_FORMS.map(({ name }) => name), ...Object.keys(await this.#files())];
  }

  /** The charset `name`; nothing when the page does not know it. Rejects when its table cannot be loaded. */
  async open(name: string): Promise<Charset | undefined> {
    const form = UNICODE_FORMS.find((one) => one.name === name);
    if (form) {
      return form;
    }
    let opened = this.#opened.get(name);
    if (!opened) {
      const file = (await this.#files())[name];
      if (ESCAPED.includes(name)) {
        opened = openEscaped(name, async (file) => new TableCharset(file, await this.load(file)));
      } else if (file !== undefined) {
        opened = this.load(file).then((table) => new TableCharset(name, table));
      } else {
        return undefined;
      }
      opened.catch(() => this.#opened.delete(name)); // to be tried again
      this.#opened.set(name, opened);
    }
    return opened;
  }

  #files(): Promise<Record<string, string>> {
    if (!this.#index) {
      this.#index = this.load("charsets.json").then((bytes) => JSON.parse(new TextDecoder().decode(bytes)));
      this.#index.catch(() => (this.#index = undefined));
    }
    return this.#index;
  }
}
