// SPDX-License-Identifier: Apache-2.0
// Reading a document with all that a view needs to know of it.
import { type Client, type ReadAnswer, type RequestOptions, textOf } from "../../client/src/index.js";
import type { LoadedDocument } from "../document_view.js";
import { isPackage } from "./paths.js";

/** There is no such document (the version is "" then), or it cannot be read; the message says why. */
export class UnreadableDocument extends Error {
  constructor(
    message: string,
    /** The version that it had before it was tried, so that what is saved meanwhile is not taken for that. */
    readonly version = "",
  ) {
    super(message);
  }
}

type Reader = Pick<Client, "read" | "version" | "charset" | "readVersion">;

const MOST_READINGS = 3; // of a file that changes all the time, as a log does

/**
 * Reads the document at `path`. A text comes with the charset that it is in; when somebody saves meanwhile,
 * it is read again, so that content, charset and version belong together. A document that changes during each
 * reading is returned as changing, with a version that has passed. Throws UnreadableDocument, and what the
 * client throws.
 */
export async function load(client: Reader, path: string, options: RequestOptions = {}): Promise<LoadedDocument> {
  const contentType = isPackage(path) ? "text/xml" : "text/plain";
  let version = await client.version(path, options);
  for (let readings = 1; ; ++readings) {
    const answer = readable(await client.read(path, contentType, options), version);
    const form = isPackage(path) ? {} : await client.charset(path, options);
    const after = await client.version(path, options);
    if (after === version || readings === MOST_READINGS) {
      return { path, version, answer, ...form, ...(after !== version && { isChanging: true }) };
    }
    version = after;
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

function readable(answer: ReadAnswer, version?: string): ReadAnswer {
  if (!answer.status) {
    throw new UnreadableDocument(answer.exception ? textOf(answer.exception) : "File does not exist", version);
  }
  return answer;
}
