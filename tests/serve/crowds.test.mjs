// SPDX-License-Identifier: Apache-2.0
// Many clients with long requests at once, and such as want to do harm: nobody is crowded out.
// EDITOR_SERIALIZATION_LONG_TESTS=1 has them come in hundreds.
import assert from "node:assert/strict";
import { randomBytes } from "node:crypto";
import { readFileSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";
import { setTimeout as sleep } from "node:timers/promises";

import { headers } from "../../web/client/node_modules/@nats-io/nats-core/lib/mod.js";
import { MessageServer, memoryOf } from "./message_server.mjs";
import { IS_LONG, IS_SANITIZED, Program, ROOT, temporaryFolder, waitFor } from "./processes.mjs";

const MEGABYTES = IS_SANITIZED ? 5 : 60;
const LIMIT = 2_000_000_000;

const longText = (megabytes) => randomBytes((megabytes * 750_000) | 0).toString("base64");

async function setUp(test) {
  const documents = temporaryFolder(test, "/dev/shm"); // tmpfs, so that disks do not count
  const server = await MessageServer.start(test, temporaryFolder(test));
  // The sanitizers take more than any limit.
  const limit = IS_SANITIZED ? [] : ["--memory-limit", String(LIMIT)];
  const worker = await server.startWorker(documents, limit);
  return { documents, server, worker };
}

const percentile = (sorted, share) => sorted[Math.min(sorted.length - 1, Math.floor(share * sorted.length))];

// Calls `action` again and again until `end` is called, which tells the milliseconds that each call took.
function timed(action) {
  const taken = [];
  let isOver = false;
  const done = (async () => {
    while (!isOver) {
      const begin = performance.now();
      await action();
      taken.push(performance.now() - begin);
      await sleep(5);
    }
  })();
  const end = async () => {
    isOver = true;
    await done;
    return taken.sort((one, other) => one - other);
  };
  return { end };
}

// Ben reads a small file all the time. `end` throws if an answer was lost, or took longer than `timeout`.
function bystander(client, documents, timeout = 10_000) {
  const file = join(documents, "small.txt");
  writeFileSync(file, "small");
  return timed(async () => {
    const answer = await client.read(file, "text/plain", { tries: 1, timeout });
    assert.equal(answer.data, "small");
  });
}

// The same server with next to nothing between a question and its answer, to compare with.
async function bareEcho(server) {
  const [asking, answering] = [await server.connect("ben"), await server.connect("worker")];
  answering.nats.subscribe("/zpr/service/piece.echo.>", {
    callback: () => answering.nats.publish("/zpr/service/readResponse/ben.echo", "small"),
  });
  await answering.nats.flush();
  let resolve;
  asking.nats.subscribe("/zpr/service/readResponse/ben.echo", { callback: () => resolve() });
  return timed(() => {
    const answer = new Promise((settle) => (resolve = settle));
    asking.nats.publish("/zpr/service/piece.echo.ben.1");
    return answer;
  });
}

for (const clients of IS_LONG ? [6, 20, 100] : [6]) {
  test(`${clients} clients that save ${MEGABYTES} MB at once are all answered`, async (t) => {
    const { documents, server, worker } = await setUp(t);
    const ben = await server.connect("ben");
    const reads = bystander(ben, documents);
    const echoes = await bareEcho(server);
    const begin = Date.now();
    const processes = Math.min(clients, 4);
    const savers = Array.from({ length: processes }, (_, index) => {
      const count = Math.floor((clients + index) / processes);
      return new Program(t, [
        // Beside other tests they would get no time at all then.
        ...(IS_LONG ? ["nice", "-n", "19"] : []),
        ...[process.execPath, join(ROOT, "tests/serve/saving_clients.mjs")],
        ...[`ws://127.0.0.1:${server.webSocketPort}`, documents, String(index), String(count), String(MEGABYTES)],
      ]);
    });
    const ends = await Promise.all(savers.map((saver) => saver.end));
    const seconds = (Date.now() - begin) / 1000;
    const [taken, echoed] = [await reads.end(), await echoes.end()];
    const { peak } = memoryOf(worker);
    t.diagnostic(
      `${seconds} s; the worker's peak ${Math.round(peak / 1e6)} MB; ${taken.length} small reads meanwhile, ` +
        `p50 ${percentile(taken, 0.5).toFixed(1)} ms, p99 ${percentile(taken, 0.99).toFixed(1)} ms; ` +
        `bare echoes p50 ${percentile(echoed, 0.5).toFixed(1)} ms, p99 ${percentile(echoed, 0.99).toFixed(1)} ms`,
    );
    savers.forEach((saver, index) => assert.equal(ends[index], 0, saver.errors));
    assert.equal((await server.told("varz")).slow_consumers, 0);
    assert.doesNotMatch(worker.errors, /refused|Slow consumer|connection .* lost/);
    assert.ok(IS_SANITIZED || peak < LIMIT, `the worker took ${peak} bytes`);
  });
}

test("documents that are saved or travel in pieces come over other connections than small reads", async (t) => {
  const { server } = await setUp(t);
  const { connections } = await server.told("connz?subs=1&auth=1");
  const subjects = connections
    .filter((one) => one.authorized_user === "worker")
    .map((one) => one.subscriptions_list.map((subject) => subject.replace(/piece.*/, "piece")).sort());
  const requests = ["readRequest_cpp", "writeRequest_cpp", "filesRequest_host"];
  const [read, write, files] = requests.map((one) => `/zpr/service/${one}`);
  const transfers = [read, write, files].map((one) => `${one}/offer`).concat("/zpr/service/piece").sort();
  assert.deepEqual(new Set(subjects.map(String)), new Set([[files, read], [write], transfers].map(String)));
});

// A word about pieces, said by hand.
function say(client, subject, word, { reply, payload } = {}) {
  const header = headers();
  header.set("Zpr-Pieces", word);
  client.nats.publish(subject, payload, { headers: header, ...(reply && { reply }) });
}

test("offers that are not filled keep nobody from saving", { skip: IS_SANITIZED }, async (t) => {
  const { documents, server, worker } = await setUp(t);
  const [ada, ben] = [await server.connect("ada"), await server.connect("ben")];
  const reads = bystander(ben, documents);
  // What each offer hears first. Those that wait hear "room" again every few seconds.
  const heard = new Map();
  let name;
  ada.nats.subscribe("/zpr/service/writeResponse/ada.>", {
    callback: (_, { subject, headers }) => {
      const [word, first] = headers.get("Zpr-Pieces").split(" ");
      heard.has(subject) || heard.set(subject, word);
      name = word === "room" ? first : name;
    },
  });
  const longest = Math.floor(LIMIT / 10);
  for (let count = 0; count < 10_000; ++count) {
    const reply = `/zpr/service/writeResponse/ada.${count}`;
    say(ada, "/zpr/service/writeRequest_cpp/offer", `offer ${count % 2 ? 2 ** 30 : longest}`, { reply });
  }
  await ada.nats.flush();
  await waitFor("what the worker says", () => heard.size === 10_000);
  const waiting = [...heard.values()].filter((word) => word === "room").length;
  // One that stands still is given up after 5 seconds, and makes place for another.
  assert.ok(waiting <= 1024 + 100, `${waiting} offers wait`);

  // In another's name nothing is taken, and what nobody offered is not either.
  let refused = 0;
  (async () => {
    for await (const { type } of ada.nats.status()) {
      refused += type === "error" ? 1 : 0;
    }
  })();
  const piece = Buffer.alloc(2 ** 20, "x");
  for (let count = 0; count < 20; ++count) {
    say(ada, `/zpr/service/piece.${name}.ben.${count}`, "piece 0", { payload: piece });
    say(ada, `/zpr/service/piece.${name}.ada.nobody-${count}`, "piece 0", { payload: piece });
  }
  await ada.nats.flush();
  await waitFor("the refusals", () => refused === 20);

  const text = longText(20);
  for (let count = 0; count < 2; ++count) {
    const file = join(documents, `${count}.txt`);
    assert.equal(await ben.write(file, text), true);
    assert.ok(readFileSync(file, "latin1") === text);
  }
  const taken = await reads.end();
  const { peak } = memoryOf(worker);
  t.diagnostic(`the worker's peak ${Math.round(peak / 1e6)} MB; small reads p99 ${percentile(taken, 0.99).toFixed(1)} ms`);
  assert.ok(peak < LIMIT / 5, `the worker took ${peak} bytes`);
  assert.doesNotMatch(worker.errors, /Slow consumer/);
});

test("long answers that nobody takes keep nobody from reading", { skip: IS_SANITIZED }, async (t) => {
  const { documents, server, worker } = await setUp(t);
  const [ada, ben] = [await server.connect("ada"), await server.connect("ben")];
  // Reads are handled in the order in which they come, also those whose answers nobody takes.
  const reads = bystander(ben, documents, 120_000);
  const file = join(documents, "long.txt");
  const text = longText(5);
  writeFileSync(file, text);
  const heard = { answer: 0, stop: 0 };
  ada.nats.subscribe("/zpr/service/readResponse/ada.>", {
    callback: (_, message) => ++heard[message.headers.get("Zpr-Pieces").split(" ")[0]],
  });
  const count = IS_LONG ? 1000 : 200;
  for (let index = 0; index < count; ++index) {
    const rtcId = `ada.${index}`;
    const request = JSON.stringify({ rtcId, contentType: "text/plain", filePath: file });
    say(ada, "/zpr/service/readRequest_cpp", "yes", { reply: `/zpr/service/readResponse/${rtcId}`, payload: request });
  }
  assert.ok((await ben.read(file, "text/plain")).data === text);
  await waitFor("what the worker says", () => heard.answer + heard.stop >= count, 240);
  assert.ok((await ben.read(file, "text/plain")).data === text);
  const taken = await reads.end();
  const { peak } = memoryOf(worker);
  t.diagnostic(
    `${heard.answer} answers, the worker's peak ${Math.round(peak / 1e6)} MB; ` +
      `small reads p99 ${percentile(taken, 0.99).toFixed(1)} ms`,
  );
  assert.ok(heard.stop > 0, "no bound was reached");
  assert.ok(peak < LIMIT / 4, `the worker took ${peak} bytes`);
});
