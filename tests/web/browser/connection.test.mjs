// SPDX-License-Identifier: Apache-2.0
// The page and its connection to the host.
import assert from "node:assert/strict";

import { Host, waitFor } from "../../serve/processes.mjs";
import { browserTest, Session } from "./harness.mjs";
import { editor, open, save, typeAtTheEnd } from "./text_page.mjs";

// Enters another address of the page, as a person does; that does not load the page again.
const enter = (page, address) => page.evaluate((hash) => (location.hash = hash), new URL(address).hash);

browserTest("the page connects with what its address says, and takes the password out of it", async (t) => {
  const { host, page } = await Session.start(t);
  assert.match(host.page, /password=/);
  const address = await page.evaluate(() => location.href);
  assert.doesNotMatch(address, /password/);
});

browserTest("the address of a host that was started again is followed, with what is unsaved", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" }, { expectedProblems: [/WebSocket|ERR_CONNECTION/] });
  const { page, host } = session;
  await open(session, "a.txt");
  await typeAtTheEnd(page, "two");
  await host.kill();
  await page.getByText(/server cannot be reached/).first().waitFor();
  const again = await Host.start(t, ["--listen", new URL(host.page).host, "--root", session.folder]);
  await enter(page, again.page);
  await session.waitUntilConnected();
  assert.doesNotMatch(await page.evaluate(() => location.href), /password/);
  await editor(page).getByText("two").waitFor();
  await save(page);
  assert.equal(session.read("a.txt").toString(), "one\ntwo");
  // What becomes of the new connection is told.
  await again.kill();
  await waitFor("the loss", () => page.locator('[data-state="lost"]').count());
});

browserTest("a save that is under way goes on when the address of another host is entered", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" }, { expectedProblems: [/WebSocket|ERR_CONNECTION/] });
  const { page, host } = session;
  await open(session, "a.txt");
  await typeAtTheEnd(page, "two");
  host.signal("SIGSTOP"); // before it could answer
  await page.keyboard.press("Control+s");
  await page.locator(".state .document").getByText(/Saving/).waitFor();
  await host.kill();
  const again = await Host.start(t, ["--listen", new URL(host.page).host, "--root", session.folder]);
  await enter(page, again.page);
  await page.locator(".state .document").getByText(/Saved at/).waitFor();
  assert.equal(session.read("a.txt").toString(), "one\ntwo");
});

browserTest("a link that is entered in the place of the page's address shows its document", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n", "b.txt": "other\n" });
  const { page } = session;
  await open(session, "a.txt");
  const link = new URL(await page.evaluate(() => location.href));
  link.hash = link.hash.replace("a.txt", "b.txt");
  await enter(page, link.href);
  await editor(page).getByText("other").waitFor();
  assert.equal(await page.locator(".tab").count(), 2);
});
