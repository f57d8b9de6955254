// SPDX-License-Identifier: Apache-2.0
import assert from "node:assert/strict";
import { test } from "node:test";
import { setTimeout as sleep } from "node:timers/promises";

import { waitFor } from "../serve/processes.mjs";
import { room } from "./room.mjs";

const { DraftKeeper } = await room("save/draft_keeper.ts");

function keeper({ takes = 0, fails = false } = {}) {
  const log = [];
  const made = new DraftKeeper({
    store: async () => {
      if (fails) {
        throw new Error("full");
      }
      log.push("stored");
      await sleep(takes);
    },
    remove: async () => void log.push("removed"),
    failed: (reason) => log.push(reason.message),
  });
  return { log, made };
}

test("an edit is stored soon, and many edits at once are stored once", async () => {
  const { log, made } = keeper();
  for (let count = 0; count < 5; ++count) {
    made.changed();
  }
  assert.equal(made.isPending, true);
  await waitFor("the draft", () => log.length > 0);
  await sleep(400); // time for another one
  assert.deepEqual([log, made.isPending], [["stored"], false]);
});

test("an edit can be stored at once", async () => {
  const { log, made } = keeper();
  await made.flush();
  assert.deepEqual(log, []);
  made.changed();
  await made.flush();
  assert.deepEqual(log, ["stored"]);
});

test("what is removed is not stored afterwards", async () => {
  const { log, made } = keeper({ takes: 20 });
  made.changed();
  const stored = made.flush();
  await made.clear();
  await stored;
  made.changed();
  await made.clear();
  await sleep(400); // time for another draft
  assert.deepEqual(log, ["stored", "removed", "removed"]);
});

test("a draft is removed at once, even while it is being stored", () => {
  const { log, made } = keeper({ takes: 1000 });
  made.changed();
  void made.flush();
  void made.clear();
  assert.deepEqual(log, ["stored", "removed"]);
});

test("a draft that takes long is stored more rarely", async () => {
  const { log, made } = keeper({ takes: 50 });
  made.changed();
  await made.flush();
  made.changed();
  await sleep(600); // after which a draft that is stored fast would be there
  assert.deepEqual(log, ["stored"]);
  await waitFor("the second draft", () => log.length > 1);
  assert.deepEqual(log, ["stored", "stored"]);
});

test("a draft that cannot be stored is told of once", async () => {
  const { log, made } = keeper({ fails: true });
  for (let count = 0; count < 2; ++count) {
    made.changed();
    await made.flush();
  }
  assert.deepEqual([log, made.isPending], [["full"], true]);
});

test("a draft that fails while an earlier one is being stored is not taken for stored", async () => {
  let count = 0;
  const made = new DraftKeeper({
    store: async () => {
      if (++count === 2) {
        throw new Error("full");
      }
      await sleep(30);
    },
    remove: async () => {},
    failed: () => {},
  });
  made.changed();
  const first = made.flush();
  made.changed();
  await made.flush();
  await first;
  await sleep(60); // in which the first is done
  assert.equal(made.isPending, true);
});
