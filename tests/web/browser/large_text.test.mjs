// SPDX-License-Identifier: Apache-2.0
// Large texts and long lines. How long things take is told, not tested.
import assert from "node:assert/strict";

import { browserTest, Session } from "./harness.mjs";
import { editor, open, save, typeAtTheEnd } from "./text_page.mjs";

const KEYS = 200;

// Types `count` letters where the cursor is. How long each took from the key to the picture, sorted, in ms.
// The browser counts in steps of 8 ms and tells of nothing below 16.
async function typingTimes(page, count) {
  await page.evaluate(() => {
    window.slowKeys = [];
    const observer = new PerformanceObserver((list) => {
      window.slowKeys.push(...list.getEntries().filter(({ name }) => name === "keydown").map(({ duration }) => duration));
    });
    observer.observe({ type: "event", durationThreshold: 16 });
  });
  for (let left = count; left > 0; --left) {
    await page.keyboard.press("x");
  }
  await page.waitForTimeout(500);
  const slow = await page.evaluate(() => window.slowKeys);
  return [...Array(Math.max(0, count - slow.length)).fill(16), ...slow].sort((a, b) => a - b);
}

const inShort = (times) => `50 %: ${times[Math.floor(times.length / 2)]} ms, 99 %: ${times[Math.floor(times.length * 0.99)]} ms`;

browserTest("a text of 50 MB is opened, edited and saved", async (t) => {
  const line = "Falsches \xdcben von Xylophonmusik qu\xe4lt jeden gr\xf6\xdferen Zwerg.\r\n";
  const lines = Math.ceil(50_000_000 / line.length);
  const bytes = Buffer.alloc(lines * line.length, line, "latin1");
  const session = await Session.start(t, { "large.txt": bytes });
  const { page } = session;
  page.setDefaultTimeout(120_000);
  const begin = performance.now();
  await open(session, "large.txt");
  t.diagnostic(`opened in ${Math.round(performance.now() - begin)} ms`);
  await editor(page).focus();
  await page.keyboard.press("Control+End");
  await page.getByText(`Line ${(lines + 1).toLocaleString("en")}, column 1`).waitFor();
  t.diagnostic(`typing: ${inShort(await typingTimes(page, KEYS))}`);
  const saving = performance.now();
  await save(page);
  t.diagnostic(`saved in ${Math.round(performance.now() - saving)} ms`);
  assert.ok(session.read("large.txt").equals(Buffer.concat([bytes, Buffer.alloc(KEYS, "x")])));
});

browserTest("a line of 5 MB is shown, edited and saved", async (t) => {
  const bytes = Buffer.alloc(5_000_000, "lorem ipsum ");
  const session = await Session.start(t, { "line.txt": bytes });
  const { page } = session;
  page.setDefaultTimeout(120_000);
  await open(session, "line.txt");
  await typeAtTheEnd(page, "!");
  t.diagnostic(`typing: ${inShort(await typingTimes(page, KEYS))}`);
  await save(page);
  assert.ok(session.read("line.txt").equals(Buffer.concat([bytes, Buffer.from("!"), Buffer.alloc(KEYS, "x")])));
});
