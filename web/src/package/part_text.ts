// SPDX-License-Identifier: Apache-2.0
// The text of a part, whose content comes and goes as a string that carries bytes. Only what comes back
// byte for byte is given out as a text at all.
import { bytesOf, stringOf } from "../../client/src/bytes.js";

export interface PartText {
  text: string;
  /** What the bytes are in, as TextDecoder names it. */
  charset: string;
  /** Whether the bytes begin with a byte-order mark, which is no part of `text`. */
  mark: boolean;
}

const DECLARATION = /^<\?xml[ \t\r\n][^>]*?encoding[ \t\r\n]*=[ \t\r\n]*["']([A-Za-z][A-Za-z0-9._-]*)["']/;

/** The text that `content` is; nothing when it is in no charset that it also could be saved in. */
export function decodePart(content: string): PartText | undefined {
  const charset = charsetOf(content);
  try {
    const decoded = new TextDecoder(charset, { fatal: true, ignoreBOM: true }).decode(bytesOf(content));
    const mark = decoded.startsWith("\ufeff");
    const result = { text: mark ? decoded.slice(1) : decoded, charset, mark };
    return encodePart(result) === content ? result : undefined;
  } catch {
    return undefined; // not in that charset, or in none that is known here
  }
}

/**
 * The content for a part with that text, in the charset that its XML declaration names, or else in that
 * of `charset`. XML gets character references for what the charset lacks. Where the text cannot be written
 * like that, it is in UTF-8, so that nothing is lost; isAsDeclared() tells that.
 */
export function encodePart(part: PartText): string {
  try {
    return encodeDeclared(part);
  } catch {
    return stringOf(new TextEncoder().encode(part.mark ? `\ufeff${part.text}` : part.text));
  }
}

/** Whether encodePart() writes that text in the charset that its XML declaration names, if it has one. */
export function isAsDeclared(part: PartText): boolean {
  try {
    encodeDeclared(part);
    return true;
  } catch {
    return false;
  }
}

// Throws RangeError when the declared charset is not known or not written, or lacks what stands outside of XML.
function encodeDeclared({ text, charset, mark }: PartText): string {
  const declared = DECLARATION.exec(text)?.[1]?.toLowerCase();
  let encoding = charset;
  let withMark = mark;
  if (declared === "utf-16") {
    withMark ||= !charset.startsWith("utf-16");
    encoding = charset.startsWith("utf-16") ? charset : "utf-16le";
  } else if (declared && !charset.startsWith("utf-16")) {
    encoding = new TextDecoder(declared).encoding;
  }
  const marked = withMark ? `\ufeff${text}` : text;
  switch (encoding) {
    case "utf-8":
      return stringOf(new TextEncoder().encode(marked));
    case "utf-16le":
    case "utf-16be":
      return encodeUtf16(marked, encoding === "utf-16le");
    default:
      return encodeSingleBytes(text, encoding);
  }
}

function charsetOf(content: string): string {
  if (content.startsWith("\xff\xfe") || content.startsWith("<\0")) {
    return "utf-16le";
  }
  if (content.startsWith("\xfe\xff") || content.startsWith("\0<")) {
    return "utf-16be";
  }
  const declared = DECLARATION.exec(content.slice(0, 200))?.[1];
  try {
    const { encoding } = new TextDecoder(declared);
    // Bytes in which such a declaration can be read are in no UTF-16.
    return encoding.startsWith("utf-16") ? "utf-8" : encoding;
  } catch {
    return "utf-8";
  }
}

function encodeUtf16(text: string, isLittleEndian: boolean): string {
  const bytes = new Uint8Array(text.length * 2);
  const view = new DataView(bytes.buffer);
  for (let index = 0; index < text.length; ++index) {
    view.setUint16(index * 2, text.charCodeAt(index), isLittleEndian);
  }
  return stringOf(bytes);
}

// Throws RangeError for charsets with more than a byte to a character.
function encodeSingleBytes(text: string, charset: string): string {
  if (/^[\0-\x7f]*$/.test(text)) {
    return text; // the same in all of them, also in those of several bytes
  }
  const byteOf = new Map<string, string>();
  const decoder = new TextDecoder(charset);
  for (let byte = 0; byte < 256; ++byte) {
    const characters = decoder.decode(Uint8Array.of(byte));
    if (characters.length !== 1 || (byte < 0x80 && characters.charCodeAt(0) !== byte)) {
      throw new RangeError(`${charset} is not written`);
    }
    byteOf.set(characters, String.fromCharCode(byte));
  }
  const isXml = /^\s*</.test(text);
  return Array.from(text, (character) => {
    const byte = byteOf.get(character);
    if (byte === undefined && !isXml) {
      throw new RangeError(`${charset} has no ${character}`);
    }
    return byte ?? `&#x${character.codePointAt(0)!.toString(16).toUpperCase()};`;
  }).join("");
}
