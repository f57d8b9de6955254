// SPDX-License-Identifier: Apache-2.0
// What the tests of office documents do on the page.
import { waitFor } from "../../serve/processes.mjs";
import { Session } from "./harness.mjs";
import { archive } from "./office_files.mjs";

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
