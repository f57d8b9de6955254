// SPDX-License-Identifier: Apache-2.0
// Charsets of seven bits whose codes change their meaning: ISO 2022's, HZ and UTF-7. Their texts can be spelt in
// several ways, so they are only shown.
import { type Charset, type Decoded, stringOfUnits } from "./charset.js";

const ESCAPE = 0x1b;
const REPLACEMENT = "\ufffd";

/** Loads the table of a set of characters. */
export type SetLoader = (file: string) => Promise<Charset>;

/** The characters of a set, by codes of `length` bytes. */
interface GraphicSet {
  length: 1 | 2;
  /** The character at a place of a text; U+FFFD where there is none. */
  at(bytes: Uint8Array, position: number): string;
}

const ASCII = single((code) => String.fromCharCode(code));
const ROMAN = single((code) => (code === 0x5c ? "\u00a5" : code === 0x7e ? "\u203e" : String.fromCharCode(code)));
const KATAKANA = single((code) => (code > 0x20 && code < 0x60 ? String.fromCharCode(0xff40 + code) : REPLACEMENT));

// By what stands behind an escape: the place that a set is put into, and the set, or its file and the length of its
// codes.
type Designation = [place: number, set: GraphicSet | string, length?: 1 | 2];
const SINGLE_BYTE: Record<string, Designation> = { "(B": [0, ASCII], "(J": [0, ROMAN], "(I": [0, KATAKANA] };
const JAPANESE: Record<string, Designation> = {
  ...SINGLE_BYTE,
  "$@": [0, "set-jis-x-0208.bin"],
  $B: [0, "set-jis-x-0208.bin"],
  "$(D": [0, "set-jis-x-0212.bin"],
  $A: [0, "set-gb-2312.bin"],
  "$(C": [0, "set-ks-c-5601.bin"],
  ".A": [2, "set-latin-1.bin", 1],
  ".F": [2, "set-greek.bin", 1],
};
const CHINESE: Record<string, Designation> = {
  "$)A": [1, "set-gb-2312.bin"],
  "$)E": [1, "set-iso-ir-165.bin"],
  "$)G": [1, "set-cns-1.bin"],
  "$*H": [2, "set-cns-2.bin"],
};
const KOREAN: Record<string, Designation> = { "$)C": [1, "set-ks-x-1001.bin"] };
const ISO_2022: Record<string, Record<string, Designation>> = {
  "ISO-2022-JP": JAPANESE,
  "ISO-2022-JP-1": JAPANESE,
  "ISO-2022-JP-2": JAPANESE,
  "ISO-2022-KR": KOREAN,
  "ISO-2022-CN": CHINESE,
  "ISO-2022-CN-EXT": CHINESE,
};

/** The names of the charsets here. */
export const ESCAPED: readonly string[] = [...Object.keys(ISO_2022), "HZ-GB-2312", "UTF-7"];

/** Opens one of ESCAPED, with the sets that it needs. */
export async function openEscaped(name: string, load: SetLoader): Promise<Charset> {
  if (name === "UTF-7") {
    return new ShownCharset(name, decodeUtf7);
  }
  if (name === "HZ-GB-2312") {
    return new ShownCharset(name, hzDecoder(loadedSet(await load("set-hz.bin"), 2)));
  }
  const designations = new Map<string, [number, GraphicSet]>();
  for (const [sequence, [place, set, length = 2]] of Object.entries(ISO_2022[name]!)) {
    designations.set(sequence, [place, typeof set === "string" ? loadedSet(await load(set), length) : set]);
  }
  return new ShownCharset(name, iso2022Decoder(designations, name === "ISO-2022-KR"));
}

function single(character: (code: number) => string): GraphicSet {
  return { length: 1, at: (bytes, position) => character(bytes[position]!) };
}

function loadedSet(table: Charset, length: 1 | 2): GraphicSet {
  const known = new Map<number, string>();
  return {
    length,
    at(bytes, position) {
      const key = length === 1 ? bytes[position]! : bytes[position]! * 0x100 + (bytes[position + 1] ?? 0);
      let character = known.get(key);
      if (character === undefined) {
        const { text } = table.decode(bytes.subarray(position, position + length));
        character = text.startsWith(REPLACEMENT) ? REPLACEMENT : text;
        known.set(key, character);
      }
      return character;
    },
  };
}

class ShownCharset implements Charset {
  readonly isUnicode = false;
  readonly mayHaveMark = false;
  readonly canEncode = false;

  constructor(
    readonly name: string,
    private decodeText: (bytes: Uint8Array) => string,
  ) {}

  decode(bytes: Uint8Array): Decoded {
    const text = this.decodeText(bytes);
    return { text, isDamaged: text.includes(REPLACEMENT) };
  }

  encode(): never {
    throw new Error(`texts are not encoded in ${this.name}`);
  }
}

// Text that is put together from many small pieces.
class Collector {
  #done = "";
  #pieces: string[] = [];

  add(piece: string): void {
    if (this.#pieces.push(piece) === 0x10000) {
      this.#flush();
    }
  }

