// SPDX-License-Identifier: Apache-2.0
// What makes a text the bytes of its file: charset, byte-order mark, line ends. It is part of the editor's
// state, so that undoing brings it back, too.
import { invertedEffects } from "@codemirror/commands";
import { type EditorState, type Extension, StateEffect, StateField, type Text } from "@codemirror/state";
import { ByteSink, type Charset, type Lacking } from "./charsets/index.js";
import { type LineEnds, mapLineEnds, piecesOf } from "./lines.js";

export interface FileForm {
  charset: Charset;
  byteOrderMark: boolean;
  lineEnds: LineEnds;
}

/** Gives the file another form. */
export const setFileForm = StateEffect.define<FileForm>({
  map: (form, changes) => ({ ...form, lineEnds: mapLineEnds(form.lineEnds, changes) }),
});

const field = StateField.define<FileForm>({
  create() {
    throw new Error("an editor of a text is told the form of its file");
  },
  update(form, transaction) {
    let updated = form;
    if (transaction.docChanged && form.lineEnds.exceptions.size > 0) {
      updated = { ...form, lineEnds: mapLineEnds(form.lineEnds, transaction.changes) };
    }
    for (const effect of transaction.effects) {
      if (effect.is(setFileForm)) {
        updated = effect.value;
      }
    }
    return updated;
  },
});

/** Makes `form` the one that an editor begins with. */
export function fileForm(form: FileForm): Extension {
  return [
    field.init(() => form),
    invertedEffects.of((transaction) => {
      const before = transaction.startState.field(field);
      const { exceptions } = before.lineEnds;
      const isChanged = transaction.effects.some((effect) => effect.is(setFileForm));
      // Breaks that an edit takes away come back with the ends that they had.
      return isChanged || (transaction.docChanged && exceptions.size > 0) ? [setFileForm.of(before)] : [];
    }),
  ];
}

export function fileFormOf(state: EditorState): FileForm {
  return state.field(field);
}

export interface EncodedText {
  bytes: Uint8Array;
  /** What the charset lacks: the characters, how many times in all, and where the first is. */
  lacking: { characters: Set<string>; count: number; first: number } | undefined;
}

/** The bytes of the file, but for those of characters that its charset lacks. Linear. */
export function encodeFile(doc: Text, { charset, byteOrderMark, lineEnds }: FileForm): EncodedText {
  const sink = new ByteSink(doc.length + 4 * doc.lines + 0x40000);
  if (byteOrderMark && charset.mayHaveMark) {
    charset.encode("\ufeff", sink);
  }
  const characters = new Set<string>();
  let count = 0;
  for (const piece of piecesOf(doc, lineEnds)) {
    for (const lacking of charset.encode(piece, sink)) {
      count += noteLacking(piece, lacking, characters);
    }
  }
  const first = count > 0 ? firstLacking(doc, charset) : 0;
  return { bytes: sink.result(), lacking: count > 0 ? { characters, count, first } : undefined };
}

function noteLacking(piece: string, { from, to }: Lacking, characters: Set<string>): number {
  const found = [...piece.slice(from, to)];
  for (const character of found) {
    characters.add(character);
  }
  return found.length;
}

function firstLacking(doc: Text, charset: Charset): number {
  let position = 0;
  for (const part of doc.iter()) {
    const [lacking] = part === "\n" ? [] : charset.encode(part, new ByteSink(4 * part.length));
    if (lacking) {
      return position + lacking.from;
    }
    position += part.length;
  }
  throw new Error("nothing is lacking");
}
