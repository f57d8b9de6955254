// SPDX-License-Identifier: Apache-2.0
// The form of a text's file: line ends, byte-order mark, charset, and characters that it lacks.
import assert from "node:assert/strict";

import { clientOf } from "./client.mjs";
import { browserTest, Session } from "./harness.mjs";
import { charset, choose, editor, lineEnds, mark, open, readAs, save, shown, typeAtTheEnd } from "./text_page.mjs";

browserTest("mixed line ends stay as they are, line by line, and new lines end as most do", async (t) => {
  const session = await Session.start(t, { "mixed.txt": "a\r\nb\nc\r\nd\re\r\n" });
  const { page } = session;
  await open(session, "mixed.txt");
  assert.equal(await shown(lineEnds(page)), "Mixed");
  await typeAtTheEnd(page, "f");
  await page.keyboard.press("Enter");
  await save(page);
  assert.equal(session.read("mixed.txt").toString("latin1"), "a\r\nb\nc\r\nd\re\r\nf\r\n");
});

browserTest("lines that were joined and parted again by undo end as they did", async (t) => {
  const session = await Session.start(t, { "mixed.txt": "a\nb\rc\nd" });
  const { page } = session;
  await open(session, "mixed.txt");
  await editor(page).focus();
  await page.keyboard.press("Control+a");
  await page.keyboard.press("Delete");
  await page.keyboard.press("Control+z");
  await page.locator(".tab.active .unsaved").waitFor();
  await save(page);
  assert.equal(session.read("mixed.txt").toString("latin1"), "a\nb\rc\nd");
});

browserTest("other line ends that are chosen are those of all lines", async (t) => {
  const session = await Session.start(t, { "mixed.txt": "a\r\nb\nc\rd" });
  const { page } = session;
  await open(session, "mixed.txt");
  await lineEnds(page).selectOption({ label: "CRLF" });
  await save(page);
  assert.equal(session.read("mixed.txt").toString("latin1"), "a\r\nb\r\nc\r\nd");
});

browserTest("the byte-order mark of a text in GB18030 is kept", async (t) => {
  // "I can eat glass without harm to my body" and a poem, behind the mark.
  const bytes = Buffer.from(
    "84319533ced2c4dccdcccfc2b2a3c1a7b6f8b2bbc9cbc9edcce5a1a3b4ba" +
      "c3dfb2bbbef5cffea3acb4a6b4a6cec5cce4c4f1a1a3",
    "hex",
  );
  const session = await Session.start(t, { "a.txt": bytes });
  const { page } = session;
  await open(session, "a.txt");
  assert.equal(await shown(charset(page)), "GB18030");
  assert.equal(await mark(page).isChecked(), true);
  await typeAtTheEnd(page, "!");
  await save(page);
  assert.equal(session.read("a.txt").toString("hex"), `${bytes.toString("hex")}21`);
});

browserTest("a byte-order mark is told of, kept, taken away and given", async (t) => {
  const files = { "marked.txt": "\ufeffa\r\n", "bare.txt": "\u00e4\n", "wide.txt": Buffer.from("\ufeff\u0416\n", "utf16le") };
  const session = await Session.start(t, files);
  const { page } = session;
  await open(session, "marked.txt");
  assert.equal(await mark(page).isChecked(), true);
  await typeAtTheEnd(page, "b");
  await save(page);
  assert.equal(session.read("marked.txt").toString(), "\ufeffa\r\nb");
  await mark(page).uncheck();
  await save(page);
  assert.equal(session.read("marked.txt").toString(), "a\r\nb");
  await open(session, "bare.txt");
  assert.equal(await mark(page).isChecked(), false);
  await mark(page).check();
  await save(page);
  assert.equal(session.read("bare.txt").toString(), "\ufeff\u00e4\n");
  await open(session, "wide.txt");
  assert.equal(await shown(charset(page)), "UTF-16LE");
  await typeAtTheEnd(page, "\u0429");
  await save(page);
  assert.deepEqual(session.read("wide.txt"), Buffer.from("\ufeff\u0416\n\u0429", "utf16le"));
});

const GERMAN = Buffer.from("Die Stra\xdfe f\xfchrt \xfcber den Flu\xdf.\n", "latin1");

browserTest("characters that the charset lacks are marked, named before a save, and saved in UTF-8 if one likes", async (t) => {
  const session = await Session.start(t, { "german.txt": GERMAN });
  const { page } = session;
  await open(session, "german.txt");
  assert.equal(await shown(charset(page)), "windows-1252");
  await typeAtTheEnd(page, "z\u0142oty \u20ac \u{1f600}");
  assert.deepEqual(await page.locator(".lacking").allTextContents(), ["\u0142", "\u{1f600}"]);
  await page.keyboard.press("Control+s");
  await page.getByRole("dialog").getByText("windows-1252 lacks 2 of the text's characters: \u0142 \u{1f600}.").waitFor();
  await choose(page, "Cancel");
  assert.deepEqual(session.read("german.txt"), GERMAN);
  await page.keyboard.press("Control+s");
  await choose(page, "Show them");
  await page.getByText("Line 2, column 2").waitFor();
  await page.keyboard.press("Control+s");
  await choose(page, "Save in UTF-8");
  await page.locator(".tab.active .unsaved").waitFor({ state: "detached" });
  assert.equal(session.read("german.txt").toString(), "Die Stra\u00dfe f\u00fchrt \u00fcber den Flu\u00df.\nz\u0142oty \u20ac \u{1f600}");
  assert.equal(await shown(charset(page)), "UTF-8");
  assert.equal(await page.locator(".lacking").count(), 0);
});

