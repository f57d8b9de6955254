// SPDX-License-Identifier: Apache-2.0
// Closing documents: nothing that was typed goes with a tab unless a person has said so.
import assert from "node:assert/strict";

import { browserTest, Session } from "./harness.mjs";
import { choose, editor, open, typeAtTheEnd } from "./text_page.mjs";

const said = (page) => page.locator(".state .document");
const tab = (page, name) => page.getByRole("tab", { name });
const close = (page, name) => page.locator(".tab", { hasText: name }).getByTitle(`Close ${name}`).click();

// A page that has been asked to save `name` before its tab is closed, on a host that does not answer.
async function beginToClose(t, files, name) {
  const session = await Session.start(t, files);
  const { page, host } = session;
  await open(session, name);
  await typeAtTheEnd(page, "two");
  host.signal("SIGSTOP");
  await close(page, name);
  await choose(page, "Save");
  await said(page).getByText(/Saving/).waitFor();
  return session;
}

browserTest("a document in which more is typed while it is saved to be closed stays open", async (t) => {
  const session = await beginToClose(t, { "a.txt": "one\n" }, "a.txt");
  const { page, host } = session;
  await editor(page).focus();
  await page.keyboard.type(" three");
  host.signal("SIGCONT");
  await said(page).getByText(/Saved at/).waitFor();
  await page.waitForTimeout(100); // time for it to be closed
  assert.match(await editor(page).innerText(), /two three/);
  await tab(page, "a.txt").locator(".mark.unsaved").waitFor();
  assert.equal(session.read("a.txt").toString(), "one\ntwo");
});

browserTest("a document that is closed twice while it is being saved takes no other one with it", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n", "b.txt": "other\n" });
  const { page, host } = session;
  await open(session, "a.txt");
  await typeAtTheEnd(page, "two");
  await page.locator(".tree .row").getByText("b.txt", { exact: true }).click();
  await editor(page).getByText("other").waitFor();
  await tab(page, "a.txt").click();
  host.signal("SIGSTOP");
  for (let count = 0; count < 2; ++count) {
    await close(page, "a.txt");
    await choose(page, "Save");
  }
  host.signal("SIGCONT");
  await tab(page, "a.txt").waitFor({ state: "detached" });
  await page.waitForTimeout(100); // time for another one to be closed
  assert.equal(await tab(page, "b.txt").count(), 1);
  assert.equal(session.read("a.txt").toString(), "one\ntwo");
});

browserTest("what is discarded while it is being saved does not come back", async (t) => {
  const session = await beginToClose(t, { "a.txt": "one\n" }, "a.txt");
  const { page, host } = session;
  await close(page, "a.txt");
  await choose(page, "Discard changes");
  await tab(page, "a.txt").waitFor({ state: "detached" });
  await page.waitForTimeout(2000); // in which a draft would be stored
  host.signal("SIGCONT");
  await page.reload();
  await session.waitUntilConnected();
  await page.locator(".tree .row").getByText("a.txt", { exact: true }).waitFor();
  assert.equal(await tab(page, "a.txt").count(), 0);
});

browserTest("unsaved changes of a document that is still being read are not closed without asking", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" });
  const { page, host } = session;
  await open(session, "a.txt");
  await typeAtTheEnd(page, "two");
  await session.waitForDraft(page, "two");
  let isHeld = true;
  await page.route("**/chunks/text-*.js", async (route) => {
    while (isHeld) {
      await new Promise((resume) => setTimeout(resume, 50));
    }
    await route.continue();
  });
  await page.reload();
  await session.waitUntilConnected();
  await page.getByText("Reading a.txt").waitFor();
  await close(page, "a.txt");
  await page.getByRole("dialog").getByText("Close a.txt?").waitFor();
  await choose(page, "Cancel");
  isHeld = false;
  await editor(page).getByText("two").waitFor();
});
