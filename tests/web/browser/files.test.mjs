// SPDX-License-Identifier: Apache-2.0
// The tree of files.
import assert from "node:assert/strict";
import { mkdirSync, writeFileSync } from "node:fs";
import { join } from "node:path";

import { clientOf } from "./client.mjs";
import { browserTest, Session } from "./harness.mjs";

const names = (page) => page.locator(".tree .row .name").allTextContents();
const row = (page, name) => page.locator(".tree .row", { has: page.getByText(name, { exact: true }) });

browserTest("the root is open, folders first, and a file is opened by a click", async (t) => {
  const { page } = await Session.start(t, { "b.txt": "two", "a10.txt": "", "a9.txt": "", "inner/c.txt": "three" });
  await row(page, "b.txt").waitFor();
  assert.deepEqual(await names(page), ["documents", "inner", "a9.txt", "a10.txt", "b.txt"]);
  await row(page, "b.txt").click();
  await page.getByRole("tab", { name: "b.txt" }).waitFor();
  assert.equal(await page.title(), "b.txt - Documents");
});

browserTest("a click counts though the tree is to be drawn again before the button is let go", async (t) => {
  const { page } = await Session.start(t, { "a.txt": "one" });
  await row(page, "a.txt").hover();
  await page.mouse.down();
  await page.evaluate(() => {
    document.querySelector(".tree").dispatchEvent(new Event("scroll")); // draws it with the next frame
    return new Promise((resolve) => requestAnimationFrame(() => requestAnimationFrame(resolve)));
  });
  await page.mouse.up();
  await page.getByRole("tab", { name: "a.txt" }).waitFor();
});

browserTest("the tree is drawn after a press whose end the page does not see", async (t) => {
  const session = await Session.start(t, { "a.txt": "one" });
  const { page } = session;
  const other = await clientOf(t, session);
  const press = (options) => row(page, "a.txt").dispatchEvent("pointerdown", { button: 0, ...options });
  const presses = {
    "opens a menu with the control key": () => press({ ctrlKey: true }),
    "opens a menu": () => press().then(() => row(page, "a.txt").dispatchEvent("contextmenu")),
    "leaves the window": () => press().then(() => page.evaluate(() => dispatchEvent(new Event("blur")))),
    "is followed by a key": () => press().then(() => page.keyboard.press("Shift")),
  };
  for (const [what, pressed] of Object.entries(presses)) {
    await pressed();
    await other.write(session.path(`${what}.txt`), "");
    await row(page, `${what}.txt`).waitFor();
  }
});

browserTest("the keyboard goes through the tree, opens folders and files", async (t) => {
  const { page } = await Session.start(t, { "a.txt": "one", "inner/c.txt": "three" });
  await row(page, "a.txt").waitFor();
  await page.locator(".tree").focus();
  // The tree is drawn again after a key, with the next frame.
  const becomesActive = (end) =>
    page.waitForFunction((end) => {
      const id = document.querySelector(".tree").getAttribute("aria-activedescendant");
      return document.getElementById(id)?.title.endsWith(end);
    }, end);
  const isExpanded = (name, value) => row(page, name).and(page.locator(`[aria-expanded="${value}"]`)).waitFor();
  await page.keyboard.press("Home");
  await page.keyboard.press("ArrowDown");
  await becomesActive("/inner");
  await isExpanded("inner", "false");
  await page.keyboard.press("ArrowRight");
  await row(page, "c.txt").waitFor();
  await isExpanded("inner", "true");
  await page.keyboard.press("ArrowRight");
  await becomesActive("/inner/c.txt");
  assert.equal(await row(page, "c.txt").getAttribute("aria-level"), "3");
  await page.keyboard.press("ArrowLeft");
  await page.keyboard.press("ArrowLeft");
  await isExpanded("inner", "false");
  await page.keyboard.press("a");
  await becomesActive("/a.txt");
  await page.keyboard.press("Enter");
  await page.getByRole("tab", { name: "a.txt" }).waitFor();
});

browserTest("ten thousand files are in the tree without as many elements, and found as one types", async (t) => {
  const session = await Session.start(t);
  const folder = session.path("many");
  mkdirSync(folder);
  for (let index = 0; index < 10_000; ++index) {
    writeFileSync(join(folder, `file ${index}.txt`), "");
  }
  const { page } = session;
  await page.getByRole("button", { name: "Refresh" }).click();
  await row(page, "many").click();
  await page.waitForFunction(() => document.querySelector(".tree .rows").clientHeight >= 10_000 * 26);
  await page.locator(".tree").focus();
  await page.keyboard.press("End");
  await row(page, "file 9999.txt").waitFor();
  assert.ok((await page.locator(".tree .row").count()) < 200);
  const took = await page.evaluate(() => {
    const filter = document.querySelector('.files input[type="search"]');
    const begin = performance.now();
    filter.value = "many 777.";
    filter.dispatchEvent(new InputEvent("input"));
    return performance.now() - begin;
  });
  t.diagnostic(`one letter of a search among 10000 files takes ${took.toFixed(1)} ms`);
  await page.getByText("10 found").waitFor();
  assert.equal(await page.locator(".tree .row.file").count(), 10);
});

browserTest("a search looks into folders that have not been opened", async (t) => {
  const { page } = await Session.start(t, { "a/b/c/needle.txt": "", "a/b/other.txt": "", "x/y.txt": "" });
  await row(page, "a").waitFor();
  await page.keyboard.press("Control+p");
  await page.keyboard.type("need");
  await row(page, "needle.txt").waitFor();
  await page.getByText("1 found").waitFor();
  assert.deepEqual(await names(page), ["documents", "a", "b", "c", "needle.txt"]);
  await page.keyboard.press("Enter");
  await page.getByRole("tab", { name: "needle.txt" }).waitFor();
});

browserTest("what somebody saves is marked, and appears when it is new", async (t) => {
  const session = await Session.start(t, { "a.txt": "one", "b.txt": "two" });
  const { page } = session;
  await row(page, "a.txt").waitFor();
  const other = await clientOf(t, session);
  await other.write(session.path("a.txt"), "changed");
  await other.write(session.path("new.txt"), "new");
  await row(page, "new.txt").waitFor();
  assert.equal(await row(page, "a.txt").locator(".changed").count(), 1);
  assert.equal(await row(page, "b.txt").locator(".changed").count(), 0);
  await row(page, "a.txt").click();
  await row(page, "a.txt").locator(".changed").waitFor({ state: "detached" });
});