  get text(): string {
    this.#flush();
    return this.#done;
  }

  #flush(): void {
    this.#done += this.#pieces.join("");
    this.#pieces = [];
  }
}

const SHIFT_OUT = 0x0e;
const SHIFT_IN = 0x0f;
const SINGLE_SHIFTS: Record<string, number> = { N: 2, O: 3 };

// The four places hold sets; codes are those of the first, or of the second while that is shifted in. A line ends
// what it has designated, but in Korean texts, which designate once for all.
function iso2022Decoder(
  designations: ReadonlyMap<string, [number, GraphicSet]>,
  keepsSets: boolean,
): (bytes: Uint8Array) => string {
  return (bytes) => {
    const collector = new Collector();
    let sets: (GraphicSet | undefined)[] = [ASCII];
    let shifted = 0;
    let single: number | undefined;
    for (let position = 0; position < bytes.length; ) {
      const byte = bytes[position]!;
      if (byte === ESCAPE) {
        const sequence = sequenceAt(bytes, position + 1, designations);
        const [place, set] = designations.get(sequence) ?? [];
        single = SINGLE_SHIFTS[sequence];
        if (place !== undefined) {
          sets[place] = set;
        } else if (single === undefined) {
          collector.add(REPLACEMENT);
        }
        position += 1 + sequence.length;
      } else if (byte === SHIFT_OUT || byte === SHIFT_IN) {
        shifted = byte === SHIFT_OUT ? 1 : 0;
        ++position;
      } else if (byte < 0x20 || (single === undefined && (byte === 0x20 || byte === 0x7f))) {
        if (byte === 0x0a || byte === 0x0d) {
          shifted = 0;
          sets = keepsSets ? sets : [sets[0] === ROMAN ? ROMAN : ASCII];
        }
        collector.add(String.fromCharCode(byte));
        ++position;
      } else {
        const set = byte < 0x80 ? sets[single ?? shifted] : undefined;
        const character = set?.at(bytes, position) ?? REPLACEMENT;
        collector.add(character);
        position += character === REPLACEMENT ? 1 : set!.length;
        single = undefined;
      }
    }
    return collector.text;
  };
}

// The longest of the known sequences; "" where none stands there.
function sequenceAt(bytes: Uint8Array, position: number, designations: ReadonlyMap<string, unknown>): string {
  for (const length of [3, 2, 1]) {
    const sequence = String.fromCharCode(...bytes.subarray(position, position + length));
    if (designations.has(sequence) || sequence in SINGLE_SHIFTS) {
      return sequence;
    }
  }
  return "";
}

// "~{" begins pairs of GB 2312 and "~}" ends them, as a line does; "~~" is "~".
function hzDecoder(pairs: GraphicSet): (bytes: Uint8Array) => string {
  const TILDE = 0x7e;
  return (bytes) => {
    const collector = new Collector();
    let isPairs = false;
    for (let position = 0; position < bytes.length; ) {
      const byte = bytes[position]!;
      const next = byte === TILDE ? String.fromCharCode(bytes[position + 1] ?? 0) : "";
      if (next === (isPairs ? "}" : "{")) {
        isPairs = !isPairs;
        position += 2;
      } else if (!isPairs && next === "~") {
        collector.add("~");
        position += 2;
      } else if (!isPairs && next === "\n") {
        position += 2;
      } else if (isPairs && byte !== 0x0a) {
        const character = pairs.at(bytes, position);
        collector.add(character);
        position += character === REPLACEMENT ? 1 : 2;
      } else {
        isPairs = false;
        collector.add(byte < 0x80 && byte !== TILDE ? String.fromCharCode(byte) : REPLACEMENT);
        ++position;
      }
    }
    return collector.text;
  };
}

const DIGITS = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

// RFC 2152: between "+" and "-", UTF-16 in base64; all else is itself.
function decodeUtf7(bytes: Uint8Array): string {
  const collector = new Collector();
  const text = new TextDecoder("iso-8859-1").decode(bytes);
  for (const [, direct, run, end] of text.matchAll(/([^+]+)|\+([A-Za-z0-9+/]*)(-?)/g)) {
    if (direct !== undefined) {
      collector.add(direct.replace(/[^\t\n\r -\[\]-}]/g, REPLACEMENT));
    } else {
      collector.add(run === "" ? (end ? "+" : REPLACEMENT) : unitsOf(run!));
    }
  }
  return collector.text;
}

function unitsOf(run: string): string {
  const units = new Uint16Array(Math.floor((run.length * 6) / 16));
  let length = 0;
  let bits = 0;
  let count = 0;
  for (const digit of run) {
    bits = (bits << 6) | DIGITS.indexOf(digit);
    count += 6;
    if (count >= 16) {
      count -= 16;
      units[length++] = bits >> count;
      bits &= (1 << count) - 1;
    }
  }
  // Bits that are left over fill the last digit, and are zero.
  return stringOfUnits(units) + (count >= 6 || bits !== 0 ? REPLACEMENT : "");
}
