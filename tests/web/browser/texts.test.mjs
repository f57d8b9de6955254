// SPDX-License-Identifier: Apache-2.0
// Texts: opened, edited and saved in any charset, with every byte that was not touched as it was.
import assert from "node:assert/strict";

import { browserTest, Session } from "./harness.mjs";
import { samples } from "./samples.mjs";

// Opens a file of the session, in the place of the one that is open, and waits for its text.
async function open({ page }, name) {
  for (const close of await page.locator(".tab button").all()) {
    await close.click();
  }
  await page.locator(".tree .row").getByText(name, { exact: true }).click();
  await page.getByRole("tab", { name }).waitFor();
  await editor(page).waitFor();
}

const panel = (page) => page.locator(".panel:not([hidden])");
const editor = (page) => panel(page).locator(".text-view .cm-content");
const charset = (page) => panel(page).getByLabel("Charset of the file");
const lineEnds = (page) => panel(page).getByLabel("Line ends");
const mark = (page) => panel(page).getByLabel("Byte-order mark");
const shown = (select) => select.locator("option:checked").textContent();

async function typeAtTheEnd(page, text) {
  await editor(page).focus();
  await page.keyboard.press("Control+End");
  await page.keyboard.insertText(text);
  await page.locator(".tab.active .unsaved").waitFor();
}

// Saves what is unsaved, and waits until that is done.
async function save(page) {
  await page.keyboard.press("Control+s");
  await page.locator(".tab.active .unsaved").waitFor({ state: "detached" });
}

async function choose(page, label) {
  await page.getByRole("dialog").getByRole("button", { name: label, exact: true }).click();
  await page.getByRole("dialog").waitFor({ state: "detached" });
}

async function readAs(page, name) {
  await charset(page).selectOption(name);
  await choose(page, `Read as ${name}`);
  await charset(page).locator(`option:checked[value="${name}"]`).waitFor({ state: "attached" });
}

browserTest("in any charset, a letter typed and taken back leaves the bytes, and one that is kept adds its own", async (t) => {
  const all = samples();
  const session = await Session.start(t, Object.fromEntries(all.map(({ name, bytes }) => [`${name}.txt`, bytes])), {
    viewport: { width: 1280, height: 1600 }, // all files are in the tree
  });
  const { page } = session;
  for (const { name, bytes, text, letter, letterBytes } of all) {
    await t.test(name, async (t) => {
      await open(session, `${name}.txt`);
      if ((await shown(charset(page))) !== name) {
        t.diagnostic(`found to be ${await shown(charset(page))}`);
        await readAs(page, name);
      }
      assert.equal(await editor(page).locator(".cm-line").first().textContent(), text);
      await typeAtTheEnd(page, letter);
      await page.keyboard.press("Backspace");
      await save(page);
      assert.deepEqual(session.read(`${name}.txt`), bytes);
      await typeAtTheEnd(page, letter);
      await save(page);
      assert.deepEqual(session.read(`${name}.txt`), Buffer.concat([bytes, letterBytes]));
    });
  }
});
