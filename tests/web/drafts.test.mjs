// SPDX-License-Identifier: Apache-2.0
// What the browser keeps of unsaved changes, and for which window.
import assert from "node:assert/strict";
import { test } from "node:test";

import { IndexedDb } from "./indexed_db.mjs";
import { room } from "./room.mjs";

const { Drafts } = await room("save/drafts.ts");

const FULL = new DOMException("the disk is full", "QuotaExceededError");

// A browser with its windows, by their ids; those in `gone` are no more.
class Browser {
  store = new IndexedDb();
  gone = new Set();

  open(id) {
    globalThis.indexedDB = this.store;
    return Drafts.open({ id, isGone: async (other) => this.gone.has(other) });
  }

  close(id) {
    this.gone.add(id);
  }

  // The windows and paths of the drafts, and the ids of what they were made from.
  get held() {
    const drafts = [...this.store.held("editor", "drafts").values()].map(({ window, path }) => `${window} ${path}`);
    return { drafts: drafts.sort(), originals: [...this.store.held("editor originals", "originals").values()].map(({ id }) => id) };
  }
}

const draft = (path, typed, original = new Blob([`original of ${path}`])) => ({ path, version: "v", content: { typed, original } });
const shown = (drafts) =>
  Promise.all(drafts.map(async ({ path, content }) => `${path}: ${content.typed} in ${await content.original?.text()}`));

test("a draft, with what it was made from, is there in the next window", async () => {
  const browser = new Browser();
  await (await browser.open("one")).put(draft("a", "mine"));
  browser.close("one");
  const next = await browser.open("two");
  assert.deepEqual(await shown(await next.take()), ["a: mine in original of a"]);
  assert.deepEqual([browser.held.drafts, browser.held.originals.length], [["two a"], 1]);
  await next.remove("a");
  assert.deepEqual(browser.held, { drafts: [], originals: [] });
});

test("what a draft was made from is stored with the next draft where it could not be stored before", async () => {
  const browser = new Browser();
  const drafts = await browser.open("own");
  const one = draft("a", "mine");
  browser.store.fails = (name, question) => (name === "originals" && question === "put" ? FULL : undefined);
  await assert.rejects(drafts.put(one), FULL);
  browser.store.fails = () => undefined;
  await drafts.put(one);
  assert.deepEqual(await shown(await (await browser.open("own")).take()), ["a: mine in original of a"]);
});

test("a draft fails with the original that it needs, and not with an earlier or a later one", async () => {
  const browser = new Browser();
  const drafts = await browser.open("own");
  const [bad, good] = [draft("a", "mine"), draft("a", "mine")];
  browser.store.fails = (name, question, given) => (name === "originals" && question === "put" && given.original === bad.content.original ? FULL : undefined);
  const results = await Promise.allSettled([drafts.put(bad), drafts.put(good), drafts.put(bad), drafts.put(good)]);
  assert.deepEqual(results.map(({ status }) => status), ["rejected", "fulfilled", "rejected", "fulfilled"]);
  assert.deepEqual(await shown(await (await browser.open("own")).take()), ["a: mine in original of a"]);
});
