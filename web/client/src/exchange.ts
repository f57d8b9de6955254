// SPDX-License-Identifier: Apache-2.0
// One request and its answer, in pieces where they are long (docs/protocol.md, "Long messages in
// pieces"). What it sends and hears:
//
//   request of one piece:  "yes" and the request
//   longer:                "offer <length>"; hears "room <worker> <end>"; sends "piece <offset>" ...
//   short answer:          hears it, without a word
//   longer:                hears "answer <worker> <length>"; sends "room <end>"; hears "piece <offset>" ...
import { headers, type Msg, type NatsConnection, type Subscription } from "@nats-io/nats-core";

const HEADER = "Zpr-Pieces";
const PIECE = 2 ** 20;
const WINDOW = 4 * PIECE;
const GRANT = 2 * PIECE;
const GRANT_INTERVAL = 1_000; // ms
const STANDSTILL = 40_000; // ms; longer than a worker gives up after
const PROBE = 5_000; // ms

/** Nothing is known to have come of a request: it may be made again, with a new id. */
export class AskAgain extends Error {}

export interface Progress {
  direction: "sent" | "received";
  bytes: number;
  total: number;
}

export interface Exchange {
  rtcId: string;
  requestChannel: string;
  responseChannel: string; // with the id
  payload: Uint8Array;
  timeout: number; // ms until the answer begins, and until an offer is heard of
  signal?: AbortSignal;
  onProgress?: (progress: Progress) => void;
}

/** The answer. Rejects with AskAgain, or with the reason of the signal. */
export function exchange(nats: NatsConnection, about: Exchange): Promise<Uint8Array> {
  return new Promise((resolve, reject) => new Transfer(nats, about, resolve, reject));
}

// What is under way on a connection, and ends when that is lost: what was on its way is lost with it.
const underWay = new WeakMap<NatsConnection, Set<Transfer>>();

function transfersOf(nats: NatsConnection): Set<Transfer> {
  const known = underWay.get(nats);
  if (known) {
    return known;
  }
  const transfers = new Set<Transfer>();
  underWay.set(nats, transfers);
  const loseAll = () => [...transfers].forEach((transfer) => transfer.lose());
  (async () => {
    for await (const { type } of nats.status()) {
      if (type === "disconnect") {
        loseAll();
      }
    }
    loseAll(); // the connection is closed
  })();
  return transfers;
}

class Transfer {
  #subscription: Subscription;
  #timer: ReturnType<typeof setTimeout> | undefined;
  #probe: ReturnType<typeof setInterval> | undefined;
  #worker: string | null = null;
  #sent = 0;
  #answer: Uint8Array | null = null;
  #received = 0;
  #room = 0;
  #granted = 0;

