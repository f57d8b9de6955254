// SPDX-License-Identifier: Apache-2.0
// Clients that save a text each, all at once; a program of its own so that it can run at another priority:
//
//   node saving_clients.mjs URL FOLDER NAME COUNT MEGABYTES
//
// Ends with status 0 when each is answered `true`, its file holds its text, and no connection was lost.
import assert from "node:assert/strict";
import { randomBytes } from "node:crypto";
import { readFileSync, rmSync } from "node:fs";
import { join } from "node:path";

import WebSocket from "../../web/node_modules/ws/wrapper.mjs";
import { connect } from "../../web/client/dist/index.js";

globalThis.WebSocket = WebSocket; // Node.js before version 22 has none

const [url, folder, name, count, megabytes] = process.argv.slice(2);
const text = randomBytes((megabytes * 750_000) | 0).toString("base64");

async function save(index) {
  const client = await connect({ servers: url, user: "ada", pass: "secret", reconnect: false });
  const file = join(folder, `${name}-${index}.txt`);
  // A client that gets no processor for five seconds is sent away, and asks again.
  assert.equal(await client.write(file, text, { timeout: 300_000, tries: 20 }), true);
  assert.ok(readFileSync(file, "latin1") === text);
  rmSync(file);
  await client.close();
}

await Promise.all(Array.from({ length: Number(count) }, (_, index) => save(index)));
