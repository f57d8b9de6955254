// SPDX-License-Identifier: Apache-2.0
// Documents of hundreds of megabytes, and a line that is slow for its document. The largest take
// EDITOR_SERIALIZATION_LONG_TESTS=1.
import assert from "node:assert/strict";
import { randomBytes } from "node:crypto";
import { readFileSync, writeFileSync } from "node:fs";
import { connect as openSocket, createServer } from "node:net";
import { totalmem } from "node:os";
import { join } from "node:path";
import { test } from "node:test";
import { setTimeout as sleep } from "node:timers/promises";

import { MessageServer } from "./message_server.mjs";
import { IS_LONG, IS_SANITIZED, atEnd, temporaryFolder } from "./processes.mjs";

const MEGABYTE = 1_000_000;

// `length` bytes of base64 without a pattern that a lost or doubled piece could hide in.
function longBytes(length) {
  const bytes = Buffer.alloc(length);
  for (let filled = 0; filled < length; ) {
    filled += bytes.write(randomBytes(3 * 2 ** 18).toString("base64"), filled, "latin1");
  }
  return bytes;
}

async function setUp(test, workerArguments = []) {
  const folder = temporaryFolder(test);
  const server = await MessageServer.start(test, folder);
  const worker = await server.startWorker(folder, workerArguments);
  return { folder, server, worker };
}

// A line of `rate` bytes in a second from the server to whoever connects to the port that it returns.
async function slowLine(test, port, rate) {
  const line = createServer((client) => {
    const server = openSocket({ host: "127.0.0.1", port, highWaterMark: 2 ** 14 });
    const end = () => [client, server].forEach((socket) => socket.destroy());
    [client, server].forEach((socket) => socket.on("error", end).on("close", end));
    client.pipe(server);
    (async () => {
      for await (const chunk of server) {
        client.write(chunk);
        await sleep((1000 * chunk.length) / rate);
      }
    })().catch(() => {});
  });
  await new Promise((resolve) => line.listen(0, "127.0.0.1", resolve));
  atEnd(test, () => line.close());
  return line.address().port;
}

test("a client on a slow line gets its answer, and the server holds little of it", async (t) => {
  const { folder, server } = await setUp(t);
  const megabytes = IS_LONG ? 60 : 10;
  const file = join(folder, "slow.txt");
  const text = longBytes(megabytes * MEGABYTE);
  writeFileSync(file, text);
  const port = await slowLine(t, server.webSocketPort, MEGABYTE);
  const client = await server.connect("ada", { port });
  let mostPending = 0;
  let isDone = false;
  const watch = (async () => {
    while (!isDone) {
      const pending = (await server.connections()).map((one) => one.pending_bytes);
      mostPending = Math.max(mostPending, ...pending);
      await sleep(50);
    }
  })();
  const begin = Date.now();
  const answer = await client.read(file, "text/plain", { tries: 1 });
  const seconds = (Date.now() - begin) / 1000;
  isDone = true;
  await watch;
  t.diagnostic(`${megabytes} MB in ${seconds} s; the server held up to ${mostPending} bytes`);
  assert.ok(answer.data === text.toString("latin1"));
  assert.ok(seconds > megabytes / 2, "the line was not slow");
  // What the client has room for, and a piece.
  assert.ok(mostPending < 5.5 * MEGABYTE, `the server held ${mostPending} bytes`);
});

test("300 MB are written and read byte for byte", { skip: !IS_LONG || IS_SANITIZED }, async (t) => {
  const { folder, server } = await setUp(t);
  const client = await server.connect("ada");
  const file = join(folder, "300.txt");
  const bytes = longBytes(300 * MEGABYTE);
  const text = bytes.toString("latin1");
  const begin = Date.now();
  assert.equal(await client.write(file, text, { tries: 1 }), true);
  const between = Date.now();
  const { data } = await client.read(file, "text/plain", { tries: 1 });
  t.diagnostic(`written in ${(between - begin) / 1000} s, read in ${(Date.now() - between) / 1000} s`);
  assert.ok(data === text);
  assert.ok(readFileSync(file).equals(bytes));
});

const isRoomy = totalmem() >= 16 * 2 ** 30;

test("1 GiB is written and read byte for byte", { skip: !IS_LONG || IS_SANITIZED || !isRoomy }, async (t) => {
  const { folder, server } = await setUp(t);
  const client = await server.connect("ada");
  const file = join(folder, "1024.docx");
  const head = Buffer.from('{"parts":[{"content":"data:image/png;base64,');
  const tail = Buffer.from(
    '","contentType":"image/png","partUri":"/media/image1.png","relationship":null}],"relationships":[]}',
  );
  // Less than 1 GiB by what requests and answers have beside the document, in whole groups of base64.
  const image = longBytes(2 ** 30 - 4096);
  const bytes = Buffer.concat([head, image, tail]);
  const begin = Date.now();
  assert.equal(await client.writeBytes(file, bytes, { tries: 1, timeout: 300_000 }), true);
  const between = Date.now();
  const answer = Buffer.from(await client.readBytes(file, "text/xml", { tries: 1, timeout: 300_000 }));
  t.diagnostic(`written in ${(between - begin) / 1000} s, read in ${(Date.now() - between) / 1000} s`);
  const place = answer.indexOf("data:image/png;base64,") + "data:image/png;base64,".length;
  assert.ok(answer.subarray(place, place + image.length).equals(image));
  assert.ok(answer.length - image.length < 4096);
});
