// SPDX-License-Identifier: Apache-2.0
// What is unsaved of a text: the bytes that it was made from and what was changed since. The bytes are a
// Blob, which a browser stores without copying it through the page, however large the text is.
import { ChangeSet } from "@codemirror/state";
import { stringOf } from "../../client/src/index.js";
import type { DocumentContent } from "../document_view.js";
import type { Charset, Charsets } from "./charsets/index.js";
import { type FileForm, encodeFile } from "./file_form.js";
import { type LineEnd, fromStored, splitLines, storable } from "./lines.js";

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

/** The form that `draft` gives the file; `charset` is that of its name. */
export function formOf({ byteOrderMark, lineEnd, otherLineEnds }: TextDraft, charset: Charset): FileForm {
  return { charset, byteOrderMark, lineEnds: fromStored(lineEnd, otherLineEnds) };
}

/** What a save of `draft` sends. Nothing where its charset cannot hold it. */
export async function contentOf(draft: TextDraft, charsets: Charsets): Promise<DocumentContent | undefined> {
  const [before, charset] = await Promise.all([charsets.open(draft.baseCharset), charsets.open(draft.charset)]);
  if (!before || !charset?.canEncode) {
    return undefined;
  }
  const { doc } = splitLines(before.decode(new Uint8Array(await draft.base.arrayBuffer())).text);
  const { bytes, lacking } = encodeFile(ChangeSet.fromJSON(draft.changes).apply(doc), formOf(draft, charset));
  return lacking ? undefined : { kind: "text", content: stringOf(bytes), encoding: charset.name };
}
