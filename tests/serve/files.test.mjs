// SPDX-License-Identifier: Apache-2.0
// What the client library asks of the file service, and saves that know what they are based on.
import assert from "node:assert/strict";
import { createHash } from "node:crypto";
import { mkdirSync, readFileSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";

import { FilesError, connect, textOf, utf8 } from "../../web/client/dist/index.js";
import { parseUrl } from "./client.mjs";
import { Host, atEnd, temporaryFolder, waitFor } from "./processes.mjs";
import "./web_socket.mjs";

async function start(test) {
  const folder = temporaryFolder(test);
  const host = await Host.start(test, ["--root", folder, "--history", temporaryFolder(test)]);
  const { server, user, password } = parseUrl(host.webSocket);
  const client = await connect({ servers: server, user, pass: password });
  atEnd(test, () => client.close());
  return { folder, client };
}

test("the roots are told", async (t) => {
  const { folder, client } = await start(t);
  assert.deepEqual(await client.roots(), [folder]);
});

test("a folder is listed, in pages where it is large", async (t) => {
  const { folder, client } = await start(t);
  mkdirSync(join(folder, "inner"));
  writeFileSync(join(folder, "caf\u00e9 \u6d77.txt"), "12345");
  const { entries, isLast } = await client.list(folder);
  assert.equal(isLast, true);
  assert.deepEqual(
    entries.map(({ name, kind }) => [name, kind]),
    [["caf\u00e9 \u6d77.txt", "file"], ["inner", "folder"]],
  );
  assert.equal(entries[0].size, 5);
  assert.ok(Math.abs(entries[0].time - Date.now()) < 60_000);
  for (let index = 0; index < 1500; ++index) {
    writeFileSync(join(folder, "inner", `\u00e9${index}`), "");
  }
  const first = await client.list(join(folder, "inner"));
  assert.equal(first.isLast, false);
  const second = await client.list(join(folder, "inner"), first.entries.at(-1).name);
  assert.equal(second.isLast, true);
  assert.equal(new Set([...first.entries, ...second.entries].map(({ name }) => name)).size, 1500);
});

test("what cannot be told is an error that says why", async (t) => {
  const { folder, client } = await start(t);
  await assert.rejects(client.list(join(folder, "none")), (error) => {
    assert.ok(error instanceof FilesError);
    assert.match(error.message, /cannot be opened/);
    return true;
  });
});

test("the charset of a text is told", async (t) => {
  const { folder, client } = await start(t);
  const file = join(folder, "text.txt");
  writeFileSync(file, "\ufeffPl\u00e4tze");
  const { charset, byteOrderMark } = await client.charset(file);
  assert.deepEqual([charset, byteOrderMark], ["UTF-8", true]);
});

test("a save based on the version there is made, and one based on another is not", async (t) => {
  const { folder, client } = await start(t);
  const file = join(folder, "text.txt");
  assert.equal(await client.version(file), "");
  assert.equal(await client.write(file, "one", { baseVersion: "" }), true);
  const { answer, version } = await client.readVersioned(file, "text/plain");
  assert.deepEqual([answer.data, version], ["one", await client.version(file)]);
  assert.equal(await client.write(file, "two", { baseVersion: version }), true);
  assert.equal(await client.write(file, "three", { baseVersion: version }), false);
  assert.equal(readFileSync(file, "latin1"), "two");
});

test("a save tells the version that it has made, and not one that somebody else makes later", async (t) => {
  const { folder, client } = await start(t);
  const file = join(folder, "text.txt");
  let version = "";
  for (const text of ["one", "two", "x".repeat(2_000_000)]) {
    const result = await client.save(file, text, { baseVersion: version });
    assert.deepEqual(result, { isSaved: true, version: await client.version(file) });
    version = result.version;
  }
  writeFileSync(file, "theirs");
  assert.deepEqual(await client.save(file, "mine", { baseVersion: version }), { isSaved: false });
  const document = join(folder, "new.docx");
  const part = { partUri: "/a", contentType: "text/plain", content: "a", relationship: null };
  const { version: made } = await client.save(document, { parts: [part], relationships: [] }, { baseVersion: "" });
  assert.equal(made, await client.version(document));
});

test("a read has the version of just what it read, while others save", async (t) => {
  const { folder, client } = await start(t);
  const file = join(folder, "text.txt");
  await client.write(file, "start");
  let isOver = false;
  const saves = (async () => {
    // Each another text: a version is a token of the content, and the same for the same.
    for (let count = 0; !isOver; ++count) {
      await client.write(file, `text ${count}`);
    }
  })();
  const seen = new Set();
  for (let count = 0; count < 30; ++count) {
    const { answer, version } = await client.readVersioned(file, "text/plain");
    assert.equal(createHash("sha256").update(answer.data).digest("hex").slice(0, 32), version);
    seen.add(version);
  }
  isOver = true;
  await saves;
  assert.ok(seen.size > 1);
});

test("earlier versions are listed, read and restored", async (t) => {
  const { folder, client } = await start(t);
  const file = join(folder, "text \u6d77.txt");
  for (const text of ["one", utf8("zw\u00f6lf"), "three"]) {
    assert.equal(await client.write(file, text), true);
    await waitFor("the copy", async () => text !== "three" || (await client.versions(file)).length === 2);
  }
  const [twelve, one] = await client.versions(file);
  assert.ok(twelve.time >= one.time);
  assert.deepEqual([twelve.size, one.size], [6, 3]);
  const answer = await client.readVersion(file, twelve.time, "text/plain");
  assert.equal(textOf(answer.data), "zw\u00f6lf");
  await client.restore(file, one.time);
  assert.equal(readFileSync(file, "latin1"), "one");
});

test("notifications name the file as text", async (t) => {
  const { folder, client } = await start(t);
  const file = join(folder, "caf\u00e9 \u6d77.txt");
  const changes = [];
  client.listen((change) => changes.push(change));
  await client.nats.flush();
  await client.write(file, "one");
  await waitFor("the notification", () => changes.length > 0);
  assert.deepEqual(changes[0], { filePath: file, isExistingFile: false });
});
