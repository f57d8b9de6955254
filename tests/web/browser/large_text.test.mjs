// SPDX-License-Identifier: Apache-2.0
// Large texts and long lines. How long things take is told. What is tested is that no key costs a look at the whole
// text, which takes the page's thread far longer than a key may, on any machine.
import assert from "node:assert/strict";

import { IS_LONG } from "../../serve/processes.mjs";
import { browserTest, Session } from "./harness.mjs";
import { editor, open, save, typeAtTheEnd } from "./text_page.mjs";

const KEYS = 200;
const MOST = 250; // ms of the page's thread that a key may take

// Types `count` letters where the cursor is. How long each took, sorted, in ms: `work` is what the page's thread
// did for it up to the picture, which does not depend on what else the machine does, and `wait` what a person waited.
async function typingTimes(page, count) {
  const debug = await page.context().newCDPSession(page);
  await debug.send("Performance.enable", { timeDomain: "threadTicks" });
  const workSoFar = async () => {
    const { metrics } = await debug.send("Performance.getMetrics");
    return 1000 * metrics.find(({ name }) => name === "TaskDuration").value;
  };
  await page.evaluate(() => {
    window.waits = [];
    document.addEventListener("keydown", ({ timeStamp }) => {
      requestAnimationFrame(() => setTimeout(() => window.waits.push(performance.now() - timeStamp)));
    }, true);
  });
  const work = [];
  let before = await workSoFar();
  for (let key = 1; key <= count; ++key) {
    await page.keyboard.press("x");
    await page.waitForFunction((expected) => window.waits.length === expected, key);
    const after = await workSoFar();
    work.push(after - before);
    before = after;
  }
  await debug.detach();
  const sorted = (times) => [...times].sort((a, b) => a - b);
  return { work: sorted(work), wait: sorted(await page.evaluate(() => window.waits)) };
}

const share = (times, part) => times[Math.floor(times.length * part)];

async function testTyping(t, page, count = KEYS) {
  const times = await typingTimes(page, count);
  for (const [name, some] of Object.entries(times)) {
    t.diagnostic(`typing, ${name}: 50 %: ${share(some, 0.5).toFixed(1)} ms, 99 %: ${share(some, 0.99).toFixed(1)} ms`);
  }
  assert.ok(share(times.work, 0.99) <= MOST, `${share(times.work, 0.99)} ms`);
}

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
  await testTyping(t, page);
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
  await testTyping(t, page);
  await save(page);
  assert.ok(session.read("line.txt").equals(Buffer.concat([bytes, Buffer.from("!"), Buffer.alloc(KEYS, "x")])));
});

browserTest("a text of 300 MB is opened, edited and saved", { skip: !IS_LONG && "it takes minutes, and 6 GB of memory" }, async (t) => {
  const line = "Falsches \xdcben von Xylophonmusik qu\xe4lt jeden gr\xf6\xdferen Zwerg.\r\n";
  const bytes = Buffer.alloc(Math.ceil(300_000_000 / line.length) * line.length, line, "latin1");
  const session = await Session.start(t, { "huge.txt": bytes });
  const { page } = session;
  page.setDefaultTimeout(300_000);
  const begin = performance.now();
  await open(session, "huge.txt");
  t.diagnostic(`opened in ${Math.round(performance.now() - begin)} ms`);
  await typeAtTheEnd(page, "!");
  await testTyping(t, page, 50);
  const saving = performance.now();
  await save(page);
  t.diagnostic(`saved in ${Math.round(performance.now() - saving)} ms`);
  assert.ok(session.read("huge.txt").equals(Buffer.concat([bytes, Buffer.from("!"), Buffer.alloc(50, "x")])));
});
