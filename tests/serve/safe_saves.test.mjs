// SPDX-License-Identifier: Apache-2.0
// Texts that workers save while they are killed, and while others save them too. More of each with
//
//   SAVES_KILLS=500 SAVES_PAIRS=500 SAVES_CALL_STEP=1 ctest --preset release -R serve.safe_saves --verbose
import assert from "node:assert/strict";
import { spawnSync } from "node:child_process";
import { mkdirSync, readFileSync, readdirSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";
import { setTimeout as sleep } from "node:timers/promises";

import { Client, WRITE_REQUEST, encode } from "./client.mjs";
import { HOST, IS_SANITIZED, Program, atEnd, temporaryFolder, waitFor } from "./processes.mjs";

const KILLS = Number(process.env.SAVES_KILLS ?? 12);
const PAIRS = Number(process.env.SAVES_PAIRS ?? 40);
// Of the system calls of a save, one in so many is one at which a worker is killed.
const CALL_STEP = Number(process.env.SAVES_CALL_STEP ?? 11);
const FILES = 3;

// What saves do with files. What the connection does all the time is not among it.
const CALLS =
  "%file,fstat,close,fcntl,pread64,write,fsync,sync_file_range,fchmod,fchown,fgetxattr,fsetxattr," +
  "fremovexattr,getdents64,getrandom";

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
  const ports = await waitFor("the server's ports", () => {
    assert(!server.hasEnded, server.errors);
    const file = readdirSync(folder).find((name) => name.endsWith(".ports"));
    return file && JSON.parse(readFileSync(join(folder, file), "utf8") || "null");
  });
  const client = await Client.connect(ports.websocket[0].replace("ws://", "ws://ada:x@"));
  atEnd(t, () => client.close());
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

async function trace(t, worker, options) {
  const tracer = new Program(t, ["strace", "-f", "-p", `${worker.id}`, ...options]);
  await waitFor("strace", () => {
    assert(!tracer.hasEnded, tracer.errors);
    return tracer.errors.includes("attached");
  });
  return tracer;
}

// The system calls of a save, in their order: each with its name, and how many of that name there have been.
async function callsOf(t, worker, save) {
  const log = join(temporaryFolder(t), "calls");
  const tracer = await trace(t, worker, ["-o", log, "-e", `trace=${CALLS}`]);
  assert.equal(await save(), true);
  tracer.signal("SIGTERM");
  await tracer.end;
  const lines = readFileSync(log, "latin1").split("\n");
  const made = lines.map((line) => line.match(/^(\d+) +(\w+)\(/)).filter(Boolean);
  const thread = made.find(([, , name]) => name === "renameat")[1];
  const counts = {};
  return made
    .filter(([, id]) => id === thread)
    .map(([, , name]) => ({ name, count: (counts[name] = (counts[name] ?? 0) + 1) }));
}

const cannotTrace =
  (IS_SANITIZED && "the sanitizers cannot be traced") ||
  (spawnSync("strace", ["-V"]).status !== 0 && "strace is not installed");

for (const count of [1, 2]) {
  test(
    `a text is whole at whichever of its calls one of ${count} workers is killed`,
    { skip: cannotTrace },
    async (t) => {
      const { client, documents, startWorkers } = await setUp(t);
      const file = join(documents, "a.txt");
      const more = { contentType: "text/plain", encoding: "UTF-8" };
      const save = (letter, options) => client.write(file, textOf(letter), more, options);
      const [first] = await startWorkers(1);
      assert.equal(await save("a"), true);
      const calls = await callsOf(t, first, () => save("b"));
      await first.kill();
      let kills = 0;
      let tries = 0;
      for (let i = Math.floor(Math.random() * CALL_STEP); i < calls.length; i += CALL_STEP) {
        const workers = await startWorkers(count);
        const { name, count: when } = calls[i];
        const inject = ["-e", `trace=${name}`, "-e", `inject=${name}:signal=SIGKILL:when=${when}`];
        const tracer = await trace(t, workers[0], ["-o", "/dev/null", ...inject]);
        // With two workers any of them may get one; so there are some.
        const saves = [...LETTERS.slice(2, count === 1 ? 3 : 10)].map((letter) =>
          save(letter, { seconds: 20 }).catch(() => undefined),
        );
        await Promise.race([workers[0].end, Promise.all(saves)]);
        tries += 1;
        kills += (await Promise.race([workers[0].end, sleep(200)])) === "SIGKILL" ? 1 : 0;
        // The other one goes on, and is kept waiting by no lock of the dead.
        if (count === 2) {
          assert.equal(await save("z", { seconds: 5, tries: 4 }), true);
        }
        const text = readFileSync(file, "latin1");
        assert(isWhole(text), `killed at ${name} number ${when}, it has ${text.length} bytes`);
        await Promise.all([tracer, ...workers].map((program) => program.kill()));
      }
      t.diagnostic(`${kills} kills at ${tries} of the ${calls.length} system calls of a save`);
      assert(kills > tries / 2, `${kills} of ${tries}`);
    },
  );
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
