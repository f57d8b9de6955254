// SPDX-License-Identifier: Apache-2.0
// What is unsaved of a text: the bytes that it was made from and what was changed since. The bytes are a
// Blob, which a browser stores without copying it through the page, however large the text is.
import type { ChangeSet } from "@codemirror/state";
import type { FileForm } from "./file_form.js";
import { type LineEnd, storable } from "./lines.js";

export interface TextDraft {
  base: Blob;
  /** The charset of `base`. */
  baseCharset: string;
  changes: unknown;
  charset: string;
  byteOrderMark: boolean;
  lineEnd: LineEnd;
  otherLineEnds: number[];
}

export function makeDraft(base: Blob, baseCharset: string, changes: ChangeSet, form: FileForm): TextDraft {
  const { charset, byteOrderMark, lineEnds } = form;
  return {
    ...{ base, baseCharset, changes: changes.toJSON(), charset: charset.name, byteOrderMark },
    ...{ lineEnd: lineEnds.usual, otherLineEnds: storable(lineEnds) },
  };
}
