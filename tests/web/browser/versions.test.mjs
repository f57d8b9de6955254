// SPDX-License-Identifier: Apache-2.0
// Earlier versions of a document.
import assert from "node:assert/strict";

import { waitFor } from "../../serve/processes.mjs";
import { clientOf } from "./client.mjs";
import { browserTest, Session } from "./harness.mjs";
import { textIn, wordFiles } from "./office_files.mjs";
import { open as openPackage, save as savePackage } from "./package_page.mjs";

const text = (page) => page.locator(".panel:not([hidden]) .cm-content");
const dialog = (page) => page.getByRole("dialog");

// A text that was saved twice, open in a page that shows its versions.
async function start(t) {
  const session = await Session.start(t, { "a.txt": "one\n" });
  const client = await clientOf(t, session);
  const file = session.path("a.txt");
  for (const content of ["two\n", "three\n"]) {
    assert.equal(await client.write(file, content), true);
  }
  await waitFor("the copies", async () => (await client.versions(file)).length === 2);
  const { page } = session;
  await page.locator(".tree .row", { hasText: "a.txt" }).click();
  await text(page).waitFor();
  await page.getByRole("button", { name: "Versions" }).click();
  await dialog(page).getByRole("radio").first().waitFor();
  return { session, page };
}

browserTest("earlier versions are listed, the newest first, and one is restored", async (t) => {
  const { session, page } = await start(t);
  assert.equal(await dialog(page).getByRole("radio").count(), 2);
  await dialog(page).getByRole("radio").last().check();
  await dialog(page).getByRole("button", { name: "Restore" }).click();
  await waitFor("the text", async () => (await text(page).innerText()).trim() === "one");
  assert.equal(session.read("a.txt").toString(), "one\n");
  assert.equal(await page.locator(".mark").count(), 0);
});

browserTest("an earlier version is compared with what is there, and nothing changes by that", async (t) => {
  const { session, page } = await start(t);
  await dialog(page).getByRole("button", { name: "Compare" }).click();
  await dialog(page).locator(".cm-content").first().waitFor();
  const shown = (await dialog(page).locator(".cm-content").allInnerTexts()).join("\n");
  assert.match(shown, /two/);
  assert.match(shown, /three/);
  await dialog(page).getByRole("button", { name: "Back" }).click();
  await dialog(page).getByRole("button", { name: "Close" }).click();
  assert.equal((await text(page).innerText()).trim(), "three");
  assert.equal(session.read("a.txt").toString(), "three\n");
});

browserTest("Ctrl+S beside a comparison with an earlier version does not save the document behind it", async (t) => {
  const { session, page } = await start(t);
  await page.keyboard.press("Escape");
  await dialog(page).waitFor({ state: "detached" });
  await text(page).focus();
  await page.keyboard.insertText("unsaved ");
  await page.locator(".mark.unsaved").waitFor();
  await page.getByRole("button", { name: "Versions" }).click();
  await dialog(page).getByRole("button", { name: "Compare" }).click();
  await dialog(page).locator(".cm-content").last().click();
  await page.keyboard.press("Control+s");
  await page.waitForTimeout(300);
  assert.equal(session.read("a.txt").toString(), "three\n");
  await page.locator(".mark.unsaved").waitFor();
});

browserTest("an earlier version is shown in its own charset", async (t) => {
  const session = await Session.start(t, { "a.txt": Buffer.from("caf\xe9\n", "latin1") });
  const { page } = session;
  const client = await clientOf(t, session);
  const file = session.path("a.txt");
  assert.equal(await client.write(file, "caf\xc3\xa9 \xe6\xb8\xaf\n"), true); // in UTF-8, with U+6E2F
  await waitFor("the copy", async () => (await client.versions(file)).length === 1);
  await page.locator(".tree .row", { hasText: "a.txt" }).click();
  await text(page).waitFor();
  await page.getByRole("button", { name: "Versions" }).click();
  await dialog(page).getByRole("button", { name: "Compare" }).click();
  const shown = dialog(page).locator(".cm-content");
  await shown.first().waitFor();
  assert.deepEqual((await shown.allInnerTexts()).map((one) => one.trim()), ["caf\u00e9", "caf\u00e9 \u6e2f"]);
});

browserTest("a document without earlier versions says so", async (t) => {
  const { page } = await Session.start(t, { "a.txt": "one\n" });
  await page.locator(".tree .row", { hasText: "a.txt" }).click();
  await text(page).waitFor();
  await page.getByRole("button", { name: "Versions" }).click();
  await dialog(page).getByText("There are none.").waitFor();
});

browserTest("what is taken over from an earlier version of an office document is unsaved, and outlives a reload", async (t) => {
  const name = "report.docx";
  const session = await openPackage(t, name, wordFiles());
  const { page } = session;
  await page.getByLabel("Find", { exact: true }).fill("Annual report");
  await page.getByLabel("Replace with").fill("Budget");
  await page.getByRole("button", { name: "Replace all" }).click();
  await savePackage(session, name);
  await page.locator(".mark.unsaved").waitFor({ state: "detached" });
  const client = await clientOf(t, session);
  await waitFor("the copy", async () => (await client.versions(session.path(name))).length === 1);
  await page.getByRole("button", { name: "Versions" }).click();
  await dialog(page).getByRole("button", { name: "Compare" }).click();
  await dialog(page).getByLabel("/word/header1.xml: which one to keep").selectOption("theirs");
  await dialog(page).getByLabel("/word/document.xml: which one to keep").selectOption("mine");
  await dialog(page).getByRole("button", { name: "Take over the result" }).click();
  await session.waitForDraft(page, "Annual report, page");
  await page.reload();
  await page.getByText(/have been restored/).waitFor();
  const saved = await savePackage(session, name);
  assert.match(textIn(saved, "word/header1.xml"), /Annual report, page/);
  assert.match(textIn(saved, "word/document.xml"), /The Budget</);
});