browserTest("a text is read in another charset, and saved in a third one", async (t) => {
  const russian = Buffer.from("cfd0c8c2c5d2", "hex"); // in windows-1251
  const session = await Session.start(t, { "russian.txt": russian });
  const { page } = session;
  await open(session, "russian.txt");
  await readAs(page, "KOI8-R");
  await page.locator(".cm-editor.cm-focused").waitFor(); // to go on with the keyboard
  assert.equal(await editor(page).textContent(), "\u043e\u043f\u0445\u0431\u0435\u0440");
  await readAs(page, "windows-1251");
  assert.equal(await editor(page).textContent(), "\u041f\u0420\u0418\u0412\u0415\u0422");
  await charset(page).selectOption("IBM866");
  await choose(page, "Save in IBM866");
  await page.locator(".tab.active .unsaved").waitFor(); // once the table of IBM866 is loaded
  await save(page);
  assert.equal(session.read("russian.txt").toString("hex"), "8f9088828592");
});

browserTest("what is no text in the charset that is chosen can be seen, and not changed", async (t) => {
  const session = await Session.start(t, { "german.txt": GERMAN });
  const { page } = session;
  await open(session, "german.txt");
  await readAs(page, "UTF-8");
  await page.getByRole("alert").getByText("This file is no text in UTF-8").waitFor();
  await editor(page).focus();
  await page.keyboard.type("x");
  assert.equal(await page.locator(".tab.active .unsaved").count(), 0);
  await readAs(page, "windows-1252");
  assert.match(await editor(page).textContent(), /^Die Stra\u00dfe/);
});

browserTest("a marked file read in another charset shows the mark's bytes, and keeps them", async (t) => {
  const session = await Session.start(t, { "marked.txt": "\ufeff\u00e4\n" });
  const { page } = session;
  await open(session, "marked.txt");
  await readAs(page, "windows-1252");
  assert.equal(await editor(page).locator(".cm-line").first().textContent(), "\u00ef\u00bb\u00bf\u00c3\u00a4");
  await typeAtTheEnd(page, "\u00fc");
  await save(page);
  assert.equal(session.read("marked.txt").toString("latin1"), "\xef\xbb\xbf\xc3\xa4\n\xfc");
});

browserTest("a Japanese text with escape sequences is shown, and saved in UTF-8 after asking", async (t) => {
  const escaped = Buffer.from("\x1b$B$3$l$OF|K\\8l$N%F%-%9%H$G$9\x1b(B\n", "latin1");
  const session = await Session.start(t, { "mail.txt": escaped });
  const { page } = session;
  await open(session, "mail.txt");
  const text = "\u3053\u308c\u306f\u65e5\u672c\u8a9e\u306e\u30c6\u30ad\u30b9\u30c8\u3067\u3059";
  assert.equal(await editor(page).locator(".cm-line").first().textContent(), text);
  await typeAtTheEnd(page, "!");
  await page.keyboard.press("Control+s");
  await choose(page, "Cancel");
  assert.deepEqual(session.read("mail.txt"), escaped);
  await page.keyboard.press("Control+s");
  await choose(page, "Save in UTF-8");
  await page.locator(".tab.active .unsaved").waitFor({ state: "detached" });
  assert.equal(session.read("mail.txt").toString(), `${text}\n!`);
});

browserTest("other texts with escapes are shown, and saved in UTF-8 after asking", async (t) => {
  const files = { // as the host finds them, but for UTF-7, which is ASCII to all who are not told
    "HZ-GB-2312": ["~{VPND~} hz\n~{VPNDND1>~}\n", "\u4e2d\u6587 hz"],
    "ISO-2022-KR": ["\x1b$)C\x0eGQ19>n\x0f kr\n", "\ud55c\uad6d\uc5b4 kr"],
    "ISO-2022-CN": ["\x1b$)A\x0eVPND\x0f cn\n", "\u4e2d\u6587 cn"],
    "UTF-7": ["+Ti1lhw- utf7\n", "\u4e2d\u6587 utf7"],
  };
  const session = await Session.start(t, Object.fromEntries(Object.entries(files).map(([name, [bytes]]) => [`${name}.txt`, bytes])));
  const { page } = session;
  for (const [name, [, line]] of Object.entries(files)) {
    await open(session, `${name}.txt`);
    if (name === "UTF-7") {
      await charset(page).selectOption(name);
      assert.equal(await page.getByRole("dialog").getByRole("button", { name: "Save in" }).count(), 0);
      await choose(page, `Read as ${name}`);
    }
    await charset(page).locator(`option:checked[value="${name}"]`).waitFor({ state: "attached" });
    assert.equal(await editor(page).locator(".cm-line").first().textContent(), line);
    await typeAtTheEnd(page, "\u00e4!");
    await page.keyboard.press("Control+s");
    await choose(page, "Save in UTF-8");
    await page.locator(".tab.active .unsaved").waitFor({ state: "detached" });
    const saved = session.read(`${name}.txt`).toString();
    assert.ok(saved.startsWith(`${line}\n`) && saved.endsWith("\u00e4!"), saved);
  }
});