  constructor(
    private nats: NatsConnection,
    private about: Exchange,
    private resolve: (answer: Uint8Array) => void,
    private reject: (reason: unknown) => void,
  ) {
    this.#subscription = nats.subscribe(about.responseChannel, {
      callback: (error, message) => this.#guarded(() => this.#hear(error, message)),
    });
    transfersOf(nats).add(this);
    this.#probe = setInterval(() => this.#guarded(() => this.#seekWorker()), PROBE);
    this.#guarded(() => {
      about.signal?.throwIfAborted();
      about.signal?.addEventListener("abort", this.#abort);
      this.#wait(about.timeout);
      if (about.payload.length <= PIECE) {
        this.#ask();
      } else {
        this.#tell(`${about.requestChannel}/offer`, `offer ${about.payload.length}`);
      }
    });
  }

  lose() {
    this.#end(() => this.reject(new AskAgain("the connection is lost")), true);
  }

  // Changes nothing where the worker is; where it has died, the server says that nobody listens.
  #seekWorker() {
    if (this.#worker !== null) {
      this.#tell(this.#channelOf(this.#worker), `room ${this.#room}`);
    }
  }

  #abort = () => this.#end(() => this.reject(this.about.signal?.reason), true);

  #guarded(action: () => void) {
    try {
      action();
    } catch (error) {
      this.#end(() => this.reject(error), true);
    }
  }

  #ask() {
    this.#tell(this.about.requestChannel, "yes", this.about.payload);
    this.#sent = this.about.payload.length;
    this.#report("sent", this.#sent, this.#sent);
  }

  #hear(error: Error | null, message: Msg) {
    if (error) {
      throw error;
    }
    if (message.headers?.code === 503) {
      return this.#nobody();
    }
    const [word, first = "", second = ""] = (message.headers?.get(HEADER) ?? "").split(" ");
    if (word === "room") {
      this.#send(first, Number(second));
    } else if (word === "answer" && this.#answer === null) {
      this.#worker = first;
      this.#answer = new Uint8Array(Number(second));
      this.#giveRoom();
    } else if (word === "piece" && this.#answer && Number(first) === this.#received) {
      this.#take(this.#answer, message.data);
    } else if (word === "") {
      this.#report("received", message.data.length, message.data.length);
      this.#end(() => this.resolve(message.data));
    } else {
      throw new AskAgain(`the worker says "${message.headers?.get(HEADER)}"`);
    }
  }

  // No worker listens; or none that knows of offers, and then a server may still take it whole.
  #nobody() {
    const { payload } = this.about;
    if (this.#sent > 0 || payload.length > (this.nats.info?.max_payload ?? 0)) {
      throw new AskAgain("no worker is connected to the server");
    }
    this.#ask();
  }

  #send(worker: string, end: number) {
    if (this.#worker !== null && this.#worker !== worker) {
      return this.#tell(this.#channelOf(worker), "stop"); // the offer reached another one, too
    }
    this.#worker = worker;
    const { payload } = this.about;
    for (; this.#sent < Math.min(end, payload.length); this.#report("sent", this.#sent, payload.length)) {
      const piece = payload.subarray(this.#sent, Math.min(this.#sent + PIECE, end));
      this.#tell(this.#channelOf(worker), `piece ${this.#sent}`, piece);
      this.#sent += piece.length;
    }
    this.#wait(this.#sent < payload.length ? STANDSTILL : this.about.timeout);
  }

  #take(answer: Uint8Array, piece: Uint8Array) {
    answer.set(piece, this.#received);
    this.#received += piece.length;
    this.#report("received", this.#received, answer.length);
    if (this.#received === answer.length) {
      return this.#end(() => this.resolve(answer));
    }
    this.#giveRoom();
  }

  // Not with every piece of a fast line: each word wakes the server and the worker. With every one of a slow
  // line, since the worker takes words for progress.
  #giveRoom() {
    const { length } = this.#answer!;
    const room = Math.min(this.#received + WINDOW, length);
    const isDue = room >= this.#room + GRANT || room === length || Date.now() >= this.#granted + GRANT_INTERVAL;
    if (room > this.#room && isDue) {
      this.#room = room;
      this.#granted = Date.now();
      this.#tell(this.#channelOf(this.#worker!), `room ${room}`);
    }
    this.#wait(STANDSTILL);
  }

  #channelOf(worker: string) {
    return `/zpr/service/piece.${worker}.${this.about.rtcId}`;
  }

  #tell(subject: string, text: string, payload?: Uint8Array) {
    const header = headers();
    header.set(HEADER, text);
    this.nats.publish(subject, payload, { headers: header, reply: this.about.responseChannel });
  }

  #report(direction: Progress["direction"], bytes: number, total: number) {
    this.about.onProgress?.({ direction, bytes, total });
  }

  #wait(milliseconds: number) {
    clearTimeout(this.#timer);
    this.#timer = setTimeout(
      () => this.#end(() => this.reject(new AskAgain(`nothing came for ${milliseconds / 1000} s`)), true),
      milliseconds,
    );
  }

  #end(settle: () => void, tellWorker = false) {
    clearTimeout(this.#timer);
    clearInterval(this.#probe);
    transfersOf(this.nats).delete(this);
    this.about.signal?.removeEventListener("abort", this.#abort);
    if (!this.nats.isClosed()) {
      this.#subscription.unsubscribe();
      if (tellWorker && this.#worker !== null) {
        this.#tell(this.#channelOf(this.#worker), "stop");
      }
    }
    settle();
  }
}
