// SPDX-License-Identifier: Apache-2.0
// Images that are documents of their own: shown, and never changed.
import assert from "node:assert/strict";
import { statSync } from "node:fs";

import { faults } from "./accessibility.mjs";
import { clientOf } from "./client.mjs";
import { browserTest, Session } from "./harness.mjs";
import { photograph, png } from "./office_files.mjs";
import { save, typeAtTheEnd } from "./text_page.mjs";

const image = (page, name) => page.locator(".panel:not([hidden])").getByRole("img", { name });
const row = (page, name) => page.locator(".tree .row").getByText(name, { exact: true });
const widthOf = (one) => one.evaluate(async (shown) => (await shown.decode(), shown.naturalWidth));

browserTest("an image is shown, follows what others save, and a save leaves it as it is", async (t) => {
  const before = photograph(300, 200);
  const session = await Session.start(t, { "photo.png": before, "later.txt": "one\n" });
  const { page } = session;
  await row(page, "photo.png").click();
  assert.equal(await widthOf(image(page, "photo.png")), 300);
  assert.deepEqual(await faults(page), []);
  const { ino } = statSync(session.path("photo.png")); // of which a save makes another one
  await page.keyboard.press("Control+s");
  await row(page, "later.txt").click();
  await typeAtTheEnd(page, "two");
  await save(page); // before which the host would have made the other save
  assert.deepEqual([session.read("later.txt").toString(), statSync(session.path("photo.png")).ino], ["one\ntwo", ino]);
  assert.ok(session.read("photo.png").equals(before));
  await row(page, "photo.png").click();
  const other = await clientOf(t, session);
  await other.write(session.path("photo.png"), png(40, 10, [0, 0, 200]).toString("latin1"), { encoding: "ISO-8859-1" });
  await page.getByText(/saved by somebody else/).waitFor();
  assert.equal(await widthOf(image(page, "photo.png")), 40);
});

browserTest("an image that is damaged is told of", async (t) => {
  const session = await Session.start(t, { "photo.jpg": "no image" });
  const { page } = session;
  await row(page, "photo.jpg").click();
  await page.getByRole("alert").getByText("photo.jpg cannot be shown as an image.").waitFor();
});
