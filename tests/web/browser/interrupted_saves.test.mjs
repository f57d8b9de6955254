// SPDX-License-Identifier: Apache-2.0
// Saves that take long, that nobody answers, or that end with the program that was to make them.
import assert from "node:assert/strict";

import { MessageServer } from "../../serve/message_server.mjs";
import { temporaryFolder } from "../../serve/processes.mjs";
import { browserTest, Session } from "./harness.mjs";
import { editor, open, save, typeAtTheEnd } from "./text_page.mjs";

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

browserTest("a save that nobody answers can be cancelled, and made again", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" });
  const { page, host } = session;
  await open(session, "a.txt");
  await typeAtTheEnd(page, "two");
  host.signal("SIGSTOP");
  await page.keyboard.press("Control+s");
  await page.getByRole("contentinfo").getByRole("button", { name: "Cancel" }).click();
  await said(page).getByText("Saving was cancelled; your text is kept.").waitFor();
  assert.equal(await page.locator(".tab.active .unsaved").count(), 1);
  await typeAtTheEnd(page, " three");
  // The host may make the save that was cancelled. That is the page's own, and no conflict.
  host.signal("SIGCONT");
  await save(page);
  assert.equal(await page.getByRole("dialog").count(), 0);
  assert.equal(session.read("a.txt").toString(), "one\ntwo three");
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
