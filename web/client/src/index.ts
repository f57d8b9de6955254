// SPDX-License-Identifier: Apache-2.0
// A client of an editor serialization host, for browsers and Node.js.
import { wsconnect, type ConnectionOptions, type NatsConnection } from "@nats-io/nats-core";

import { bytesOf, isPlainText, stringOf, textOf, utf8 } from "./bytes.js";
import { AskAgain, exchange, type Progress } from "./exchange.js";

export { AskAgain, bytesOf, isPlainText, stringOf, textOf, utf8, type NatsConnection, type Progress };

const READ = ["/zpr/service/readRequest_cpp", "/zpr/service/readResponse/"] as const;
const WRITE = ["/zpr/service/writeRequest_cpp", "/zpr/service/writeResponse/"] as const;
const FILES = ["/zpr/service/filesRequest_host", "/zpr/service/filesResponse/"] as const;
const NOTIFICATION = "/zpr/service/notifyFileSystemRequest";

/** A document package: what a read answers and a write takes. Its strings carry bytes. */
export interface Document {
  parts: Part[];
  relationships: Relationship[];
}

export interface Part {
  partUri: string;
  contentType: string;
  content: string;
  relationship: Relationship[] | null;
}

export interface Relationship {
  relationshipId: string;
  relationshipType: string;
  target: string;
  targetMode?: string;
}

/** The answer to a read. "data" is a text, in the bytes of its file. */
export interface ReadAnswer extends Partial<Document> {
  status: boolean;
  data?: string;
  exception?: string;
}

export interface Change {
  filePath: string;
  isExistingFile: boolean;
}

/** The file service refused a question; the message says why. */
export class FilesError extends Error {}

export interface FolderEntry {
  name: string;
  kind: "file" | "folder" | "other";
  size: number; // in bytes
  time: number; // of the last change, in milliseconds since 1970
}

export interface FolderPage {
  /** In the order of their names' UTF-8 bytes. */
  entries: FolderEntry[];
  isLast: boolean;
}

export interface Charset {
  charset: string;
  byteOrderMark: boolean;
}

export interface EarlierVersion {
  time: number; // when it was replaced, in milliseconds since 1970
  size: number; // in bytes
}

/** An answer with the version of the document that it was read from. */
export interface VersionedAnswer {
  answer: ReadAnswer;
  /** "" when there is no such document. */
  version: string;
}

export interface RequestOptions {
  /** How long, in milliseconds, an answer may take to begin. 60000 without it. */
  timeout?: number;
  /** How often to ask, when nothing comes of it, before giving up. 5 without it. */
  tries?: number;
  signal?: AbortSignal;
  onProgress?: (progress: Progress) => void;
  /** Called when nothing came of a try, and there will be another. */
  onAskAgain?: () => void;
}

export interface WriteOptions extends RequestOptions {
  /** The charset of a text and of its file. "UTF-8" without it. */
  encoding?: string;
  /** The version that the content is based on; the save is made only if the file still has it. "": no file yet. */
  baseVersion?: string;
}

export interface SaveResult {
  isSaved: boolean;
  /** The version that the save made; hosts tell it of saves with a "baseVersion". */
  version?: string;
}

interface WaitingWrite {
  content: Document | string;
  options: WriteOptions;
  result: Promise<boolean>;
  resolve: (result: Promise<boolean>) => void;
}

/** Connects to a server: `servers` is its WebSocket's URL. Goes on connecting again for ever. */
export async function connect(options: ConnectionOptions): Promise<Client> {
  const nats = await wsconnect({ maxReconnectAttempts: -1, timeout: 10_000, ...options });
  return new Client(nats, options.user);
}

export class Client {
  #idPrefix: string;
  #requests = 0;
  #running = new Set<string>(); // files that are being written
  #waiting = new Map<string, WaitingWrite>();

  /** A client on a connection of nats-core, whose user is `user`. */
  constructor(
    readonly nats: NatsConnection,
    user?: string,
  ) {
    const random = Array.from(crypto.getRandomValues(new Uint32Array(4)), (part) => part.toString(36));
    this.#idPrefix = `${user ? `${user}.` : ""}${random.join("")}`;
  }

  /** Reads a file; `contentType` "text/xml" says that it is a document package. */
  async read(filePath: string, contentType: string, options: RequestOptions = {}): Promise<ReadAnswer> {
    return JSON.parse(stringOf(await this.readBytes(filePath, contentType, options)));
  }

