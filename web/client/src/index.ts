// SPDX-License-Identifier: Apache-2.0
// A client of an editor serialization host, for browsers and Node.js.
import { wsconnect, type ConnectionOptions, type NatsConnection } from "@nats-io/nats-core";

import { bytesOf, isPlainText, stringOf, utf8 } from "./bytes.js";
import { AskAgain, exchange, type Progress } from "./exchange.js";

export { AskAgain, bytesOf, isPlainText, stringOf, utf8, type Progress };

const READ = ["/zpr/service/readRequest_cpp", "/zpr/service/readResponse/"] as const;
const WRITE = ["/zpr/service/writeRequest_cpp", "/zpr/service/writeResponse/"] as const;
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

export interface RequestOptions {
  /** How long, in milliseconds, an answer may take to begin. 60000 without it. */
  timeout?: number;
  /** How often to ask, when nothing comes of it, before giving up. 5 without it. */
  tries?: number;
  signal?: AbortSignal;
  onProgress?: (progress: Progress) => void;
}

export interface WriteOptions extends RequestOptions {
  /** The charset of a text and of its file. "UTF-8" without it. */
  encoding?: string;
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

  /** Calls `changed` whenever a file may have been written. What is returned ends that. */
  listen(changed: (change: Change) => void): () => void {
    const subscription = this.nats.subscribe(NOTIFICATION, {
      callback: (error, message) => {
        if (!error) {
          changed(JSON.parse(stringOf(message.data)));
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

  async #write(filePath: string, content: Document | string, options: WriteOptions): Promise<boolean> {
    const request =
      typeof content === "string"
        ? { contentType: "text/plain", encoding: options.encoding ?? "UTF-8", content }
        : { contentType: "text/xml", content: storable(content) };
    const answer = await this.#ask(WRITE, { filePath: utf8(filePath), ...request }, options);
    return JSON.parse(stringOf(answer));
  }

  // Asks until an answer comes, with a new id each time, so that a late one is not taken for
  // another's.
  async #ask(
    [requestChannel, responsePrefix]: readonly [string, string],
    request: object,
    { timeout = 60_000, tries = 5, signal, onProgress }: RequestOptions,
  ): Promise<Uint8Array> {
    for (let left = tries; ; --left) {
      const rtcId = `${this.#idPrefix}-${++this.#requests}`;
      const payload = bytesOf(JSON.stringify({ rtcId, ...request }));
      const responseChannel = responsePrefix + rtcId;
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
      }
      // At random, so that those who were turned away together do not come back together.
      await new Promise((resume) => setTimeout(resume, (tries - left + 1) * (100 + 400 * Math.random())));
    }
  }
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
