// SPDX-License-Identifier: Apache-2.0
// The page around the documents: connection, tabs, links, languages, colours, small windows, screen readers.
import assert from "node:assert/strict";

import { waitFor } from "../../serve/processes.mjs";
import { faults } from "./accessibility.mjs";
import { browserTest, lackedByFirefox, Session } from "./harness.mjs";

const row = (page, name) => page.locator(".tree .row", { has: page.getByText(name, { exact: true }) });
const tab = (page, name) => page.getByRole("tab", { name });

async function open(page, name) {
  await row(page, name).click();
  await page.locator(".panel:not([hidden]) .cm-content").waitFor();
}

// The address of the page with another word in its fragment.
function withSetting(address, key, value) {
  const url = new URL(address);
  const settings = new URLSearchParams(url.hash.slice(1));
  settings.set(key, value);
  url.hash = settings;
  return url.href;
}

browserTest("a wrong password is told of, and another can be typed", async (t) => {
  const session = await Session.start(t, {}, { expectedProblems: [/WebSocket/] });
  const page = await session.context.newPage();
  await page.goto(withSetting(session.host.page, "password", "wrong"));
  await page.getByRole("alert").getByText(/does not accept this user or password/).waitFor();
  assert.deepEqual(await faults(page), []);
  const password = new URLSearchParams(new URL(session.host.page).hash.slice(1)).get("password");
  await page.getByLabel("Password").fill(password);
  await page.keyboard.press("Enter");
  await session.waitUntilConnected(page);
});

browserTest("a server that cannot be reached is told of", async (t) => {
  const session = await Session.start(t, {}, { expectedProblems: [/WebSocket/] });
  const page = await session.context.newPage();
  await page.goto(withSetting(session.host.page, "server", "ws://127.0.0.1:9"));
  await page.getByText(/ws:\/\/127\.0\.0\.1:9 cannot be reached/).waitFor();
});

browserTest("a host that does not answer is told of, and the reading can be cancelled", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" });
  const { page, host } = session;
  await row(page, "a.txt").waitFor();
  host.signal("SIGSTOP");
  await row(page, "a.txt").click();
  await page.getByText(/There is no answer yet/).waitFor();
  await page.getByRole("main").getByRole("button", { name: "Cancel" }).click();
  await page.getByText("Reading was cancelled.").waitFor();
  host.signal("SIGCONT");
  await page.getByRole("button", { name: "Try again" }).click();
  await page.locator(".cm-editor.cm-focused").waitFor(); // to go on with the keyboard
});

browserTest("tabs are gone through, and closed, by the keyboard", async (t) => {
  const { page } = await Session.start(t, { "a.txt": "one\n", "b.txt": "two\n", "c.txt": "three\n" });
  for (const name of ["a.txt", "b.txt", "c.txt"]) {
    await open(page, name);
  }
  await tab(page, "c.txt").focus();
  await page.keyboard.press("ArrowRight");
  assert.equal(await page.title(), "a.txt - Documents");
  await page.keyboard.press("End");
  await page.keyboard.press("ArrowLeft");
  assert.equal(await tab(page, "b.txt").getAttribute("aria-selected"), "true");
  await page.keyboard.press("Delete");
  await tab(page, "b.txt").waitFor({ state: "detached" });
  assert.equal(await page.getByRole("tab").count(), 2);
  assert.equal(await page.getByRole("tabpanel").count(), 1);
});

browserTest("a document that is opened in the tree can be typed into at once", async (t) => {
  const { page } = await Session.start(t, { "a.txt": "one\n" });
  const text = page.locator(".panel:not([hidden]) .cm-content");
  await open(page, "a.txt");
  await page.locator(".cm-editor.cm-focused").waitFor();
  await page.keyboard.type("zero ");
  assert.match(await text.innerText(), /^zero one/);
});

browserTest("the tab of the document that is shown is in sight, however many there are", async (t) => {
  const names = Array.from({ length: 15 }, (_, index) => `document number ${index}.txt`);
  const session = await Session.start(t, Object.fromEntries(names.map((name) => [name, name])));
  const { page } = session;
  const isInSight = async (name) => {
    const [all, one] = [await page.locator(".tabs").boundingBox(), await tab(page, name).boundingBox()];
    return one.x >= all.x && one.x + one.width <= all.x + all.width;
  };
  for (const name of names) {
    await open(page, name);
    await waitFor(`the tab of ${name}`, () => isInSight(name));
  }
  assert.equal(await isInSight(names[0]), false);
  await page.locator(".panel:not([hidden]) .cm-content").press("x"); // which marks its tab
  await tab(page, names.at(-1)).locator(".mark.unsaved").waitFor();
  assert.equal(await isInSight(names.at(-1)), true);
});

