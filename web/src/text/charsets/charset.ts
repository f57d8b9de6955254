// SPDX-License-Identifier: Apache-2.0
// What decodes and encodes the texts of one charset.

/** Characters of a text that its charset lacks: code units `from` to `to`. */
export interface Lacking {
  from: number;
  to: number;
}

export interface Decoded {
  text: string;
  /** Whether U+FFFD stands for bytes that mean nothing in the charset. Such a text cannot be saved. */
  isDamaged: boolean;
}

export interface Charset {
  readonly name: string;
  /** Whether it is a form of Unicode, which holds all characters. */
  readonly isUnicode: boolean;
  /** Whether its texts may begin with a byte-order mark. */
  readonly mayHaveMark: boolean;
  /** False of a charset in which texts are only shown. */
  readonly canEncode: boolean;
  /** The text of `bytes`. A byte-order mark is kept as U+FEFF. */
  decode(bytes: Uint8Array): Decoded;
  /** The bytes of `text` are added to `sink`, but for those of what the charset lacks, which is returned. */
  encode(text: string, sink: ByteSink): Lacking[];
}

/** Bytes that are being put together. */
export class ByteSink {
  bytes: Uint8Array;
  length = 0;

  constructor(capacity: number) {
    this.bytes = new Uint8Array(Math.max(capacity, 64));
  }

  /** Makes room for `more` bytes behind `length`. */
  reserve(more: number): void {
    if (this.length + more > this.bytes.length) {
      const larger = new Uint8Array(Math.max(this.length + more, this.bytes.length * 2));
      larger.set(this.bytes.subarray(0, this.length));
      this.bytes = larger;
    }
  }

  /** The bytes so far. */
  result(): Uint8Array {
    return this.bytes.subarray(0, this.length);
  }
}

/** The string of `length` code units. */
export function stringOfUnits(units: Uint16Array<ArrayBuffer>, length = units.length): string {
  // Browsers run on little-endian machines.
  return new TextDecoder("utf-16le", { ignoreBOM: true }).decode(units.subarray(0, length));
}
