// SPDX-License-Identifier: Apache-2.0
// The encoding forms of Unicode. They lack nothing but surrogates that stand alone.
import { type ByteSink, type Charset, type Decoded, type Lacking, stringOfUnits } from "./charset.js";

const LONE_SURROGATE = /\p{Surrogate}/gu;
const REPLACEMENT = 0xfffd;

function loneSurrogates(text: string): Lacking[] {
  return Array.from(text.matchAll(LONE_SURROGATE), ({ index }) => ({ from: index, to: index + 1 }));
}

abstract class UnicodeForm implements Charset {
  readonly isUnicode = true;
  readonly mayHaveMark = true;
  readonly canEncode = true;

  constructor(readonly name: string) {}

  abstract decode(bytes: Uint8Array): Decoded;
  protected abstract add(text: string, sink: ByteSink): void;

  encode(text: string, sink: ByteSink): Lacking[] {
    const lacking = loneSurrogates(text);
    this.add(lacking.length > 0 ? text.replace(LONE_SURROGATE, "") : text, sink);
    return lacking;
  }
}

class Utf8 extends UnicodeForm {
  #encoder = new TextEncoder();

  decode(bytes: Uint8Array): Decoded {
    try {
      return { text: new TextDecoder("utf-8", { fatal: true, ignoreBOM: true }).decode(bytes), isDamaged: false };
    } catch {
      return { text: new TextDecoder("utf-8", { ignoreBOM: true }).decode(bytes), isDamaged: true };
    }
  }

  protected add(text: string, sink: ByteSink): void {
    sink.reserve(3 * text.length);
    sink.length += this.#encoder.encodeInto(text, sink.bytes.subarray(sink.length)).written;
  }
}

class Utf16 extends UnicodeForm {
  constructor(
    name: string,
    private isLittle: boolean,
  ) {
    super(name);
  }

  decode(bytes: Uint8Array): Decoded {
    const units = new Uint16Array(bytes.length >> 1);
    const [low, high] = this.isLittle ? [0, 1] : [1, 0];
    for (let index = 0; index < units.length; ++index) {
      units[index] = bytes[2 * index + low]! | (bytes[2 * index + high]! << 8);
    }
    const text = stringOfUnits(units);
    const isOdd = bytes.length % 2 !== 0;
    // The decoder has put U+FFFD where a surrogate stood alone.
    let isDamaged = isOdd;
    for (let index = 0; index < units.length && !isDamaged; ++index) {
      isDamaged = (units[index]! & 0xf800) === 0xd800 && text.charCodeAt(index) === REPLACEMENT;
    }
    return { text: isOdd ? `${text}\ufffd` : text, isDamaged };
  }

  protected add(text: string, sink: ByteSink): void {
    sink.reserve(2 * text.length);
    const { bytes } = sink;
    const [low, high] = this.isLittle ? [0, 1] : [1, 0];
    for (let index = 0; index < text.length; ++index, sink.length += 2) {
      const unit = text.charCodeAt(index);
      bytes[sink.length + low] = unit & 0xff;
      bytes[sink.length + high] = unit >> 8;
    }
  }
}

class Utf32 extends UnicodeForm {
  constructor(
    name: string,
    private isLittle: boolean,
  ) {
    super(name);
  }

  decode(bytes: Uint8Array): Decoded {
    const view = new DataView(bytes.buffer, bytes.byteOffset, bytes.byteLength);
    const units = new Uint16Array((bytes.length >> 1) + 1);
    let length = 0;
    let isDamaged = false;
    for (let offset = 0; offset < bytes.length; offset += 4) {
      let character = offset + 4 <= bytes.length ? view.getUint32(offset, this.isLittle) : -1;
      if (character < 0 || character > 0x10ffff || (character & 0xfffff800) === 0xd800) {
        isDamaged = true;
        character = REPLACEMENT;
      }
      if (character > 0xffff) {
        units[length++] = 0xd7c0 + (character >> 10);
        units[length++] = 0xdc00 | (character & 0x3ff);
      } else {
        units[length++] = character;
      }
    }
    return { text: stringOfUnits(units, length), isDamaged };
  }

  protected add(text: string, sink: ByteSink): void {
    sink.reserve(4 * text.length);
    const view = new DataView(sink.bytes.buffer);
    for (const character of text) {
      view.setUint32(sink.length, character.codePointAt(0)!, this.isLittle);
      sink.length += 4;
    }
  }
}

/** The encoding forms of Unicode, under the names that the host has for them. */
export const UNICODE_FORMS: readonly Charset[] = [
  new Utf8("UTF-8"),
  new Utf16("UTF-16LE", true),
  new Utf16("UTF-16BE", false),
  new Utf32("UTF-32LE", true),
  new Utf32("UTF-32BE", false),
];
