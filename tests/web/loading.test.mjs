// SPDX-License-Identifier: Apache-2.0
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "./room.mjs";

const { load, UnreadableDocument } = await room("files/loading.ts");

// A client of a file that changes with each of its first `changes` readings: its content is their number.
function changingFile(changes) {
  let readings = 0;
  const present = () => Math.min(readings, changes);
  return {
    readings: () => readings,
    read: async () => {
      const data = String(present());
      ++readings;
      return { status: true, data };
    },
    version: async () => `version ${present()}`,
    charset: async () => ({ charset: "UTF-8", byteOrderMark: false }),
  };
}

for (const path of ["a.txt", "a.docx"]) {
  test(`${path}, if it changes while it is read, is read again`, async () => {
    const client = changingFile(1);
    const { version, answer, isChanging } = await load(client, path);
    assert.deepEqual([version, answer.data, isChanging], ["version 1", "1", undefined]);
  });

  test(`${path}, if it changes all the time, is read a few times, and said to be changing`, async () => {
    const client = changingFile(1_000);
    const { version, answer, isChanging } = await load(client, path);
    assert.ok(client.readings() > 1 && client.readings() <= 5, `${client.readings()} readings`);
    assert.deepEqual([version, isChanging], [`version ${answer.data}`, true]);
    assert.notEqual(version, await client.version()); // so that a save is refused
  });
}

test("what does not change is read once, with its charset", async () => {
  const client = changingFile(0);
  assert.deepEqual(await load(client, "a.txt"), {
    path: "a.txt",
    version: "version 0",
    answer: { status: true, data: "0" },
    charset: "UTF-8",
    byteOrderMark: false,
  });
  assert.equal(client.readings(), 1);
});

test("what cannot be read is told with the version that it had before, which a later one differs from", async () => {
  const versions = ["broken", "mended"];
  const client = { version: async () => versions.shift(), read: async () => ({ status: false, exception: "no archive" }) };
  await assert.rejects(load(client, "a.docx"), (error) => {
    assert.ok(error instanceof UnreadableDocument);
    assert.deepEqual([error.message, error.version], ["no archive", "broken"]);
    return true;
  });
});
