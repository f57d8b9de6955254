// SPDX-License-Identifier: Apache-2.0
// Servers and workers that are killed while long messages are on their way. 200 kills with
// EDITOR_SERIALIZATION_LONG_TESTS=1.
import assert from "node:assert/strict";
import { randomBytes } from "node:crypto";
import { mkdirSync, readFileSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";
import { setTimeout as sleep } from "node:timers/promises";

import { MessageServer, memoryOf } from "./message_server.mjs";
import { IS_LONG, IS_SANITIZED, temporaryFolder, waitFor } from "./processes.mjs";

const KILLS = IS_LONG ? 200 : 8;
const MEGABYTES = IS_SANITIZED ? 3 : 12;
const PATIENTLY = { tries: 100, timeout: 3000 };

// A tenth of it is for requests in pieces, so that what was reserved for some of them and not given back
// would be missed.
const LIMIT = 1_000_000_000;

// What a worker keeps of freed memory, more after some requests than after others.
const KEPT = 150_000_000;

const longText = () => randomBytes((MEGABYTES * 750_000) | 0).toString("base64");

test(`${KILLS} kills of servers and workers lose no document, and no memory`, async (t) => {
  const folder = temporaryFolder(t);
  const documents = join(folder, "documents");
  mkdirSync(documents);
  const server = await MessageServer.start(t, folder);
  // The sanitizers take more than any limit.
  const limit = IS_SANITIZED ? [] : ["--memory-limit", String(LIMIT)];
  const survivor = await server.startWorker(documents, limit);
  let victim = await server.startWorker(documents, limit);
  const client = await server.connect("ada");

  const texts = [longText(), longText()];
  const unchanged = join(documents, "unchanged.txt");
  writeFileSync(unchanged, texts[0]);
  const saved = join(documents, "saved.txt");
  const transfers = (round) => [
    client.write(saved, texts[round % 2], PATIENTLY),
    client.read(unchanged, "text/plain", PATIENTLY),
  ];

  // Both workers have done all that they will do.
  for (let round = 0; round < 8; ++round) {
    await Promise.all(transfers(round));
  }
  const before = memoryOf(survivor).now;
  const begin = Date.now();
  for (let kill = 0; kill < KILLS; ++kill) {
    const pending = Promise.all(transfers(kill));
    await sleep(Math.random() * 150);
    if (kill % 2) {
      await victim.kill();
    } else {
      await server.kill();
      await server.run();
    }
    const [isSaved, { data, exception }] = await pending;
    assert.equal(isSaved, true);
    assert.ok(data === texts[0], `read after kill ${kill}: ${exception}`);
    assert.ok(readFileSync(saved, "latin1") === texts[kill % 2], `saved after kill ${kill}`);
    if (kill % 2) {
      victim = await server.startWorker(documents, limit);
    }
  }
  t.diagnostic(`${(Date.now() - begin) / KILLS} ms for each kill, with both transfers`);
  assert.ok(!survivor.hasEnded, survivor.errors);

  if (IS_SANITIZED) {
    return;
  }
  // What was reserved for transfers that ended is free: nearly all of it is needed for this one.
  await victim.kill();
  const largest = "x".repeat(LIMIT / 10 - 1000);
  assert.equal(await client.write(saved, largest, { tries: 1, timeout: 30_000 }), true);
  // The answer comes before the worker has let go of the request.
  await waitFor(`less memory than ${before + KEPT} bytes`, () => memoryOf(survivor).now < before + KEPT, 10);
  t.diagnostic(`the worker that lived on has ${before} bytes before, and ${memoryOf(survivor).now} after`);
});
