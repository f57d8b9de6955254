// SPDX-License-Identifier: Apache-2.0
// What the parts of a package are, and how their contents travel: images as data URIs, all else as bytes.
import { bytesOf, isPlainText, stringOf } from "../../client/src/bytes.js";
import type { Part } from "../../client/src/index.js";

export type PartKind = "xml" | "text" | "image" | "binary";

const kinds = new WeakMap<Part, PartKind>();
const LONGEST_GUESSED = 16_000_000; // bytes; of what is longer, nobody reads the text

/** What a part is shown as. */
export function kindOf(part: Part): PartKind {
  let kind = kinds.get(part);
  if (kind === undefined) {
    kind = tellKind(part);
    kinds.set(part, kind);
  }
  return kind;
}

function tellKind({ content, contentType }: Part): PartKind {
  const type = contentType.toLowerCase();
  if (type.startsWith("image/")) {
    return "image";
  }
  if (/[+/]xml *(;|$)/.test(type)) {
    return "xml";
  }
  const isText =
    type.startsWith("text/") ||
    (content !== "" &&
      content.length < LONGEST_GUESSED &&
      !/[\0-\x08]/.test(content.slice(0, 1000)) &&
      isPlainText(content));
  return isText ? "text" : "binary";
}

/** How many bytes a part has. */
export function sizeOf({ content, contentType }: Part): number {
  const encoded = encodedBytes(content, contentType);
  if (encoded === undefined) {
    return content.length;
  }
  const padding = content.endsWith("==") ? 2 : content.endsWith("=") ? 1 : 0;
  return (encoded.length / 4) * 3 - padding;
}

/** A part's bytes, as they are in the package. */
export function partBytes({ content, contentType }: Part): Uint8Array {
  const encoded = encodedBytes(content, contentType);
  return bytesOf(encoded === undefined ? content : atob(encoded));
}

/** `part` with other bytes, of the type of an image. */
export function withImage(part: Part, bytes: Uint8Array, contentType: string): Part {
  return { ...part, contentType, content: `data:${contentType};base64,${btoa(stringOf(bytes))}` };
}

function encodedBytes(content: string, contentType: string): string | undefined {
  const prefix = `data:${contentType};base64,`;
  return contentType.startsWith("image/") && content.startsWith(prefix) ? content.slice(prefix.length) : undefined;
}

/** The text that UTF-8 `bytes`, one in each character, are: of names and types. */
export function textOf(bytes: string): string {
  return new TextDecoder().decode(bytesOf(bytes));
}

/** Part names by what people expect: "slide2" before "slide10". */
export const byName = new Intl.Collator(undefined, { numeric: true }).compare;
