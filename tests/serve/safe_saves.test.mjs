// SPDX-License-Identifier: Apache-2.0
// Texts that workers save while they are killed, and while others save them too. More of each with
//
//   SAVES_KILLS=1000 SAVES_PAIRS=500 ctest --preset release -R serve.safe_saves --verbose
import assert from "node:assert/strict";
import { mkdirSync, readFileSync, readdirSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";
import { setTimeout as sleep } from "node:timers/promises";

import { Client, WRITE_REQUEST, encode } from "./client.mjs";
import { HOST, Program, temporaryFolder } from "./processes.mjs";

const KILLS = Number(process.env.SAVES_KILLS ?? 12);
const PAIRS = Number(process.env.SAVES_PAIRS ?? 40);
const FILES = 3;

// A text of one letter, as long as only that letter's texts are.
const LETTERS = "abcdefghijklmnopqrstuvwxyz";
const textOf = (letter) => letter.repeat(200_000 + 1_000 * LETTERS.indexOf(letter));
const isWhole = (text) => text === textOf(text[0] ?? "a");

async function setUp(t) {
  const folder = temporaryFolder(t);
  const documents = join(folder, "documents");
  mkdirSync(documents);
  const configuration = join(folder, "nats.conf");
  writeFileSync(
    configuration,
    `listen: "127.0.0.1:-1"
     websocket: { listen: "127.0.0.1:-1", no_tls: true }
     max_payload: 8MB
     ports_file_dir: "${folder}"`,
  );
  const path = `${process.env.PATH}:/usr/sbin`;
  const server = new Program(t, ["nats-server", "-c", configuration], { PATH: path });
  let ports;
  while (!ports) {
    const file = readdirSync(folder).find((name) => name.endsWith(".ports"));
    ports = file && JSON.parse(readFileSync(join(folder, file), "utf8") || "null");
    assert(!server.hasEnded, server.errors);
    await sleep(10);
  }
  const client = await Client.connect(ports.websocket[0].replace("ws://", "ws://ada:x@"));
  t.after(() => client.close());
  const startWorkers = async (count) => {
    const options = ["--root", documents, "--nats", ports.nats[0], "--history", join(folder, "state")];
    const workers = Array.from({ length: count }, () => new Program(t, [HOST, "serve", ...options]));
    const probe = join(documents, "probe.txt");
    await client.write(probe, "x", undefined, { seconds: 0.2, tries: 300 });
    return workers;
  };
  return { client, documents, startWorkers };
}

for (const count of [1, 2]) {
  test(`a text is whole whenever ${count} of its workers are killed`, async (t) => {
    const { client, documents, startWorkers } = await setUp(t);
    const files = Array.from({ length: FILES }, (_, i) => join(documents, `${i}.txt`));
    files.forEach((file) => writeFileSync(file, textOf("a")));
    let changed = 0;
    for (let kill = 0; kill < KILLS; ++kill) {
      const workers = await startWorkers(count);
      const before = files.map((file) => readFileSync(file, "latin1")[0]);
      for (let i = 0; i < 60; ++i) {
        client.connection.publish(
          WRITE_REQUEST,
          encode({
            rtcId: "ada.nobody",
            contentType: "text/plain",
            encoding: "UTF-8",
            filePath: files[i % FILES],
            content: textOf(LETTERS[(kill * 7 + i) % LETTERS.length]),
          }),
        );
      }
      await client.connection.flush();
      await sleep(Math.random() * 200);
      await Promise.all(workers.map((worker) => worker.kill()));
      files.forEach((file, i) => {
        const text = readFileSync(file, "latin1");
        assert(isWhole(text), `after kill ${kill}, ${file} has ${text.length} bytes`);
        changed += text[0] === before[i] ? 0 : 1;
      });
    }
    t.diagnostic(`${KILLS} kills, after which ${changed} of ${KILLS * FILES} texts were new`);
    assert(changed > 0);
  });
}

test("two workers that save one text at once make no mixture", async (t) => {
  const { client, documents, startWorkers } = await setUp(t);
  await startWorkers(2);
  const more = { contentType: "text/plain", encoding: "UTF-8" };
  for (let pair = 0; pair < PAIRS; ++pair) {
    const file = join(documents, `${pair}.txt`);
    const answers = await Promise.all(
      ["x", "y"].map((letter) => client.write(file, textOf(letter), more)),
    );
    assert.deepEqual(answers, [true, true]);
    assert(isWhole(readFileSync(file, "latin1")), `pair ${pair}`);
  }
});

test("of two saves that know the same version one is made", async (t) => {
  const { client, documents, startWorkers } = await setUp(t);
  await startWorkers(2);
  const more = { contentType: "text/plain", encoding: "UTF-8", baseVersion: "" };
  for (let pair = 0; pair < PAIRS; ++pair) {
    const file = join(documents, `${pair}.txt`);
    const answers = await Promise.all(
      ["x", "y"].map((letter) => client.write(file, textOf(letter), more)),
    );
    const winner = readFileSync(file, "latin1");
    assert.deepEqual(answers, winner[0] === "x" ? [true, false] : [false, true]);
    assert(isWhole(winner));
  }
});
