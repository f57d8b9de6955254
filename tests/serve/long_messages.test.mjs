// SPDX-License-Identifier: Apache-2.0
// Documents that are too long for one message, with the client library and a real host.
import assert from "node:assert/strict";
import { randomBytes } from "node:crypto";
import { readFileSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";
import { setTimeout as sleep } from "node:timers/promises";

import { headers } from "../../web/client/node_modules/@nats-io/nats-core/lib/mod.js";
import { AskAgain, connect, utf8 } from "../../web/client/dist/index.js";
import { parseUrl } from "./client.mjs";
import { MessageServer } from "./message_server.mjs";
import { Host, IS_SANITIZED, atEnd, temporaryFolder, waitFor } from "./processes.mjs";
import "./web_socket.mjs";

const MEGABYTES = IS_SANITIZED ? 5 : 60;

async function clientOf(test, host) {
  const { server, user, password } = parseUrl(host.webSocket);
  const client = await connect({ servers: server, user, pass: password });
  atEnd(test, () => client.close());
  return client;
}

async function start(test) {
  const folder = temporaryFolder(test);
  const host = await Host.start(test, ["--root", folder]);
  return { folder, host, client: await clientOf(test, host) };
}

// Text without a pattern that a lost or doubled piece could hide in.
function longText(megabytes) {
  return randomBytes((megabytes * 750_000) | 0).toString("base64");
}

test("a long text is written and read byte for byte, with progress", async (t) => {
  const { folder, client } = await start(t);
  const file = join(folder, "long.txt");
  const text = longText(MEGABYTES);
  const sent = [];
  assert.equal(await client.write(file, text, { onProgress: (one) => sent.push(one) }), true);
  assert.ok(readFileSync(file, "latin1") === text);
  assert.ok(sent.filter(({ direction }) => direction === "sent").length >= MEGABYTES / 2);
  const received = [];
  const answer = await client.read(file, "text/plain", { onProgress: (one) => received.push(one) });
  assert.ok(answer.data === text);
  const last = received.at(-1);
  assert.equal(last.direction, "received");
  assert.equal(last.bytes, last.total);
});

test("a long package is written and read as it was, parts that are not text included", async (t) => {
  const { folder, client } = await start(t);
  const file = join(folder, "long.docx");
  const part = (partUri, contentType, content) => ({ partUri, contentType, content, relationship: [] });
  const document = {
    parts: [
      part("/media/image1.png", "image/png", `data:image/png;base64,${longText(MEGABYTES)}`),
      part("/word/vbaProject.bin", "application/vnd.ms-office.vbaProject", "\x00\xff\x01 no text"),
      part("/word/document.xml", "application/xml", utf8("<a>Cr\u00e8me br\u00fbl\u00e9e</a>")),
    ],
    relationships: [],
  };
  assert.equal(await client.write(file, document), true);
  const answer = await client.read(file, "text/xml");
  assert.equal(answer.status, true);
  const contents = (parts) => new Map(parts.map(({ partUri, contentType, content }) => [partUri, [contentType, content]]));
  assert.deepEqual(contents(answer.parts), contents(document.parts));
});

test("short requests and answers go as ever", async (t) => {
  const { folder, client } = await start(t);
  const file = join(folder, "short \u6d77.txt");
  assert.equal(await client.write(file, utf8("\u6d77\n")), true);
  assert.equal(readFileSync(file, "utf8"), "\u6d77\n");
  assert.deepEqual(await client.read(file, "text/plain"), { data: utf8("\u6d77\n"), status: true });
});

test("of many writes of one file the last one counts, and those between are not made", async (t) => {
  const { folder, client } = await start(t);
  const file = join(folder, "often.txt");
  let notifications = 0;
  client.listen(() => ++notifications);
  const writes = Array.from({ length: 20 }, (_, index) => client.write(file, `version ${index}`));
  assert.deepEqual(new Set(await Promise.all(writes)), new Set([true]));
  assert.equal(readFileSync(file, "latin1"), "version 19");
  await waitFor("the notifications", () => notifications === 2);
});

test("a transfer that is cancelled frees its place", async (t) => {
  const { folder, client } = await start(t);
  const file = join(folder, "cancelled.txt");
  const abort = new AbortController();
  const onProgress = () => abort.abort(new Error("no more"));
  const write = client.write(file, longText(MEGABYTES), { signal: abort.signal, onProgress });
  await assert.rejects(write, /no more/);
  assert.equal(await client.write(file, "short"), true);
  assert.equal(readFileSync(file, "latin1"), "short");
});

test("clients that take nothing of their answers hold up no other", async (t) => {
  const { folder, host, client } = await start(t);
  const file = join(folder, "untaken.txt");
  writeFileSync(file, longText(5));
  const idle = await clientOf(t, host);
  const { user } = parseUrl(host.webSocket);
  for (let count = 0; count < 100; ++count) {
    const rtcId = `${user}.untaken-${count}`;
    const header = headers();
    header.set("Zpr-Pieces", "yes");
    idle.nats.publish(
      "/zpr/service/readRequest_cpp",
      JSON.stringify({ rtcId, contentType: "text/plain", filePath: file }),
      { headers: header, reply: `/zpr/service/readResponse/${rtcId}` },
    );
  }
  const small = join(folder, "small.txt");
  writeFileSync(small, "small");
  for (let count = 0; count < 20; ++count) {
    assert.equal((await client.read(small, "text/plain")).data, "small");
  }
  assert.equal((await client.read(file, "text/plain")).data.length, 5_000_000);
});

// A worker that sends an answer of so many MiB as it is given room, each piece after a pause. Returns the rooms, in
// MiB, that its client has given by the end.
async function roomsFor(t, mebibytes, pause) {
  const server = await MessageServer.start(t, temporaryFolder(t));
  const { nats } = await server.connect("worker");
  const say = (subject, word, payload) => {
    const header = headers();
    header.set("Zpr-Pieces", word);
    nats.publish(subject, payload, { headers: header });
  };
  const piece = new Uint8Array(2 ** 20);
  const rooms = [];
  let sent = 0;
  let isSending = false;
  const send = async (subject) => {
    for (isSending = true; sent < rooms.at(-1); ++sent) {
      await sleep(pause);
      say(subject, `piece ${sent * 2 ** 20}`, piece);
    }
    isSending = false;
  };
  let answers;
  nats.subscribe("/zpr/service/piece.w1.>", {
    callback: (_, { headers: said }) => {
      rooms.push(Number(said.get("Zpr-Pieces").split(" ")[1]) / 2 ** 20);
      isSending || send(answers);
    },
  });
  nats.subscribe("/zpr/service/readRequest_cpp", {
    callback: (_, { reply }) => say((answers = reply), `answer w1 ${mebibytes * 2 ** 20}`),
  });
  await nats.flush();
  const client = await server.connect("ada");
  const answer = await client.readBytes("/any", "text/plain", { tries: 1 });
  assert.equal(answer.length, mebibytes * 2 ** 20);
  return rooms;
}

test("a client on a fast line gives room once in a few pieces", async (t) => {
  const rooms = await roomsFor(t, 60, 0);
  assert.ok(rooms.length <= 40, `${rooms}`);
  assert.equal(rooms.at(-1), 60);
});

test("a client on a slow line gives room with every piece, which its worker takes for progress", async (t) => {
  assert.deepEqual((await roomsFor(t, 12, 1100)).slice(0, 4), [4, 5, 6, 7]);
});

test("nobody speaks in another's name about pieces", async (t) => {
  const { client } = await start(t);
  const refusals = [];
  (async () => {
    for await (const status of client.nats.status()) {
      refusals.push(String(status.error ?? status.data ?? status.type));
    }
  })();
  client.nats.publish("/zpr/service/piece.anyone.another.1");
  await client.nats.flush();
  await waitFor("the refusal", () => refusals.some((text) => /permissions violation/i.test(text)));
});

test("without a worker there is an error, and soon", async (t) => {
  const { host, client } = await start(t);
  host.signal("SIGTERM");
  await host.end;
  await assert.rejects(client.read("/any", "text/plain", { tries: 1, timeout: 500 }), AskAgain);
});

test("what is under way when a host ends is finished", async (t) => {
  const { folder, host, client } = await start(t);
  const file = join(folder, "ending.txt");
  const text = longText(MEGABYTES);
  writeFileSync(file, text);
  let begun = false;
  const onProgress = ({ direction }) => (begun ||= direction === "received");
  const read = client.read(file, "text/plain", { onProgress });
  await waitFor("the first piece", () => begun);
  host.signal("SIGTERM");
  assert.ok((await read).data === text);
  assert.equal(await host.end, 0);
});

test("what is longer than --max-message is refused, with the reason", async (t) => {
  const folder = temporaryFolder(t);
  const host = await Host.start(t, ["--root", folder, "--max-message", "9MB"]);
  const client = await clientOf(t, host);
  const file = join(folder, "long.txt");
  const text = longText(10);
  await assert.rejects(client.write(file, text, { tries: 1 }), /requests have 1 to 9437184 bytes/);
  writeFileSync(file, text);
  const { status, exception } = await client.read(file, "text/plain");
  assert.equal(status, false);
  assert.match(exception, /too large.*9437184 bytes/s);
  assert.equal(await client.write(file, longText(8)), true);
});
