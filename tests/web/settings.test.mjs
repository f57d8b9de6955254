// SPDX-License-Identifier: Apache-2.0
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "./room.mjs";

const { completeSettings, fragmentOf, readFragment, remember, storeIn } = await room("connection/settings.ts", "storage.ts");

function store(said = {}) {
  const items = new Map(Object.entries(said));
  return { getItem: (key) => items.get(key) ?? null, setItem: (key, value) => items.set(key, value) };
}

const ADA = { server: "ws://127.0.0.1:1", user: "ada", password: "secret" };

test("a fragment tells where to connect and what to show", () => {
  const fragment = "#server=ws://127.0.0.1:1&user=ada&password=secret&file=/d/caf%C3%A9+%2B%26.txt";
  assert.deepEqual(readFragment(fragment), { ...ADA, file: "/d/caf\u00e9 +&.txt" });
  assert.deepEqual(readFragment(""), {});
});

test("a link leads back to its document, and never holds the password", () => {
  const link = fragmentOf(ADA, "/d/caf\u00e9 +&#%.txt");
  assert.doesNotMatch(link, /secret|password/);
  assert.deepEqual(readFragment(link), { server: ADA.server, user: "ada", file: "/d/caf\u00e9 +&#%.txt" });
  assert.equal(fragmentOf({}), "");
});

test("the password is remembered by what ends with the browser's tab, and by nothing else", () => {
  const [session, lasting] = [store(), store()];
  remember(ADA, session, lasting);
  assert.doesNotMatch(lasting.getItem("connection"), /secret/);
  assert.deepEqual(completeSettings({}, session, lasting), ADA);
  assert.deepEqual(completeSettings({}, store(), lasting), { server: ADA.server, user: "ada" });
});

test("what is remembered completes an address of the same server and user only", () => {
  const [session, lasting] = [store(), store()];
  remember(ADA, session, lasting);
  const { server } = ADA;
  assert.deepEqual(completeSettings({ server, user: "ada" }, session, lasting), ADA);
  assert.deepEqual(completeSettings({ server, user: "eve" }, session, lasting), { server, user: "eve" });
  assert.deepEqual(completeSettings({ server: "ws://other" }, session, lasting), { server: "ws://other" });
  assert.deepEqual(completeSettings({ ...ADA, password: "new" }, session, lasting), { ...ADA, password: "new" });
});

test("what a browser does not store is remembered by the page, and what it does by the browser", () => {
  const stored = store();
  let isBlocked = true;
  const kept = storeIn(() => {
    if (isBlocked) {
      throw new Error("denied");
    }
    return stored;
  });
  assert.equal(kept.getItem("theme"), null);
  kept.setItem("theme", "dark");
  isBlocked = false;
  assert.equal(stored.getItem("theme"), null);
  assert.equal(kept.getItem("theme"), "dark");
  kept.setItem("theme", "light");
  assert.equal(stored.getItem("theme"), "light");
  stored.setItem("theme", "system"); // by another page
  assert.equal(kept.getItem("theme"), "system");
});
