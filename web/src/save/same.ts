// SPDX-License-Identifier: Apache-2.0
// Whether a document that was read is one that was sent to be saved.
import type { Part, Relationship } from "../../client/src/index.js";
import type { DocumentContent, LoadedDocument } from "../document_view.js";

// Byte-order marks, which are saved with a text but not read with it. The longer ones first.
const MARKS = ["\xff\xfe\0\0", "\0\0\xfe\xff", "\xef\xbb\xbf", "\xff\xfe", "\xfe\xff", "\x84\x31\x95\x33"];

/** Whether `loaded` has the content `sent`. False also in rare cases in which the host stored it otherwise. */
export function isSame(loaded: LoadedDocument, sent: DocumentContent): boolean {
  const { answer, unreadable } = loaded;
  if (unreadable !== undefined) {
    return false;
  }
  if (sent.kind === "text") {
    const mark = loaded.byteOrderMark ? MARKS.find((one) => sent.content.startsWith(one)) : "";
    return mark !== undefined && answer.data === sent.content.slice(mark.length);
  }
  const { parts, relationships } = sent.content;
  const there = new Map(answer.parts?.map((part) => [part.partUri, part]));
  return (
    answer.parts?.length === parts.length &&
    haveSame(answer.relationships ?? [], relationships) &&
    parts.every((part) => isSamePart(there.get(part.partUri), part))
  );
}

function isSamePart(loaded: Part | undefined, sent: Part): boolean {
  return (
    loaded !== undefined &&
    loaded.content === sent.content &&
    loaded.contentType.toLowerCase() === sent.contentType.toLowerCase() &&
    haveSame(loaded.relationship ?? [], sent.relationship ?? [])
  );
}

function haveSame(some: readonly Relationship[], others: readonly Relationship[]): boolean {
  const keys = new Set(some.map(keyOf));
  return some.length === others.length && others.every((one) => keys.has(keyOf(one)));
}

function keyOf({ relationshipId, relationshipType, target }: Relationship): string {
  return [relationshipId, relationshipType, target].join("\n");
}
