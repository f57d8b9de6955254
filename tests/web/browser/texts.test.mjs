// SPDX-License-Identifier: Apache-2.0
// Texts: opened, edited and saved in any charset, with every byte that was not touched as it was.
import assert from "node:assert/strict";

import { browserTest, Session } from "./harness.mjs";
import { samples } from "./samples.mjs";
import { charset, editor, open, readAs, save, shown, typeAtTheEnd } from "./text_page.mjs";

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
