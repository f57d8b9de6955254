// SPDX-License-Identifier: Apache-2.0
// Saves that take long, that nobody answers, or that end with the program that was to make them.
import assert from "node:assert/strict";

import { MessageServer } from "../../serve/message_server.mjs";
import { temporaryFolder, waitFor } from "../../serve/processes.mjs";
import { browserTest, Session } from "./harness.mjs";
import { textIn, wordFiles } from "./office_files.mjs";
import { open as openPackage, tab } from "./package_page.mjs";
import { charset, editor, open, save, shown, typeAtTheEnd } from "./text_page.mjs";

const said = (page) => page.locator(".state .document");
const isSaved = (page) => page.locator(".tab.active .unsaved").waitFor({ state: "detached", timeout: 60_000 });

browserTest("a long save tells how far it is", async (t) => {
  const session = await Session.start(t, { "long.txt": Buffer.alloc(30_000_000, "lorem ipsum dolor sit amet\n") });
  const { page } = session;
  await open(session, "long.txt");
  await typeAtTheEnd(page, "!");
  await page.evaluate(() => {
    window.said = [];
    const line = document.querySelector(".state .document");
    new MutationObserver(() => window.said.push(line.textContent)).observe(line, { childList: true });
  });
  await save(page);
  await said(page).getByText(/Saved at/).waitFor();
  // The request is the text and a little, in JSON.
  const steps = (await page.evaluate(() => window.said)).filter((one) => /^Saving … [\d.]+ [KM]?B of 31 MB$/.test(one));
  assert.ok(new Set(steps).size > 1, JSON.stringify(await page.evaluate(() => window.said)));
  assert.equal(session.read("long.txt").at(-1), "!".charCodeAt(0));
});

// A page that has cancelled a save, which its host, stopped meanwhile, has yet to see.
async function cancelSave(t) {
  const session = await Session.start(t, { "a.txt": "one\n" });
  const { page, host } = session;
  await open(session, "a.txt");
  await typeAtTheEnd(page, "two");
  host.signal("SIGSTOP");
  await page.keyboard.press("Control+s");
  await page.getByRole("contentinfo").getByRole("button", { name: "Cancel" }).click();
  await said(page).getByText("Saving was cancelled; your text is kept.").waitFor();
  return session;
}

browserTest("a save that nobody answers can be cancelled, and made again", async (t) => {
  const session = await cancelSave(t);
  const { page, host } = session;
  assert.equal(await page.locator(".tab.active .unsaved").count(), 1);
  await typeAtTheEnd(page, " three");
  // The host may make the save that was cancelled. That is the page's own, and no conflict.
  host.signal("SIGCONT");
  await save(page);
  assert.equal(await page.getByRole("dialog").count(), 0);
  assert.equal(session.read("a.txt").toString(), "one\ntwo three");
});

browserTest("a save that was cancelled, and made all the same, is told of", async (t) => {
  const { page, host } = await cancelSave(t);
  host.signal("SIGCONT");
  await isSaved(page);
  await said(page).getByText(/Saved at/).waitFor();
});

browserTest("what is sent to be saved is stored as it is sent", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" });
  const { page, host } = session;
  await open(session, "a.txt");
  host.signal("SIGSTOP"); // with the answer, the draft is removed
  await page.evaluate(() => {
    // The time after which an edit is stored does not come.
    const { setTimeout } = window;
    window.setTimeout = (action, delay) => setTimeout(action, delay >= 250 ? 2 ** 30 : delay);
  });
  await typeAtTheEnd(page, "two");
  await page.keyboard.press("Control+s");
  await said(page).getByText(/Saving/).waitFor();
  await session.waitForDraft(page, "two");
  host.signal("SIGCONT");
  await isSaved(page);
});

// A page on a message server of its own, with a first worker, that has typed into a text.
async function begin(t) {
  const session = await Session.start(t, { "a.txt": "one\n" }, { expectedProblems: [/WebSocket|ERR_CONNECTION/] });
  const server = await MessageServer.start(t, temporaryFolder(t));
  const worker = await server.startWorker(session.folder);
  const address = new URL(session.host.page);
  address.hash = new URLSearchParams({ server: `ws://127.0.0.1:${server.webSocketPort}`, user: "ada", password: "secret" });
  const page = (session.page = await session.context.newPage());
  await page.goto(address.href);
  await session.waitUntilConnected();
  await open(session, "a.txt");
  await typeAtTheEnd(page, "two");
  return { session, page, server, worker };
}

browserTest("a save whose worker is killed is made by another one", async (t) => {
  const { session, page, server, worker } = await begin(t);
  worker.signal("SIGSTOP"); // it is given the save, and does not get to it
  await page.keyboard.press("Control+s");
  await said(page).getByText(/Saving/).waitFor();
  await worker.kill();
  await server.startWorker(session.folder);
  await isSaved(page);
  assert.equal(session.read("a.txt").toString(), "one\ntwo");
  await typeAtTheEnd(page, " three");
  await save(page);
  assert.equal(session.read("a.txt").toString(), "one\ntwo three");
});

browserTest("a save during which the server is killed is made when the server is back", async (t) => {
  const { session, page, server, worker } = await begin(t);
  worker.signal("SIGSTOP");
  await page.keyboard.press("Control+s");
  await said(page).getByText(/Saving/).waitFor();
  await server.kill();
  await page.getByText(/server cannot be reached/).first().waitFor();
  worker.signal("SIGCONT");
  await editor(page).focus();
  await page.keyboard.type(" three"); // belongs to the next save
  await server.run();
  await page.getByText("The connection is back.").waitFor();
  await said(page).getByText(/Saved at/).waitFor();
  assert.equal(await page.getByRole("dialog").count(), 0);
  assert.equal(session.read("a.txt").toString(), "one\ntwo");
  await save(page);
  assert.equal(session.read("a.txt").toString(), "one\ntwo three");
});