  /** The answer as the bytes of its JSON: also where it is too long for a string. */
  readBytes(filePath: string, contentType: string, options: RequestOptions = {}): Promise<Uint8Array> {
    return this.#ask(READ, { contentType, filePath: utf8(filePath) }, options);
  }

  /**
   * Writes a package, or a text whose characters are the bytes for the file. Two writes of one file
   * are never under way at once: a later one waits, and takes the place of one that waits already,
   * which then has the later one's result.
   */
  write(filePath: string, content: Document | string, options: WriteOptions = {}): Promise<boolean> {
    if (!this.#running.has(filePath)) {
      return this.#start(filePath, content, options);
    }
    const waiting = this.#waiting.get(filePath);
    if (waiting) {
      Object.assign(waiting, { content, options });
      return waiting.result;
    }
    let resolve!: WaitingWrite["resolve"];
    const result = new Promise<boolean>((settle) => (resolve = settle));
    this.#waiting.set(filePath, { content, options, result, resolve });
    return result;
  }

  /**
   * Writes like `write`, but at once: who calls this sees to it that no two saves of a file are under way. Tells
   * which version the save has made, so that the next one can be based on it.
   */
  async save(filePath: string, content: Document | string, options: WriteOptions = {}): Promise<SaveResult> {
    let version: string | undefined;
    const isSaved = await this.#write(filePath, content, options, (word) => {
      version = JSON.parse(new TextDecoder().decode(word)).version;
    });
    return { isSaved, ...(isSaved && version !== undefined && { version }) };
  }

  /**
   * Writes a package that is the bytes of its JSON, with types that are storable: also where it is too long
   * for a string. Does not wait for other writes.
   */
  async writeBytes(filePath: string, content: Uint8Array, options: RequestOptions = {}): Promise<boolean> {
    const request = { contentType: "text/xml", filePath: utf8(filePath) };
    return JSON.parse(stringOf(await this.#ask(WRITE, request, options, undefined, content)));
  }

  /** The folders whose documents can be read and written. Rejects, as all that follow, with FilesError. */
  async roots(options: RequestOptions = {}): Promise<string[]> {
    return (await this.#askFiles<{ roots: string[] }>("roots", {}, options)).roots;
  }

  /** What is in a folder, up to 1000 entries of it: those whose names come after `after`. */
  list(folder: string, after = "", options: RequestOptions = {}): Promise<FolderPage> {
    return this.#askFiles("list", { filePath: folder, after }, options);
  }

  /** The charset in which a text is read; with a `time`, the one of its earlier version that was replaced then. */
  charset(filePath: string, { time, ...options }: RequestOptions & { time?: number } = {}): Promise<Charset> {
    return this.#askFiles("charset", { filePath, ...(time !== undefined && { time }) }, options);
  }

  /** The version of a document, a token made from its content. "" when there is none. */
  async version(filePath: string, options: RequestOptions = {}): Promise<string> {
    return (await this.#askFiles<{ version: string }>("version", { filePath }, options)).version;
  }

  /** The earlier versions of a document, the newest first. */
  async versions(filePath: string, options: RequestOptions = {}): Promise<EarlierVersion[]> {
    return (await this.#askFiles<{ versions: EarlierVersion[] }>("versions", { filePath }, options)).versions;
  }

  /** Reads an earlier version, which was replaced at `time`, as `read` reads the present one. */
  async readVersion(
    filePath: string,
    time: number,
    contentType: string,
    options: RequestOptions = {},
  ): Promise<ReadAnswer> {
    const question = { operation: "readVersion", filePath: utf8(filePath), time, contentType };
    return JSON.parse(stringOf(await this.#ask(FILES, question, options)));
  }

  /** Makes an earlier version the present one, which becomes an earlier one. */
  async restore(filePath: string, time: number, options: RequestOptions = {}): Promise<void> {
    await this.#askFiles("restore", { filePath, time }, options);
  }

  /**
   * Reads a file, and tells the version of just this content: it is asked for before and after, and the file
   * is read again when somebody has saved in between.
   */
  async readVersioned(filePath: string, contentType: string, options: RequestOptions = {}): Promise<VersionedAnswer> {
    for (let version = await this.version(filePath, options); ; ) {
      const answer = await this.read(filePath, contentType, options);
      const after = await this.version(filePath, options);
      if (after === version) {
        return { answer, version };
      }
      version = after;
    }
  }

  /** Calls `changed` whenever a file may have been written. What is returned ends that. */
  listen(changed: (change: Change) => void): () => void {
    const subscription = this.nats.subscribe(NOTIFICATION, {
      callback: (error, message) => {
        if (!error) {
          const change: Change = JSON.parse(new TextDecoder().decode(message.data));
          queueMicrotask(() => changed(change)); // what it throws would end the connection here
        }
      },
    });
    return () => subscription.unsubscribe();
  }

  close(): Promise<void> {
    return this.nats.close();
  }

  #start(filePath: string, content: Document | string, options: WriteOptions): Promise<boolean> {
    const result = this.#write(filePath, content, options).finally(() => {
      this.#running.delete(filePath);
      const next = this.#waiting.get(filePath);
      if (next) {
        this.#waiting.delete(filePath);
        next.resolve(this.#start(filePath, next.content, next.options));
      }
    });
    this.#running.add(filePath);
    return result;
  }

  async #write(
    filePath: string,
    content: Document | string,
    options: WriteOptions,
    hear?: (word: Uint8Array) => void,
  ): Promise<boolean> {
    const request =
      typeof content === "string"
        ? { contentType: "text/plain", encoding: options.encoding ?? "UTF-8", content }
        : { contentType: "text/xml", content: storable(content) };
    const { baseVersion } = options;
    const message = { filePath: utf8(filePath), ...request, ...(baseVersion !== undefined && { baseVersion }) };
    return JSON.parse(stringOf(await this.#ask(WRITE, message, options, hear)));
  }

  // The members of the file service's answer, whose texts are UTF-8.
  async #askFiles<Answer>(operation: string, question: object, options: RequestOptions): Promise<Answer> {
    const texts = Object.entries(question).map(([key, value]) => [key, typeof value === "string" ? utf8(value) : value]);
    const bytes = await this.#ask(FILES, { operation, ...Object.fromEntries(texts) }, options);
    const answer = JSON.parse(new TextDecoder().decode(bytes));
    if (!answer.status) {
      throw new FilesError(answer.exception);
    }
    return answer;
  }

  // Asks until an answer comes, with a new id each time, so that a late one is not taken for
  // another's. `hear` gets what the file service says about the request before its answer. The JSON `content`
  // becomes a member of the request.
  async #ask(
    [requestChannel, responsePrefix]: readonly [string, string],
    request: object,
    { timeout = 60_000, tries = 5, signal, onProgress, onAskAgain }: RequestOptions,
    hear?: (word: Uint8Array) => void,
    content?: Uint8Array,
  ): Promise<Uint8Array> {
    for (let left = tries; ; --left) {
      const rtcId = `${this.#idPrefix}-${++this.#requests}`;
      const message = JSON.stringify({ rtcId, ...request });
      const payload = content ? withContent(message, content) : bytesOf(message);
      const responseChannel = responsePrefix + rtcId;
      const words = hear && this.nats.subscribe(FILES[1] + rtcId, { callback: (error, message) => void (error ?? hear(message.data)) });
      try {
        return await exchange(this.nats, {
          ...{ rtcId, requestChannel, responseChannel, payload, timeout },
          ...(signal && { signal }),
          ...(onProgress && { onProgress }),
        });
      } catch (error) {
        if (!(error instanceof AskAgain) || left <= 1) {
          throw error;
        }
        onAskAgain?.();
      } finally {
        if (!this.nats.isClosed()) {
          words?.unsubscribe();
        }
      }
      // At random, so that those who were turned away together do not come back together.
      await new Promise((resume) => setTimeout(resume, (tries - left + 1) * (100 + 400 * Math.random())));
    }
  }
}

// The bytes of `message`, an object that is not empty, with `content` as a member.
function withContent(message: string, content: Uint8Array): Uint8Array {
  const head = bytesOf(`${message.slice(0, -1)},"content":`);
  const payload = new Uint8Array(head.length + content.length + 1);
  payload.set(head);
  payload.set(content, head.length);
  payload.set(bytesOf("}"), head.length + content.length);
  return payload;
}

// The package, with the types of those parts in another case that would otherwise be refused as
// text or changed.
function storable({ parts, relationships }: Document): Document {
  return {
    parts: parts.map((part) =>
      part.contentType.startsWith("application/") && !isPlainText(part.content)
        ? { ...part, contentType: `A${part.contentType.slice(1)}` }
        : part,
    ),
    relationships,
  };
}
