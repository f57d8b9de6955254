// SPDX-License-Identifier: Apache-2.0
// A client of the bundle over NATS, as a browser would be one: nats-core over WebSocket.
import { TimeoutError, wsconnect } from "../../web/node_modules/@nats-io/nats-core/lib/mod.js";
import "./web_socket.mjs";

export const READ_REQUEST = "/zpr/service/readRequest_cpp";
export const READ_RESPONSE = "/zpr/service/readResponse/";
export const WRITE_REQUEST = "/zpr/service/writeRequest_cpp";
export const WRITE_RESPONSE = "/zpr/service/writeResponse/";
export const NOTIFICATION = "/zpr/service/notifyFileSystemRequest";

// Takes "ws://user:password@host:port" apart.
export function parseUrl(url) {
  const { protocol, host, hostname, port, username, password } = new URL(url);
  return { server: `${protocol}//${host}`, hostname, port: Number(port), user: username, password };
}

// The bytes of a message: strings of documents carry a byte in each character.
export function encode(message) {
  return Buffer.from(JSON.stringify(message), "latin1");
}

export function decode(data) {
  return JSON.parse(Buffer.from(data.buffer, data.byteOffset, data.length).toString("latin1"));
}

export class Client {
  static #count = 0;

  // `url` has the user and the password in it.
  static async connect(url, options = {}) {
    const { server, user, password } = parseUrl(url);
    return new Client(
      await wsconnect({ servers: server, user, pass: password, timeout: 240_000, ...options }),
      user,
    );
  }

  constructor(connection, user) {
    this.connection = connection;
    this.idPrefix = `${user}.${process.pid}-${++Client.#count}`;
    this.requests = 0;
  }

  // The answer to a request; asks again when there is none in `seconds`, up to `tries` times.
  async ask(requestChannel, responsePrefix, request, { seconds = 240, tries = 1 } = {}) {
    for (let left = tries; left > 0; --left) {
      const rtcId = `${this.idPrefix}-${++this.requests}`;
      const subscription = this.connection.subscribe(responsePrefix + rtcId, {
        max: 1,
        timeout: seconds * 1000,
      });
      this.connection.publish(requestChannel, encode({ rtcId, ...request }));
      try {
        for await (const message of subscription) {
          return decode(message.data);
        }
      } catch (error) {
        if (!(error instanceof TimeoutError)) {
          throw error;
        }
      }
    }
    throw new Error(`no answer in ${tries} times ${seconds} s`);
  }

  read(filePath, contentType = "text/plain", options) {
    const request = { contentType, filePath: Buffer.from(filePath).toString("latin1") };
    return this.ask(READ_REQUEST, READ_RESPONSE, request, options);
  }

  write(filePath, content, more = { contentType: "text/plain", encoding: "UTF-8" }, options) {
    const request = { filePath: Buffer.from(filePath).toString("latin1"), content, ...more };
    return this.ask(WRITE_REQUEST, WRITE_RESPONSE, request, options);
  }

  close() {
    return this.connection.close();
  }
}
