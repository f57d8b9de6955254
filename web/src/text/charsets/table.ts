// SPDX-License-Identifier: Apache-2.0
// Charsets whose characters have fixed codes, by the tables that tables/make_charset_tables.cpp makes,
// which describes their files.
import { type ByteSink, type Charset, type Decoded, type Lacking, stringOfUnits } from "./charset.js";

const NONE = 0xffffffff;
const REPLACEMENT = 0xfffd;

/** The codes of one length. Those that there could be are numbered, the last byte varying fastest. */
interface Section {
  length: number;
  lowest: number[];
  sizes: number[]; // how many values each byte has
  characters: Uint32Array; // by the number of the code
}

class Numbers {
  #position = 0;

  constructor(private bytes: Uint8Array) {}

  next(): number {
    let value = 0;
    for (let factor = 1; ; factor *= 0x80) {
      const byte = this.bytes[this.#position++];
      if (byte === undefined) {
        throw new RangeError("the table of a charset ends too early");
      }
      value += (byte & 0x7f) * factor;
      if (byte < 0x80) {
        return value;
      }
    }
  }

  nextDifference(): number {
    const value = this.next();
    return value % 2 === 1 ? -(value + 1) / 2 : value / 2;
  }
}

export class TableCharset implements Charset {
  readonly isUnicode = false;
  readonly canEncode = true;
  readonly mayHaveMark: boolean;
  #sections: Section[] = [];
  #single = new Uint32Array(256).fill(NONE);
  #pages: (Uint32Array | undefined)[] = []; // codes by character, in pages of 256

  /** `table` is a file of make_charset_tables. */
  constructor(
    readonly name: string,
    table: Uint8Array,
  ) {
    this.mayHaveMark = name === "GB18030";
    const numbers = new Numbers(table);
    for (let left = numbers.next(); left > 0; --left) {
      this.#readSection(numbers);
    }
  }

  decode(bytes: Uint8Array): Decoded {
    // Characters of two units have codes of at least two bytes.
    const units = new Uint16Array(bytes.length);
    let length = 0;
    let isDamaged = false;
    for (let position = 0; position < bytes.length; ) {
      let character = this.#single[bytes[position]!]!;
      let used = 1;
      if (character === NONE) {
        for (const section of this.#sections) {
          character = characterAt(section, bytes, position);
          if (character !== NONE) {
            used = section.length;
            break;
          }
        }
      }
      position += used;
      if (character < 0x10000) {
        units[length++] = character;
      } else if (character === NONE) {
        units[length++] = REPLACEMENT;
        isDamaged = true;
      } else {
        units[length++] = 0xd7c0 + (character >> 10);
        units[length++] = 0xdc00 | (character & 0x3ff);
      }
    }
    return { text: stringOfUnits(units, length), isDamaged };
  }

  encode(text: string, sink: ByteSink): Lacking[] {
    const lacking: Lacking[] = [];
    sink.reserve(4 * text.length);
    const { bytes } = sink;
    let end = sink.length;
    for (let index = 0; index < text.length; ) {
      const character = text.codePointAt(index)!;
      const used = character > 0xffff ? 2 : 1;
      const code = this.#pages[character >> 8]?.[character & 0xff] ?? NONE;
      if (code === NONE) {
        const last = lacking.at(-1);
        if (last?.to === index) {
          last.to += used;
        } else {
          lacking.push({ from: index, to: index + used });
        }
      } else {
        if (code > 0xffffff) {
          bytes[end++] = code >>> 24;
        }
        if (code > 0xffff) {
          bytes[end++] = (code >> 16) & 0xff;
        }
        if (code > 0xff) {
          bytes[end++] = (code >> 8) & 0xff;
        }
        bytes[end++] = code & 0xff;
      }
      index += used;
    }
    sink.length = end;
    return lacking;
  }

  #readSection(numbers: Numbers): void {
    const length = numbers.next();
    const lowest: number[] = [];
    const sizes: number[] = [];
    for (let byte = 0; byte < length; ++byte) {
      lowest.push(numbers.next());
      sizes.push(numbers.next() - lowest[byte]! + 1);
    }
    const size = sizes.reduce((product, one) => product * one, 1);
    const characters = length === 1 ? this.#single : new Uint32Array(size).fill(NONE);
    const section = { length, lowest, sizes, characters };
    if (length > 1) {
      this.#sections.push(section);
    }
    let place = 0;
    let character = 0;
    for (let runs = numbers.next(); runs > 0; --runs) {
      place += numbers.next();
      const count = numbers.next();
      character += numbers.nextDifference();
      for (let left = count >> 1; left > 0; --left, ++place, ++character) {
        characters[length === 1 ? place + lowest[0]! : place] = character;
        if (count % 2 === 0) {
          this.#setCode(character, codeAt(section, place));
        }
      }
    }
  }

  #setCode(character: number, code: number): void {
    const page = (this.#pages[character >> 8] ??= new Uint32Array(256).fill(NONE));
    page[character & 0xff] = code;
  }
}

// The number of the code at `position`; -1 when a byte is none of such a code.
function placeOf({ length, lowest, sizes }: Section, bytes: ArrayLike<number>, position: number): number {
  let place = 0;
  for (let index = 0; index < length; ++index) {
    const value = (bytes[position + index] ?? -1) - lowest[index]!;
    if (value < 0 || value >= sizes[index]!) {
      return -1;
    }
    place = place * sizes[index]! + value;
  }
  return place;
}

function characterAt(section: Section, bytes: Uint8Array, position: number): number {
  const place = placeOf(section, bytes, position);
  return place < 0 ? NONE : section.characters[place]!;
}

function codeAt({ length, lowest, sizes }: Section, place: number): number {
  let code = 0;
  let rest = place;
  for (let index = length - 1, factor = 1; index >= 0; --index, factor *= 0x100) {
    code += (lowest[index]! + (rest % sizes[index]!)) * factor;
    rest = Math.floor(rest / sizes[index]!);
  }
  return code;
}
