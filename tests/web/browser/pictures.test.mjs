// SPDX-License-Identifier: Apache-2.0
// Pictures of the page, for docs/pictures/: EDITOR_PICTURES=docs/pictures ctest --preset release -R web.browser.pictures
// Without that they are made in a scratch folder, which still finds a view that cannot be shown.
import assert from "node:assert/strict";
import { mkdirSync, readFileSync, readdirSync, statSync } from "node:fs";
import { join, resolve } from "node:path";

import { ROOT, temporaryFolder, waitFor } from "../../serve/processes.mjs";
import { clientOf } from "./client.mjs";
import { browserTest, Session } from "./harness.mjs";

const EXAMPLES = join(ROOT, "examples");
const files = Object.fromEntries(
  readdirSync(EXAMPLES, { withFileTypes: true })
    .filter((entry) => entry.isFile() && !entry.name.endsWith(".py"))
    .map(({ name }) => [name, readFileSync(join(EXAMPLES, name))]),
);

function folderFor(t) {
  const folder = process.env.EDITOR_PICTURES ? resolve(ROOT, process.env.EDITOR_PICTURES) : temporaryFolder(t);
  mkdirSync(folder, { recursive: true });
  return folder;
}

async function take(page, folder, name) {
  const path = join(folder, `${name}.png`);
  await page.screenshot({ path });
  assert.ok(statSync(path).size > 5_000, name);
}

const row = (page, name) => page.locator(".tree .row", { has: page.getByText(name, { exact: true }) });
const size = { viewport: { width: 1200, height: 720 } };

for (const colorScheme of ["light", "dark"]) {
  browserTest(`the ${colorScheme} page has its picture`, async (t) => {
    const { page } = await Session.start(t, files, { ...size, colorScheme });
    await row(page, "letter-home.windows-1251.txt").click();
    await page.locator(".cm-content").waitFor();
    await take(page, folderFor(t), `text-${colorScheme}`);
    await row(page, "report.docx").click();
    await page.locator(".panel:not([hidden]) .waiting").waitFor({ state: "detached" });
    await page.frameLocator("iframe[title=Preview]").locator("section").first().waitFor();
    await take(page, folderFor(t), `package-${colorScheme}`);
  });
}

browserTest("the small page has its picture", async (t) => {
  const { page } = await Session.start(t, files, { viewport: { width: 360, height: 640 } });
  await row(page, "market-list.utf-8.txt").click();
  await page.locator(".cm-content").waitFor();
  await take(page, folderFor(t), "small");
});

browserTest("conflict and versions have their pictures", async (t) => {
  const session = await Session.start(t, files, size);
  const { page } = session;
  const folder = folderFor(t);
  const path = session.path("market-list.utf-8.txt");
  await row(page, "market-list.utf-8.txt").click();
  await page.locator(".cm-content").click();
  await page.keyboard.press("Control+Home");
  await page.keyboard.type("Wednesdays, too\n");
  const other = await clientOf(t, session);
  const { data } = await other.read(path, "text/plain");
  assert.equal(await other.write(path, `${data}Bring your own bag.\n`), true);
  await page.locator(".mark.theirs").waitFor();
  await page.keyboard.press("Control+s");
  await page.getByRole("dialog").getByRole("button", { name: "Compare" }).click();
  await page.getByRole("dialog").locator(".cm-content").first().waitFor();
  await take(page, folder, "conflict");
  await page.getByRole("dialog").getByRole("button", { name: "Save put together" }).click();
  await page.waitForFunction(() => document.querySelector(".mark") === null);
  await waitFor("the copies", async () => (await other.versions(path)).length === 2);
  await page.getByRole("button", { name: "Versions" }).click();
  await page.getByRole("dialog").getByRole("radio").first().waitFor();
  await take(page, folder, "versions");
});
