// SPDX-License-Identifier: Apache-2.0
// Reading a document with all that a view needs to know of it.
import { type Client, type ReadAnswer, type RequestOptions, textOf } from "../../client/src/index.js";
import type { LoadedDocument } from "../document_view.js";
import { isPackage } from "./paths.js";

/** There is no such document, or it cannot be read; the message says why. */
export class UnreadableDocument extends Error {}

type Reader = Pick<Client, "readVersioned" | "version" | "charset" | "readVersion">;

/**
 * Reads the document at `path`. A text comes with the charset that it is in; when somebody saves meanwhile,
 * it is read again, so that content, charset and version belong together. Throws UnreadableDocument, and what
 * the client throws.
 */
export async function load(client: Reader, path: string, options: RequestOptions = {}): Promise<LoadedDocument> {
  if (isPackage(path)) {
    const { answer, version } = await client.readVersioned(path, "text/xml", options);
    return { path, version, answer: readable(answer) };
  }
  for (;;) {
    const { answer, version } = await client.readVersioned(path, "text/plain", options);
    readable(answer);
    const { charset, byteOrderMark } = await client.charset(path, options);
    if ((await client.version(path, options)) === version) {
      return { path, version, answer, charset, byteOrderMark };
    }
  }
}

/** Reads the version of `present` that was replaced at `time`. Throws as load() does. */
export async function loadEarlier(client: Reader, present: LoadedDocument, time: number): Promise<LoadedDocument> {
  const { path } = present;
  if (isPackage(path)) {
    return { path, version: "", isEarlier: true, answer: readable(await client.readVersion(path, time, "text/xml")) };
  }
  const answer = readable(await client.readVersion(path, time, "text/plain"));
  const { charset, byteOrderMark } = await client.charset(path, { time });
  const readAs = charset === present.charset ? present.readAs : undefined; // which was chosen for the one found
  return { path, version: "", isEarlier: true, answer, charset, byteOrderMark, ...(readAs && { readAs }) };
}

function readable(answer: ReadAnswer): ReadAnswer {
  if (!answer.status) {
    throw new UnreadableDocument(answer.exception ? textOf(answer.exception) : "File does not exist");
  }
  return answer;
}
