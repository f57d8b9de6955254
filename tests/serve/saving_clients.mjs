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
import { setTimeout as sleep } from "node:timers/promises";

import { connect } from "../../web/client/dist/index.js";
import "./web_socket.mjs";

const [url, folder, name, count, megabytes] = process.argv.slice(2);
const text = randomBytes((megabytes * 750_000) | 0).toString("base64");

async function save(client, index) {
  const file = join(folder, `${name}-${index}.txt`);
  // A client that gets no processor for five seconds is sent away, and asks again.
  assert.equal(await client.write(file, text, { timeout: 300_000, tries: 20 }), true);
  assert.ok(readFileSync(file, "latin1") === text);
  rmSync(file);
  await client.close();
}

// All connect first: beside others that turn their texts into bytes, a client is too slow for the server to wait for.
const connecting = Array.from({ length: Number(count) }, () =>
  connect({ servers: url, user: "ada", pass: "secret", reconnect: false }),
);
const saves = [];
for (const client of await Promise.all(connecting)) {
  saves.push(save(client, saves.length));
  await sleep(0); // for the others to answer the server's pings
}
await Promise.all(saves);
