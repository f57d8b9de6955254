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

test("drafts are shown also where they cannot be stored for this window, and stay where they are", async () => {
  const browser = new Browser();
  await (await browser.open("gone")).put(draft("a", "theirs"));
  await (await browser.open("own")).put(draft("b", "mine"));
  browser.close("gone");
  const before = browser.held;
  for (const store of ["drafts", "originals"]) {
    browser.store.fails = (name, question) => (question === "put" && name === store ? FULL : undefined);
    const drafts = await browser.open("own");
    assert.deepEqual((await shown(await drafts.take())).sort(), ["a: theirs in original of a", "b: mine in original of b"]);
    assert.deepEqual(browser.held, before);
  }
});

test("a draft that could not be stored for this window is gone with its save, and with its next draft", async () => {
  for (const end of [(drafts) => drafts.remove("a"), (drafts) => drafts.put(draft("a", "more"))]) {
    const browser = new Browser();
    await (await browser.open("gone")).put(draft("a", "theirs"));
    browser.close("gone");
    browser.store.fails = (_, question) => (question === "put" ? FULL : undefined);
    const drafts = await browser.open("own");
    await drafts.take();
    browser.store.fails = () => undefined;
    await end(drafts);
    assert.equal(browser.held.drafts.includes("gone a"), false);
    assert.equal(browser.held.originals.length, browser.held.drafts.length);
  }
});

test("where the drafts cannot be read, none is removed or replaced", async () => {
  for (const store of ["drafts", "originals"]) {
    const browser = new Browser();
    await (await browser.open("own")).put(draft("a", "mine"));
    browser.store.fails = (name, question) => (question === "getAll" && name === store ? FULL : undefined);
    const drafts = await browser.open("own");
    await assert.rejects(drafts.take(), FULL);
    await assert.rejects(drafts.remove("a"), FULL);
    await assert.rejects(drafts.put(draft("a", "other")), FULL);
    browser.store.fails = () => undefined;
    assert.deepEqual(await shown(await (await browser.open("own")).take()), ["a: mine in original of a"]);
  }
});

test("a window that takes a draft has what it was made from for itself", async () => {
  const browser = new Browser();
  const slow = await browser.open("slow");
  await slow.put(draft("a", "mine"));
  browser.close("slow"); // as it seems, while it waits
  const [, own] = await Promise.all([(await browser.open("quick")).take(), slow.take()]);
  assert.deepEqual(await shown(own), ["a: mine in original of a"]);
  await slow.put({ ...own[0], content: { ...own[0].content, typed: "more" } });
  await slow.remove("a");
  browser.close("quick");
  assert.deepEqual(await shown(await (await browser.open("next")).take()), ["a: mine in original of a"]);
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
