// SPDX-License-Identifier: Apache-2.0
// The charsets that the page knows, under the host's names for them. Their tables are loaded when they are
// needed.
import type { Charset, Decoded } from "./charset.js";
import { TableCharset } from "./table.js";
import { UNICODE_FORMS } from "./unicode.js";

export * from "./charset.js";

/** Loads a file of the folder of tables. Rejects when there is none. */
export type TableLoader = (file: string) => Promise<Uint8Array>;

// Charsets of escape sequences, which are only shown: their texts can be spelt in several ways.
const ESCAPED: Record<string, string> = {
  "ISO-2022-JP": "iso-2022-jp",
  "ISO-2022-JP-1": "iso-2022-jp",
  "ISO-2022-JP-2": "iso-2022-jp",
};

class ShownCharset implements Charset {
  readonly isUnicode = false;
  readonly canEncode = false;

  constructor(
    readonly name: string,
    private label: string,
  ) {}

  decode(bytes: Uint8Array): Decoded {
    const text = new TextDecoder(this.label).decode(bytes);
    return { text, isDamaged: text.includes("\ufffd") };
  }

  encode(): never {
    throw new Error(`texts are not encoded in ${this.name}`);
  }
}

export class Charsets {
  #index: Promise<Record<string, string>> | undefined;
  #opened = new Map<string, Promise<Charset>>();

  constructor(private load: TableLoader) {}

  /** The names of all charsets that texts can be saved in. */
  async names(): Promise<string[]> {
    return [...UNICODE_FORMS.map(({ name }) => name), ...Object.keys(await this.#files())];
  }

  /** The charset `name`; nothing when the page does not know it. Rejects when its table cannot be loaded. */
  async open(name: string): Promise<Charset | undefined> {
    const form = UNICODE_FORMS.find((one) => one.name === name);
    if (form) {
      return form;
    }
    if (name in ESCAPED) {
      return new ShownCharset(name, ESCAPED[name]!);
    }
    const file = (await this.#files())[name];
    if (file === undefined) {
      return undefined;
    }
    let opened = this.#opened.get(name);
    if (!opened) {
      opened = this.load(file).then((table) => new TableCharset(name, table));
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
