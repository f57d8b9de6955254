// SPDX-License-Identifier: Apache-2.0
// The view in which a text is edited.
import type { Room } from "../document_view.js";
import { Charsets } from "./charsets/index.js";
import { type TextDraft, contentOf } from "./draft.js";
import { TextView } from "./text_view.js";

async function loadTable(file: string): Promise<Uint8Array> {
  const response = await fetch(new URL(`charsets/${file}`, document.baseURI));
  if (!response.ok) {
    throw new Error(`${file}: ${response.status}`);
  }
  return new Uint8Array(await response.arrayBuffer());
}

const charsets = new Charsets(loadTable);

export const texts: Room = {
  open: (loaded, page, draft) => new TextView(charsets, loaded, page, draft),
  contentOf: (draft) => contentOf(draft as TextDraft, charsets),
};
