// SPDX-License-Identifier: Apache-2.0
// A Word document as nodes of HTML, by docx-preview, from the parts in memory.
import { parseAsync, renderDocument as renderParsed } from "docx-preview";

import type { Document, Part } from "../../client/src/index.js";
import { inertNodes } from "./inert_nodes.js";
import { openParts } from "./parts_archive.js";

export interface Rendering {
  /** Of a document of their own, which runs and loads nothing. */
  nodes: Node[];
  /** The object URLs that the nodes refer to, to be revoked when they are no longer shown. */
  urls: string[];
}

/**
 * Images that are in `blobs` are taken from there, and others put there, for the next time: to make them again takes
 * seconds in a document full of photographs. Throws what docx-preview throws when it cannot make sense of the document.
 */
export async function renderDocument(content: Document, blobs: WeakMap<Part, Blob>): Promise<Rendering> {
  const { make, urls } = inertNodes();
  const options = {
    h: make,
    ignoreFonts: true, // those in the document: files of a stranger's that no other reader needs
    renderAltChunks: false, // whole web pages
  };
  const parsed = await parseAsync(openParts(content, blobs), options);
  return { nodes: await renderParsed(parsed, options), urls };
}
