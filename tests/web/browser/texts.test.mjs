// SPDX-License-Identifier: Apache-2.0
// Texts: opened, edited and saved in any charset, with every byte that was not touched as it was.
import assert from "node:assert/strict";

import { clientOf } from "./client.mjs";
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

browserTest("what is looked for in a text is there still when somebody else saves, to be typed on", async (t) => {
  const session = await Session.start(t, { "a.txt": "one foo\ntwo foo\n" });
  const { page } = session;
  const other = await clientOf(t, session);
  const theirs = async (content) => {
    await other.write(session.path("a.txt"), content);
    await editor(page).getByText(content.trim()).waitFor();
  };
  const field = (name) => page.locator(`.cm-search [name="${name}"]`).first();
  await open(session, "a.txt");
  await editor(page).click();
  await page.keyboard.press("Control+f");
  await field("re").check();
  await field("search").focus();
  await page.keyboard.type("fo+");
  await theirs("three foo\n");
  await page.keyboard.type("(o)");
  assert.equal(await field("search").inputValue(), "fo+(o)");
  assert.equal(await field("re").isChecked(), true);
  await field("replace").focus();
  await page.keyboard.type("b");
  await theirs("four foo\n");
  await page.keyboard.type("ar");
  await field("replaceAll").click();
  await editor(page).getByText("four bar").waitFor();
  await page.keyboard.press("Control+s");
  await page.locator(".mark").waitFor({ state: "detached" });
  await editor(page).focus();
  await theirs("five\n");
  await page.keyboard.press("Control+End");
  await page.keyboard.insertText("typed");
  assert.match(await editor(page).innerText(), /typed/);
  assert.equal(await field("search").inputValue(), "fo+(o)");
});

browserTest("lines of scripts that run from right to left begin on the right, and the arrow keys follow them", async (t) => {
  const hebrew = "\u05e9\u05dc\u05d5\u05dd \u05e2\u05d5\u05dc\u05dd";
  const session = await Session.start(t, { "a.txt": `${hebrew}\nhello\n(${hebrew})` });
  const { page } = session;
  await open(session, "a.txt");
  const directions = () =>
    editor(page).locator(".cm-line").evaluateAll((lines) => lines.map((line) => getComputedStyle(line).direction));
  assert.deepEqual(await directions(), ["rtl", "ltr", "rtl"]);
  await editor(page).focus();
  await page.keyboard.press("Control+End");
  await page.keyboard.press("Home");
  await page.keyboard.press("ArrowLeft"); // on, and not to the line before
  await page.keyboard.insertText("\u05d0");
  await page.keyboard.press("Control+End");
  await page.keyboard.insertText(`\n${hebrew}`);
  await page.locator(".tab.active .unsaved").waitFor();
  assert.deepEqual(await directions(), ["rtl", "ltr", "rtl", "rtl"]);
  await save(page);
  assert.equal(session.read("a.txt").toString(), `${hebrew}\nhello\n(\u05d0${hebrew})\n${hebrew}`);
});