// The page asks for a save of `name`, and is closed before the host has made it. Then the host makes it, and another
// page is opened, which shows what the first one left. `answer` answers the question that a save asks, and
// `whileSaving` is done while it is under way, on the first page, whose draft then holds `kept`.
async function loseAnswer(session, name, kept, { answer, whileSaving } = {}) {
  const { page, host } = session;
  const before = session.read(name);
  host.signal("SIGSTOP");
  await page.keyboard.press("Control+s");
  await answer?.(page);
  await said(page).getByText(/Saving/).waitFor();
  await whileSaving?.(page);
  await session.waitForDraft(page, kept);
  await page.close();
  host.signal("SIGCONT");
  await waitFor("the save", () => !session.read(name).equals(before));
  session.page = await session.newPage();
  return session.page;
}

async function assertNobodyElse(page) {
  assert.equal(await page.locator(".mark.theirs").count(), 0);
  assert.equal(await page.getByText(/somebody else/).count(), 0);
}

browserTest("a save whose page is gone before the answer comes is found to be made", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" });
  await open(session, "a.txt");
  await typeAtTheEnd(session.page, "two");
  const page = await loseAnswer(session, "a.txt", "two");
  await isSaved(page);
  assert.equal(await editor(page).innerText(), "one\ntwo");
  await assertNobodyElse(page);
  await typeAtTheEnd(page, " three");
  await save(page);
  await assertNobodyElse(page);
  assert.equal(session.read("a.txt").toString(), "one\ntwo three");
  await page.reload();
  await editor(page).waitFor();
  assert.equal(await page.locator(".mark").count(), 0);
});

browserTest("what was typed while a save was under way whose page is gone is unsaved, and no conflict", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" });
  await open(session, "a.txt");
  await typeAtTheEnd(session.page, "two");
  const page = await loseAnswer(session, "a.txt", " three", { whileSaving: (saving) => typeAtTheEnd(saving, " three") });
  await page.getByText(/have been restored/).waitFor();
  assert.equal(session.read("a.txt").toString(), "one\ntwo");
  await assertNobodyElse(page);
  await save(page);
  assert.equal(session.read("a.txt").toString(), "one\ntwo three");
});

browserTest("a text that a page that is gone was saving as UTF-8 is found to be saved", async (t) => {
  const session = await Session.start(t, { "a.txt": Buffer.from("caf\xe9\r\n", "latin1") });
  await open(session, "a.txt");
  await typeAtTheEnd(session.page, "\u6e2f"); // which the file's charset lacks
  await session.waitForDraft(session.page, "\u6e2f");
  const toUtf8 = async (page) => {
    await page.waitForTimeout(500); // in which a draft is stored that does not have the answer yet
    await page.getByRole("dialog").getByRole("button", { name: /UTF-8/ }).click();
  };
  const page = await loseAnswer(session, "a.txt", "UTF-8", { answer: toUtf8 });
  await editor(page).waitFor(); // until when nothing is marked
  await isSaved(page);
  await assertNobodyElse(page);
  assert.equal(await shown(charset(page)), "UTF-8");
  assert.equal(session.read("a.txt").toString(), "caf\u00e9\r\n\u6e2f");
});

async function replaceAll(page, found, replacement) {
  await page.getByLabel("Find", { exact: true }).fill(found);
  await page.getByLabel("Replace with").fill(replacement);
  await page.getByRole("button", { name: "Replace all" }).click();
}

browserTest("an office document whose page is gone before the answer comes is found to be saved", async (t) => {
  const session = await openPackage(t, "report.docx", wordFiles());
  await replaceAll(session.page, "Annual report", "Budget");
  const page = await loseAnswer(session, "report.docx", "Budget");
  await page.locator(".package").waitFor();
  await isSaved(page);
  await assertNobodyElse(page);

  await replaceAll(page, "Budget", "Plan");
  const other = await loseAnswer(session, "report.docx", "Proposal", { whileSaving: (saving) => replaceAll(saving, "Plan", "Proposal") });
  await other.getByText(/have been restored/).waitFor();
  assert.match(textIn(session.read("report.docx"), "word/header1.xml"), /Plan, page/);
  await assertNobodyElse(other);
  await other.keyboard.press("Control+s");
  await isSaved(other);
  assert.equal(await other.getByRole("dialog").count(), 0);
  assert.match(textIn(session.read("report.docx"), "word/header1.xml"), /Proposal, page/);
});

browserTest("what was undone in an office document while a save was under way whose page is gone is undone", async (t) => {
  const session = await openPackage(t, "report.docx", wordFiles());
  await replaceAll(session.page, "Annual report", "Budget");
  const undo = async (page) => {
    await page.getByRole("button", { name: "Undo" }).click();
    await tab(page, "Properties").click();
    await page.getByLabel("Title").fill("Another title");
  };
  const page = await loseAnswer(session, "report.docx", "Another title", { whileSaving: undo });
  await page.getByText(/have been restored/).waitFor();
  const header = () => textIn(session.read("report.docx"), "word/header1.xml");
  assert.match(header(), /Budget, page/);
  await assertNobodyElse(page);
  await page.getByText("Annual report, page").first().waitFor();
  await page.keyboard.press("Control+s");
  await isSaved(page);
  assert.equal(await page.getByRole("dialog").count(), 0);
  assert.match(header(), /Annual report, page/);
  assert.match(textIn(session.read("report.docx"), "docProps/core.xml"), /Another title/);
});