browserTest("a document with unsaved changes is closed only after asking", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" });
  const { page } = session;
  await open(page, "a.txt");
  await page.locator(".cm-content").click();
  await page.keyboard.type("x");
  await tab(page, "a.txt").locator(".mark.unsaved").waitFor();
  await tab(page, "a.txt").focus();
  await page.keyboard.press("Delete");
  await page.getByRole("dialog").waitFor();
  await page.keyboard.press("Escape");
  assert.equal(await tab(page, "a.txt").count(), 1);
  await tab(page, "a.txt").focus();
  await page.keyboard.press("Delete");
  await page.getByRole("dialog").getByRole("button", { name: "Discard changes" }).click();
  await tab(page, "a.txt").waitFor({ state: "detached" });
  assert.equal(session.read("a.txt").toString(), "one\n");
  await open(page, "a.txt");
  assert.equal((await page.locator(".cm-content").innerText()).trim(), "one");
});

browserTest("a link leads to its document, and does not hold the password", async (t) => {
  const session = await Session.start(t, { "caf\u00e9 +&#.txt": "one\n" });
  const { page } = session;
  await open(page, "caf\u00e9 +&#.txt");
  const address = await page.evaluate(() => location.href);
  assert.doesNotMatch(address, /password/);
  const other = await session.context.newPage();
  await other.goto(address);
  // A window of its own is asked for the password, and for nothing else.
  const password = new URLSearchParams(new URL(session.host.page).hash.slice(1)).get("password");
  await other.getByLabel("Password").fill(password);
  await other.keyboard.press("Enter");
  await tab(other, "caf\u00e9 +&#.txt").waitFor();
});

browserTest("the page speaks the browser's language, or the one that is chosen", async (t) => {
  const { page } = await Session.start(t, { "a.txt": "one\n" }, { locale: "de-AT" });
  await page.getByRole("button", { name: "Speichern" }).waitFor();
  assert.equal(await page.locator("html").getAttribute("lang"), "de");
  await page.getByLabel("Sprache").selectOption("en");
  await page.getByRole("button", { name: "Save" }).waitFor();
  assert.equal(await page.locator("html").getAttribute("lang"), "en");
});

browserTest("the colours are the system's, or those that are chosen", { skip: lackedByFirefox("choice of the system's colours") }, async (t) => {
  const { page } = await Session.start(t, {}, { colorScheme: "dark" });
  const shown = (theme) => page.locator(`html[data-theme="${theme}"]`).waitFor({ state: "attached" });
  await shown("dark");
  await page.emulateMedia({ colorScheme: "light" });
  await shown("light");
  await page.getByLabel("Colours").selectOption("dark");
  await shown("dark");
  await page.reload();
  await shown("dark");
});

browserTest("at a width of 360 pixels everything is in reach", async (t) => {
  const { page } = await Session.start(t, { "a.txt": "one\n" }, { viewport: { width: 360, height: 640 } });
  await open(page, "a.txt"); // the files are shown while nothing is open
  assert.equal(await page.locator(".files").isVisible(), false);
  const toggle = page.getByRole("button", { name: "Show or hide the files" });
  await toggle.click();
  assert.equal(await page.locator(".files").isVisible(), true);
  await toggle.click();
  assert.equal(await page.locator(".files").isVisible(), false);
  for (const name of ["Save", "Versions", "Copy link"]) {
    const box = await page.getByRole("button", { name, exact: true }).boundingBox();
    assert.ok(box.x >= 0 && box.x + box.width <= 360, `${name}: ${JSON.stringify(box)}`);
  }
  assert.equal(await page.evaluate(() => document.documentElement.scrollWidth), 360);
});

for (const colorScheme of ["light", "dark"]) {
  browserTest(`axe finds nothing in the ${colorScheme} page`, async (t) => {
    const { page } = await Session.start(t, { "a.txt": "one\n", "b/c.txt": "" }, { colorScheme });
    await row(page, "a.txt").waitFor();
    assert.deepEqual(await faults(page), []);
    await open(page, "a.txt");
    await page.locator(".cm-content").click();
    await page.keyboard.type("x");
    await tab(page, "a.txt").locator(".mark.unsaved").waitFor();
    assert.deepEqual(await faults(page), []);
    await tab(page, "a.txt").focus();
    await page.keyboard.press("Delete");
    await page.getByRole("dialog").waitFor();
    assert.deepEqual(await faults(page), []);
    await page.keyboard.press("Escape");
    await page.getByRole("button", { name: "Versions" }).click();
    await page.getByRole("dialog").waitFor();
    assert.deepEqual(await faults(page), []);
  });
}

browserTest("the first view comes soon", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" });
  const page = await session.context.newPage();
  await page.goto(session.host.page);
  await row(page, "a.txt").waitFor();
  const paint = await page.evaluate(() => performance.getEntriesByName("first-contentful-paint")[0].startTime);
  t.diagnostic(`first contentful paint after ${paint.toFixed(0)} ms`);
  assert.ok(paint > 0);
});
