// SPDX-License-Identifier: Apache-2.0
// Requests that are made to take memory, from several clients at once, while others are served.
import assert from "node:assert/strict";
import { readFileSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";
import { setTimeout as sleep } from "node:timers/promises";

import { Client, READ_REQUEST, READ_RESPONSE, encode } from "./client.mjs";
import { Host, IS_SANITIZED, atEnd, temporaryFolder, waitFor } from "./processes.mjs";
import { RawClient } from "./raw_client.mjs";

const CLIENTS = 8;
const MEMORY_LIMIT = 600; // in megabytes
// Each takes some hundred bytes, so that all requests together would take more than the limit.
const LEVELS = 1_000_000;

async function start(test, megabytes = MEMORY_LIMIT) {
  const folder = temporaryFolder(test);
  const file = join(folder, "small.txt");
  writeFileSync(file, "small");
  // The sanitizers take more address space than there is memory.
  const limit = IS_SANITIZED ? [] : ["--memory-limit", `${megabytes}MB`];
  return { folder, file, host: await Host.start(test, ["--root", folder, ...limit]) };
}

function rawClients(test, host) {
  return Promise.all(
    Array.from({ length: CLIENTS }, async () => {
      const client = await RawClient.connect(host.nats);
      atEnd(test, () => client.close());
      return client;
    }),
  );
}

// Reads the file again and again until `isOver`.
async function readMeanwhile(test, host, file, isOver) {
  const client = await Client.connect(host.webSocket);
  atEnd(test, () => client.close());
  let longest = 0;
  do {
    const begin = performance.now();
    assert.deepEqual(await client.read(file), { data: "small", status: true });
    longest = Math.max(longest, performance.now() - begin);
    await sleep(5);
  } while (!isOver());
  test.diagnostic(`peak ${peakOf(host).toFixed(0)} MB, longest read ${longest.toFixed(0)} ms`);
}

// The most memory that the host has had, in megabytes.
function peakOf(host) {
  return Number(readFileSync(`/proc/${host.id}/status`, "latin1").match(/VmHWM:\s+(\d+)/)[1]) / 1024;
}

const count = (text, part) => text.split(part).length - 1;

test("open brackets without end take nobody's memory", async (t) => {
  const { host, file } = await start(t);
  const attackers = await rawClients(t, host);
  const request = Buffer.concat([Buffer.from('{"a":'), Buffer.alloc(LEVELS, "[")]);
  for (const attacker of attackers) {
    attacker.publish(READ_REQUEST, request);
  }
  const isOver = () => count(host.errors, `A request of ${request.length} bytes`) === CLIENTS;
  await readMeanwhile(t, host, file, isOver);
  assert.ok(!host.hasEnded);
  assert.ok(peakOf(host) < MEMORY_LIMIT || IS_SANITIZED);
});

// With the members that are needed, and an answer each.
function nested(user, number, filePath, levels) {
  const members = encode({ rtcId: `${user}.${number}`, contentType: "text/plain", filePath });
  return Buffer.concat([
    members.subarray(0, -1),
    Buffer.from(',"a":'),
    Buffer.alloc(levels, "["),
    Buffer.alloc(levels, "]"),
    Buffer.from("}"),
  ]);
}

async function answersTo(test, host, file, levels) {
  const attackers = await rawClients(test, host);
  const user = new URL(host.nats).username;
  attackers.forEach((attacker, number) => {
    attacker.send(`SUB ${READ_RESPONSE}${user}.${number} 1\r\n`);
    attacker.publish(READ_REQUEST, nested(user, number, file, levels));
  });
  const isOver = () => attackers.every(({ received }) => received.includes('"status":'));
  await readMeanwhile(test, host, file, isOver);
  return attackers.map(({ received }) => received);
}

test("deep requests at once wait for memory, and each is answered", async (t) => {
  const { host, file } = await start(t);
  for (const answer of await answersTo(t, host, file, LEVELS / 2)) {
    assert.match(answer, /\{"data":"small","status":true\}/);
  }
});

test("requests that would take more than all may are refused", { skip: IS_SANITIZED }, async (t) => {
  const { host, file } = await start(t, 200);
  for (const answer of await answersTo(t, host, file, 2 * LEVELS)) {
    assert.match(answer, /\{"exception":"The request is too large: /);
  }
});

// Documents take memory too: a package of two kilobytes becomes six megabytes of JSON.
test("documents that expand take nobody's memory", async (t) => {
  const { host, folder, file } = await start(t, 400);
  const client = await Client.connect(host.webSocket);
  atEnd(t, () => client.close());
  const content = "\0".repeat(1_000_000);
  const part = { partUri: "/a.bin", contentType: "x/y", content, relationship: [] };
  const path = join(folder, "zeros.docx");
  const document = { parts: [part], relationships: [] };
  assert.equal(await client.write(path, document, { contentType: "text/xml" }), true);
  let left = 4 * CLIENTS;
  const reads = Array.from({ length: left }, async () => {
    const answer = await client.read(path, "text/xml");
    --left;
    return answer.parts[0].content === content;
  });
  await readMeanwhile(t, host, file, () => left === 0);
  assert.deepEqual(new Set(await Promise.all(reads)), new Set([true]));
});
