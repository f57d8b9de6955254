// SPDX-License-Identifier: Apache-2.0
// Reads of a long document, in pieces and as one message, in turn: through the same server, which takes so
// long a message, from the same worker. The server collects garbage as a host's own does.
//
//     SERIALIZATION_HOST=build/release/bin/serialization_host node benchmarks/long_reads.mjs [MEGABYTES [ROUNDS]]
import assert from "node:assert/strict";
import { randomBytes } from "node:crypto";
import { mkdtempSync, rmSync, writeFileSync } from "node:fs";
import { join } from "node:path";

import { MessageServer } from "../tests/serve/message_server.mjs";

const [megabytes = "60", rounds = "15"] = process.argv.slice(2);

const ends = [];
const run = { after: (end) => ends.unshift(end) };

// The answer to a client that does not say that it takes pieces.
async function readWhole({ nats }, filePath, rtcId) {
  const answer = new Promise((resolve) => {
    nats.subscribe(`/zpr/service/readResponse/${rtcId}`, { max: 1, callback: (_, { data }) => resolve(data) });
  });
  nats.publish("/zpr/service/readRequest_cpp", JSON.stringify({ rtcId, contentType: "text/plain", filePath }));
  return answer;
}

async function seconds(action) {
  const begin = performance.now();
  const answer = await action();
  const taken = (performance.now() - begin) / 1000;
  assert.ok(answer.length >= megabytes * 1_000_000, "no answer of that length");
  return taken;
}

function median(figures) {
  figures.sort((one, other) => one - other);
  return figures[figures.length >> 1];
}

try {
  const folder = mkdtempSync("/dev/shm/long-reads-");
  run.after(() => rmSync(folder, { recursive: true }));
  const server = await MessageServer.start(run, folder, "64MB", { GOGC: "400" });
  await server.startWorker(folder);
  const client = await server.connect("ada");
  const file = join(folder, "long.txt");
  writeFileSync(file, randomBytes(megabytes * 750_000).toString("base64"));

  const taken = { pieces: [], whole: [] };
  for (let round = -2; round < Number(rounds); ++round) {
    const pieces = await seconds(() => client.readBytes(file, "text/plain"));
    const whole = await seconds(() => readWhole(client, file, `ada.whole-${round}`));
    if (round >= 0) {
      taken.pieces.push(pieces);
      taken.whole.push(whole);
    }
  }
  const [pieces, whole] = [median(taken.pieces), median(taken.whole)];
  const speed = (figure) => `${Math.round(megabytes / figure)} MB/s`;
  console.log(
    `${megabytes} MB in pieces: ${speed(pieces)}; in one message: ${speed(whole)}; ratio ${(whole / pieces).toFixed(2)}`,
  );
} finally {
  for (const end of ends) {
    await end();
  }
}
