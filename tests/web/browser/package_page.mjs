// SPDX-License-Identifier: Apache-2.0
// What the tests of office documents do on the page.
import assert from "node:assert/strict";

import { waitFor } from "../../serve/processes.mjs";
import { Session } from "./harness.mjs";
import { archive, unpack } from "./office_files.mjs";

/** A session whose page shows the document `name`, which is made of `files`. */
export async function open(t, name, files, options) {
  const session = await Session.start(t, { [name]: archive(files) }, options);
  session.page = await session.newPage(`&file=${encodeURIComponent(session.path(name))}`);
  await session.page.locator(".package").waitFor();
  return session;
}

/** Saves, and waits until the file on disk is another one, which is returned. */
export async function save(session, name) {
  const before = session.read(name);
  await session.page.keyboard.press("Control+s");
  await waitFor("the save", () => !session.read(name).equals(before));
  return session.read(name);
}

export const tab = (page, name) => page.getByRole("tab", { name, exact: true });

export async function openPart(page, name) {
  await tab(page, "Parts").click();
  await page.getByRole("treeitem", { name: new RegExp(`^${name}`) }).click();
}

// The targets, kinds and modes of a relationships file, in any order.
function relationshipsIn(bytes) {
  const tags = new TextDecoder().decode(bytes).match(/<Relationship\s[^>]*>/g) ?? [];
  const attribute = (tag, name) => new RegExp(`\\b${name}="([^"]*)"`).exec(tag)?.[1] ?? "";
  const isExternal = (tag) => attribute(tag, "TargetMode") === "External";
  return tags
    .map((tag) => [...["Id", "Type", "Target"].map((name) => attribute(tag, name)), isExternal(tag)].join(" "))
    .sort();
}

/** Fails unless two archives have the same parts, bytes and relationships, but for the bytes of those in `changed`. */
export function assertSameBut(changed, before, after) {
  const [old, now] = [unpack(before), unpack(after)];
  assert.deepEqual(Object.keys(now).sort(), Object.keys(old).sort());
  for (const [name, bytes] of Object.entries(old)) {
    if (name.endsWith(".rels")) {
      assert.deepEqual(relationshipsIn(now[name]), relationshipsIn(bytes), name);
    } else if (name !== "[Content_Types].xml") {
      assert.equal(Buffer.from(now[name]).equals(Buffer.from(bytes)), !changed.includes(name), name);
    }
  }
}
