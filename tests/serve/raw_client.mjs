// SPDX-License-Identifier: Apache-2.0
// The messages of NATS by hand, over a plain socket or over WebSocket: for what a well-made client
// does not do.
import { randomBytes } from "node:crypto";
import { connect as openSocket } from "node:net";

import { parseUrl } from "./client.mjs";
import { waitFor } from "./processes.mjs";

function handshake(host, origin) {
  return [
    "GET / HTTP/1.1",
    `Host: ${host}`,
    "Connection: Upgrade",
    "Upgrade: websocket",
    "Sec-WebSocket-Version: 13",
    `Sec-WebSocket-Key: ${randomBytes(16).toString("base64")}`,
    ...(origin ? [`Origin: ${origin}`] : []),
    "\r\n",
  ].join("\r\n");
}

// A masked frame with binary data.
export function webSocketFrame(payload) {
  const data = Buffer.from(payload);
  const header = Buffer.alloc(14);
  header[0] = 0x82;
  header[1] = 0x80 | 127;
  header.writeBigUInt64BE(BigInt(data.length), 2);
  // A mask of zeros leaves the data as it is.
  return Buffer.concat([header, data]);
}

export class RawClient {
  // A connection whose user is known to the server; `url` begins with "nats:" or "ws:".
  static async connect(url, { origin } = {}) {
    const client = await RawClient.open(url, { origin });
    const { user, password } = parseUrl(url);
    const options = { verbose: false, pedantic: false, user, pass: password };
    client.send(`CONNECT ${JSON.stringify(options)}\r\nPING\r\n`);
    await client.waitFor("PONG");
    return client;
  }

  // A connection that the server has greeted. Throws an error with its status line when it
  // refuses the WebSocket.
  static async open(url, { origin } = {}) {
    const client = new RawClient(url);
    if (client.isWebSocket) {
      client.socket.write(handshake(`${client.host}`, origin));
      await client.waitFor("\r\n\r\n");
      if (!client.received.startsWith("HTTP/1.1 101 ")) {
        client.close();
        throw new Error(client.received.split("\r\n")[0]);
      }
    }
    await client.waitFor("INFO ");
    return client;
  }

  constructor(url) {
    const { hostname, port } = parseUrl(url);
    this.isWebSocket = url.startsWith("ws:");
    this.host = `${hostname}:${port}`;
    this.received = ""; // with the headers of frames in between; nobody here minds
    this.isClosed = false;
    this.socket = openSocket({ host: hostname, port });
    this.socket.on("data", (data) => (this.received += data.toString("latin1")));
    this.socket.on("error", () => {});
    this.socket.on("close", () => (this.isClosed = true));
  }

  send(text) {
    this.socket.write(this.isWebSocket ? webSocketFrame(text) : text);
  }

  publish(subject, payload) {
    this.send(Buffer.concat([
      Buffer.from(`PUB ${subject} ${payload.length}\r\n`),
      Buffer.from(payload),
      Buffer.from("\r\n"),
    ]));
  }

  async waitFor(text) {
    await waitFor(`"${text}" from the server`, () => {
      if (!this.received.includes(text) && this.isClosed) {
        throw new Error(`the server has closed the connection after ${this.received}`);
      }
      return this.received.includes(text);
    });
  }

  close() {
    this.socket.destroy();
  }
}
