// SPDX-License-Identifier: Apache-2.0
// To be imported by whatever uses nats-core: browsers have a WebSocket, Node.js before version 22 has none.
import WebSocket from "../../web/node_modules/ws/wrapper.mjs";

globalThis.WebSocket = WebSocket;