browserTest("what is unsaved survives a reload, with charset and line ends", async (t) => {
  const session = await Session.start(t, { "german.txt": Buffer.concat([GERMAN, Buffer.from("a\r\nb\rc\n")]) });
  const { page } = session;
  await open(session, "german.txt");
  await typeAtTheEnd(page, "\u00fc\n");
  await session.waitForDraft(page, "\u00fc");
  await page.reload();
  await editor(page).waitFor();
  await page.locator(".tab.active .unsaved").waitFor();
  assert.equal(await shown(charset(page)), "windows-1252");
  await save(page);
  assert.deepEqual(session.read("german.txt"), Buffer.concat([GERMAN, Buffer.from("a\r\nb\rc\n\xfc\n", "latin1")]));
});

browserTest("two texts are put together beside each other", async (t) => {
  const session = await Session.start(t, { "list.txt": "one\ntwo\nthree\n" });
  const { page } = session;
  await open(session, "list.txt");
  await typeAtTheEnd(page, "mine\n");
  const other = await clientOf(t, session);
  assert.equal(await other.write(session.path("list.txt"), "theirs\none\ntwo\nthree\n"), true);
  await page.keyboard.press("Control+s");
  const dialog = page.getByRole("dialog");
  await dialog.getByRole("button", { name: "Compare" }).click();
  await dialog.locator(".cm-merge-revert button").first().click();
  await dialog.getByRole("button", { name: "Save put together" }).click();
  await page.locator(".tab.active .unsaved").waitFor({ state: "detached" });
  assert.equal(session.read("list.txt").toString(), "theirs\none\ntwo\nthree\nmine\n");
});

browserTest("a charset whose table cannot be loaded is not the one that a text is saved in", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" }, { expectedProblems: [/ERR_FAILED/] });
  const { page } = session;
  await session.context.route("**/charsets/koi8-r.bin", (route) => route.abort());
  await open(session, "a.txt");
  await charset(page).selectOption("KOI8-R");
  await choose(page, "Save in KOI8-R");
  await page.getByRole("alert").getByText(/Failed to fetch|NetworkError/).waitFor();
  assert.equal(await shown(charset(page)), "UTF-8");
});

browserTest("a text is not edited before its unsaved changes are in it again", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" });
  const { page } = session;
  await open(session, "a.txt");
  await charset(page).selectOption("KOI8-R");
  await choose(page, "Save in KOI8-R");
  await typeAtTheEnd(page, "two");
  await session.waitForDraft(page, "two");
  let release;
  const released = new Promise((resolve) => (release = resolve));
  await session.context.route("**/charsets/koi8-r.bin", (route) => released.then(() => route.continue()));
  const asked = page.waitForRequest("**/charsets/koi8-r.bin");
  await page.reload();
  await asked;
  await page.waitForTimeout(300); // in which the text would be shown
  assert.equal(await editor(page).count(), 0);
  release();
  await editor(page).getByText("two").waitFor();
  assert.equal(await shown(charset(page)), "KOI8-R");
});

browserTest("a text that could not be shown does not take the place of a later one", async (t) => {
  const session = await Session.start(t, { "a.txt": "one\n" }, { expectedProblems: [/ERR_FAILED/] });
  const { page } = session;
  let fail;
  const failed = new Promise((resolve) => (fail = resolve));
  await session.context.route("**/charsets/koi8-r.bin", (route) => failed.then(() => route.abort()));
  await open(session, "a.txt");
  const asked = page.waitForRequest("**/charsets/koi8-r.bin");
  const other = await clientOf(t, session);
  // "Say more of these soft French loaves" in KOI8-R.
  const loaves = Buffer.from("d3ddc5dbd820d6c520c5ddc520dcd4c9c820cdd1c7cbc9c820c6d2c1cec3d5dad3cbc9c820c2d5cccfcb0a", "hex");
  await other.write(session.path("a.txt"), loaves.toString("latin1"), { encoding: "KOI8-R" });
  await asked;
  await other.write(session.path("a.txt"), "two\n");
  await editor(page).getByText("two").waitFor();
  const lost = page.waitForEvent("requestfailed");
  fail();
  await lost;
  await page.waitForTimeout(200); // in which the text would be taken away
  assert.match(await editor(page).innerText(), /two/);
});
