// SPDX-License-Identifier: Apache-2.0
// What is unsaved of an office document, and what becomes of it when somebody else has saved.
import assert from "node:assert/strict";
import { unlinkSync } from "node:fs";

import { waitFor } from "../../serve/processes.mjs";
import { clientOf } from "./client.mjs";
import { browserTest } from "./harness.mjs";
import { archive, png, relationships, textIn, unpack, wordFiles, wordPicture, workbookFiles } from "./office_files.mjs";
import { assertSameBut, open, save, tab } from "./package_page.mjs";

const NAME = "report.docx";
const dialog = (page) => page.getByRole("dialog");
const choiceOf = (page, part) => dialog(page).getByLabel(`${part}: which one to keep`);

// Replaces a text everywhere in the document.
async function replace(page, found, replacement) {
  await tab(page, "Text").click();
  await page.getByLabel("Find", { exact: true }).fill(found);
  await page.getByLabel("Replace with").fill(replacement);
  await page.getByRole("button", { name: "Replace all" }).click();
  await page.getByText("0 found").or(page.getByText("Nothing found")).waitFor();
}

browserTest("the outline marks what is unsaved, until it is saved", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const { page } = session;
  await replace(page, "Annual report", "Budget");
  await tab(page, "Parts").click();
  const marked = page.locator(".package-tree .package-changed");
  assert.equal(await marked.count(), 2);
  await save(session, NAME);
  await marked.first().waitFor({ state: "detached" });
  await page.getByRole("button", { name: "Undo" }).click();
  await marked.first().waitFor();
  await save(session, NAME);
  await marked.first().waitFor({ state: "detached" });
});

// The page has changed the header and the main part; somebody else saves the main part, the image and a title.
async function conflict(t) {
  const session = await open(t, NAME, wordFiles());
  await replace(session.page, "Annual report", "Budget");
  await saveTheirs(t, session);
  return { session, page: await askConflict(session) };
}

async function askConflict({ page }) {
  await page.locator(".mark.theirs").waitFor();
  await page.keyboard.press("Control+s");
  await dialog(page).getByText("somebody else has saved").waitFor();
  return page;
}

async function saveTheirs(t, session) {
  const other = await clientOf(t, session);
  const path = session.path(NAME);
  const document = await other.read(path, "text/xml");
  const changed = (uri, change) => {
    const part = document.parts.find(({ partUri }) => partUri === uri);
    assert.notEqual(change(part.content), part.content, uri);
    part.content = change(part.content);
  };
  changed("/word/document.xml", (xml) => xml.replace("</w:body>", "<w:p><w:r><w:t>Theirs at the end</w:t></w:r></w:p></w:body>"));
  changed("/docProps/core.xml", (xml) => xml.replace(/<dc:title>.*?<\/dc:title>/, "<dc:title>Their title</dc:title>"));
  changed("/word/media/image1.png", () => `data:image/png;base64,${Buffer.from(png(40, 10, [0, 0, 200])).toString("base64")}`);
  assert.equal(await other.write(path, document), true);
}

// The page is gone, and another one shows what it left.
async function reopen(session, whileGone) {
  await session.page.close();
  await whileGone?.();
  session.page = await session.newPage();
  await session.page.locator(".package").waitFor();
  return session.page;
}

// What drafts were made from, as the page of the browser has it stored: their ids. With `forgets`, it is removed.
function storedOriginals(page, forgets = false) {
  return page.evaluate(async (forgets) => {
    const result = (request) => new Promise((resolve) => (request.onsuccess = () => resolve(request.result)));
    const database = await result(indexedDB.open("editor originals"));
    const store = database.transaction("originals", "readwrite").objectStore("originals");
    const ids = await result(store.getAllKeys());
    if (forgets) {
      await result(store.clear());
    }
    database.close();
    return ids;
  }, forgets);
}

const isSaved = (page) => page.waitForFunction(() => document.querySelector(".mark") === null);

browserTest("two editions of a document are compared part by part, and put together", async (t) => {
  const { session, page } = await conflict(t);
  await dialog(page).getByRole("button", { name: "Compare" }).click();
  // What only they have changed is theirs, and what only I have changed is mine, before anything is chosen.
  assert.equal(await choiceOf(page, "/word/header1.xml").inputValue(), "mine");
  assert.equal(await choiceOf(page, "/docProps/core.xml").inputValue(), "theirs");
  assert.equal(await choiceOf(page, "/word/media/image1.png").inputValue(), "theirs");
  await dialog(page).getByRole("button", { name: "/word/media/image1.png" }).click();
  await dialog(page).getByRole("img", { name: "/word/media/image1.png: The other version" }).waitFor();
  // The part that both have changed: their last paragraph is brought over into mine.
  await dialog(page).getByRole("button", { name: "/word/document.xml" }).click();
  await dialog(page).locator(".cm-mergeView").hover();
  await page.mouse.wheel(0, 10_000);
  await dialog(page).locator(".cm-mergeView").getByText("Theirs at the end").waitFor();
  const arrows = await dialog(page).getByRole("button", { name: "Take this change over from the other version" }).all();
  const heights = await Promise.all(arrows.map(async (arrow) => (await arrow.boundingBox()).y));
  await arrows[heights.indexOf(Math.max(...heights))].click();
  assert.equal(await choiceOf(page, "/word/document.xml").inputValue(), "together");
  await dialog(page).getByRole("button", { name: "Save put together" }).click();
  await isSaved(page);
  const saved = session.read(NAME);
  const putTogether = /^<\?xml[^>]*>\r\n<w:document.*The Budget<.*Theirs at the end<[^\n]*$/;
  assert.match(textIn(saved, "word/document.xml"), putTogether);
  assert.match(textIn(saved, "word/header1.xml"), /Budget/);
  assert.match(textIn(saved, "docProps/core.xml"), /Their title/);
  assert.ok(Buffer.from(unpack(saved)["word/media/image1.png"]).equals(png(40, 10, [0, 0, 200])));
  // Undo takes back what was changed here, and not what was put together.
  await page.getByRole("button", { name: "Undo" }).click();
  const undone = await save(session, NAME);
  assert.match(textIn(undone, "word/document.xml"), putTogether);
  assert.match(textIn(undone, "word/header1.xml"), /Annual report/);
});

browserTest("a picture that is taken over from the other version comes with it", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const { page } = session;
  await page.setViewportSize({ width: 1280, height: 3000 }); // in which all arrows are seen
  await replace(page, "Annual report", "Budget");
  const files = wordFiles(wordPicture("rId5"), { "word/media/image2.png": png(40, 10, [0, 0, 200]) });
  files["word/_rels/document.xml.rels"] = files["word/_rels/document.xml.rels"].replace(/(<Relationship Id="rId1"[^>]*)\/>/, (one) => one + one.replace("rId1", "rId5").replace("image1", "image2"));
  session.write(NAME, archive(files));
  await page.keyboard.press("Control+s");
  await dialog(page).getByRole("button", { name: "Compare" }).click();
  await dialog(page).getByRole("button", { name: "/word/document.xml" }).click();
  const arrows = dialog(page).getByRole("button", { name: "Take this change over from the other version" });
  await arrows.nth(1).waitFor();
  const heights = await Promise.all((await arrows.all()).map(async (arrow) => (await arrow.boundingBox()).y));
  await arrows.nth(heights.indexOf(Math.max(...heights))).click();
  await dialog(page).getByRole("button", { name: "Save put together" }).click();
  await isSaved(page);
  const saved = session.read(NAME);
  assert.match(textIn(saved, "word/document.xml"), /The Budget<.*"rId5"/);
  assert.match(textIn(saved, "word/_rels/document.xml.rels"), /<Relationship [^>]*(Id="rId5"[^>]*image2\.png|image2\.png[^>]*Id="rId5")/);
  assert.ok(Buffer.from(unpack(saved)["word/media/image2.png"]).equals(png(40, 10, [0, 0, 200])));
});

browserTest("a picture that somebody else has removed stays with the text of mine that shows it", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const { page } = session;
  const before = session.read(NAME);
  await replace(page, "Annual report", "Budget");
  const files = wordFiles();
  delete files["word/media/image1.png"];
  files["word/document.xml"] = files["word/document.xml"].replace(wordPicture("rId1"), "");
  files["word/_rels/document.xml.rels"] = files["word/_rels/document.xml.rels"].replace(/<Relationship Id="rId1"[^>]*>/, "");
  session.write(NAME, archive(files));
  await page.keyboard.press("Control+s");
  await dialog(page).getByRole("button", { name: "Compare" }).click();
  await dialog(page).getByRole("button", { name: "Save put together" }).click();
  await isSaved(page);
  assertSameBut(["word/document.xml", "word/header1.xml"], before, session.read(NAME));
});

browserTest("undo after two editions were put together takes back what was changed here, and nothing else", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const { page } = session;
  const before = session.read(NAME);
  await tab(page, "Parts").click();
  await page.getByRole("treeitem", { name: /^header1.xml/ }).click();
  await page.locator(".package-pane .cm-content").click();
  await page.keyboard.press("Control+End");
  await page.keyboard.type("<!-- mine -->");
  await saveTheirs(t, session);
  await askConflict(session);
  await dialog(page).getByRole("button", { name: "Compare" }).click();
  await dialog(page).getByRole("button", { name: "Save put together" }).click();
  await isSaved(page);
  assert.match(textIn(session.read(NAME), "word/header1.xml"), /mine/);
  await page.getByRole("button", { name: "Undo" }).click();
  const saved = await save(session, NAME);
  assert.equal(textIn(saved, "word/header1.xml"), textIn(before, "word/header1.xml"));
  assert.match(textIn(saved, "docProps/core.xml"), /Their title/);
  assert.match(textIn(saved, "word/document.xml"), /Theirs at the end/);
});

// A workbook whose cells show `texts`, which is what theirs adds a row to.
function bookOf(...texts) {
  const files = workbookFiles();
  const inside = (name, tag, xml) => (files[name] = files[name].replace(new RegExp(`(<${tag}[^>]*>).*(</${tag}>)`, "s"), `$1${xml}$2`));
  inside("xl/sharedStrings.xml", "sst", texts.map((text) => `<si><t>${text}</t></si>`).join(""));
  const cell = (_, index) => `<row r="${index + 1}"><c r="A${index + 1}" t="s"><v>${index}</v></c><c r="B${index + 1}"><v>${texts.length - index}</v></c></row>`;
  inside("xl/worksheets/sheet1.xml", "sheetData", texts.map(cell).join(""));
  return files;
}

// What a spreadsheet program shows.
function cellsOf(book) {
  const texts = [...textIn(book, "xl/sharedStrings.xml").matchAll(/<si><t>(.*?)<\/t>/g)].map(([, text]) => text);
  const cells = textIn(book, "xl/worksheets/sheet1.xml").matchAll(/<v>(\d+)<\/v><\/c><c[^>]*><v>(\d+)/g);
  return [...cells].map(([, index, value]) => `${texts[index]} ${value}`);
}

browserTest("two editions of a workbook are put together without mixing up their texts, and undo does not mix them either", async (t) => {
  const name = "book.xlsx";
  const session = await open(t, name, bookOf("Rent", "Food"));
  const { page } = session;
  const mine = ["Housing 2", "Food 1"];
  const theirs = ["Advance 3", "Rent 2", "Food 1"];
  await replace(page, "Rent", "Housing");
  const putTogether = async (choose) => {
    session.write(name, archive({ ...bookOf("Advance", "Rent", "Food"), "docProps/core.xml": wordFiles()["docProps/core.xml"].replace("Old", "Their") }));
    await page.keyboard.press("Control+s");
    await dialog(page).getByRole("button", { name: "Compare" }).click();
    await dialog(page).getByText("are taken from the same version").waitFor();
    await choose?.();
    await dialog(page).getByRole("button", { name: "Save put together" }).click();
    await isSaved(page);
    assert.match(textIn(session.read(name), "docProps/core.xml"), /Their title/);
    return cellsOf(session.read(name));
  };
  assert.deepEqual(await putTogether(), mine);
  assert.equal(await page.getByRole("button", { name: "Undo" }).isDisabled(), false);
  await replace(page, "Housing", "Home");
  const chooseTheirs = async () => {
    await choiceOf(page, "/xl/sharedStrings.xml").selectOption("theirs");
    assert.equal(await choiceOf(page, "/xl/worksheets/sheet1.xml").inputValue(), "theirs");
    assert.equal(await choiceOf(page, "/xl/worksheets/sheet1.xml").locator("option").count(), 2);
  };
  assert.deepEqual(await putTogether(chooseTheirs), theirs);
  assert.equal(await page.getByRole("button", { name: "Undo" }).isDisabled(), true);
});

browserTest("relationships that only somebody else has changed are kept when two editions are put together", async (t) => {
  const { "docProps/core.xml": core, ...files } = wordFiles();
  files["_rels/.rels"] = relationships(["rId1", "officeDocument", "word/document.xml"]);
  const session = await open(t, NAME, files);
  const { page } = session;
  await replace(page, "Annual report", "Budget");
  const theirs = await session.newPage(`&file=${encodeURIComponent(session.path(NAME))}`);
  await tab(theirs, "Properties").click();
  await theirs.getByLabel("Title").fill("Their title");
  await save({ page: theirs, read: (name) => session.read(name) }, NAME);
  await page.locator(".mark.theirs").waitFor();
  await page.keyboard.press("Control+s");
  await dialog(page).getByRole("button", { name: "Compare" }).click();
  await dialog(page).getByRole("button", { name: "Save put together" }).click();
  await isSaved(page);
  const saved = session.read(NAME);
  assert.match(textIn(saved, "word/header1.xml"), /Budget/);
  assert.match(textIn(saved, "docProps/core.xml"), /Their title/);
  assert.match(textIn(saved, "_rels/.rels"), /core\.xml/);
});

browserTest("of two editions of a document, mine can be kept", async (t) => {
  const { session, page } = await conflict(t);
  await dialog(page).getByRole("button", { name: "Keep mine" }).click();
  await isSaved(page);
  const saved = session.read(NAME);
  assert.match(textIn(saved, "word/document.xml"), /The Budget</);
  assert.doesNotMatch(textIn(saved, "word/document.xml"), /Theirs/);
  assert.doesNotMatch(textIn(saved, "docProps/core.xml"), /Their title/);
});

browserTest("mine that is kept after a reload is the whole of it", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const before = session.read(NAME);
  await replace(session.page, "Annual report", "Budget");
  await session.waitForDraft(session.page, "Budget");
  await reopen(session, () => saveTheirs(t, session));
  const page = await askConflict(session);
  await dialog(page).getByRole("button", { name: "Compare" }).click();
  assert.equal(await choiceOf(page, "/word/header1.xml").inputValue(), "mine");
  assert.equal(await choiceOf(page, "/docProps/core.xml").inputValue(), "theirs");
  await dialog(page).getByRole("button", { name: "Back" }).click();
  await dialog(page).getByRole("button", { name: "Keep mine" }).click();
  await isSaved(page);
  assertSameBut(["word/document.xml", "word/header1.xml"], before, session.read(NAME));
  assert.match(textIn(session.read(NAME), "word/document.xml"), /The Budget</);
});

browserTest("mine that was to be kept, by a save that was not made, is the whole of it after a reload", async (t) => {
  const { session, page } = await conflict(t);
  await page.evaluate(() => {
    const { send } = WebSocket.prototype;
    WebSocket.prototype.send = function (data) {
      const text = typeof data === "string" ? data : new TextDecoder("latin1").decode(data);
      return text.includes("writeRequest") ? undefined : send.call(this, data);
    };
  });
  await dialog(page).getByRole("button", { name: "Keep mine" }).click();
  await page.getByText(/Saving/).waitFor();
  await session.waitForDraft(page, "sent");
  const restored = await reopen(session);
  await restored.getByText(/have been restored/).waitFor();
  await restored.keyboard.press("Control+s");
  await isSaved(restored);
  const saved = session.read(NAME);
  assert.match(textIn(saved, "word/document.xml"), /The Budget</);
  assert.doesNotMatch(textIn(saved, "docProps/core.xml"), /Their title/);
});

browserTest("what changes are made from is stored once, and not after they are saved", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const { page } = session;
  await replace(page, "Annual report", "Budget");
  await session.waitForDraft(page, "Budget");
  const [id, ...others] = await storedOriginals(page);
  assert.ok(id && others.length === 0);
  await replace(page, "Budget", "Plan");
  await session.waitForDraft(page, "Plan");
  assert.deepEqual(await storedOriginals(page), [id]);
  const restored = await reopen(session);
  const own = await storedOriginals(restored);
  assert.equal(own.length, 1);
  await replace(restored, "Plan", "Outlook");
  await session.waitForDraft(restored, "Outlook");
  assert.deepEqual(await storedOriginals(restored), own);
  await save(session, NAME);
  await isSaved(restored);
  assert.deepEqual(await storedOriginals(restored), []);
});

browserTest("where only changed parts could be restored, that is told, and a save asks first", async (t) => {
  const session = await open(t, NAME, wordFiles());
  await replace(session.page, "Annual report", "Budget");
  await session.waitForDraft(session.page, "Budget");
  assert.equal((await storedOriginals(session.page, true)).length, 1);
  const page = await reopen(session, () => saveTheirs(t, session));
  const theirs = session.read(NAME);
  await page.getByRole("alert").getByText(/only the parts that you have changed could be restored/).waitFor();
  await page.keyboard.press("Control+s");
  await dialog(page).getByText(/the document may be damaged: .*\/word\/document.xml/).waitFor();
  await dialog(page).getByRole("button", { name: "Do not save" }).click();
  await dialog(page).waitFor({ state: "detached" });
  assert.ok(session.read(NAME).equals(theirs));
  await page.keyboard.press("Control+s");
  await dialog(page).getByRole("button", { name: "Save anyway" }).click();
  await dialog(page).getByRole("button", { name: "Take theirs" }).click();
  await isSaved(page);
});

browserTest("of two editions of a document, theirs can be taken", async (t) => {
  const { session, page } = await conflict(t);
  const theirs = session.read(NAME);
  await dialog(page).getByRole("button", { name: "Take theirs" }).click();
  await isSaved(page);
  assert.ok(session.read(NAME).equals(theirs));
  await page.getByLabel("Find", { exact: true }).fill("Theirs at the end");
  await page.getByText("1 found").waitFor();
});

browserTest("a comparison that is left changes nothing", async (t) => {
  const { session, page } = await conflict(t);
  const theirs = session.read(NAME);
  await dialog(page).getByRole("button", { name: "Compare" }).click();
  await dialog(page).getByRole("button", { name: "/word/document.xml" }).click();
  await dialog(page).locator(".cm-mergeView").waitFor();
  await choiceOf(page, "/word/document.xml").selectOption("theirs");
  await dialog(page).getByRole("button", { name: "Back" }).click();
  await dialog(page).getByRole("button", { name: "Go on comparing" }).click();
  assert.equal(await choiceOf(page, "/word/document.xml").inputValue(), "theirs");
  await dialog(page).locator(".cm-mergeView").waitFor();
  await dialog(page).getByRole("button", { name: "Back" }).click();
  await dialog(page).getByRole("button", { name: "Leave it" }).click();
  await dialog(page).getByRole("button", { name: "Decide later" }).click();
  await page.locator(".mark.unsaved").waitFor();
  assert.equal(await page.locator(".cm-mergeView").count(), 0);
  assert.ok(session.read(NAME).equals(theirs));
});

browserTest("a document that was removed is saved as new after a reload, with all its parts", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const before = session.read(NAME);
  await replace(session.page, "Annual report", "Budget");
  await session.waitForDraft(session.page, "Budget");
  const page = await reopen(session, () => unlinkSync(session.path(NAME)));
  await page.keyboard.press("Control+s");
  await dialog(page).getByRole("button", { name: "Save as new" }).click();
  await isSaved(page);
  assertSameBut(["word/document.xml", "word/header1.xml"], before, session.read(NAME));
});

// The document was removed, and only its changed parts are left.
async function loseParts(t) {
  const session = await open(t, NAME, wordFiles());
  await replace(session.page, "Annual report", "Budget");
  await session.waitForDraft(session.page, "Budget");
  await storedOriginals(session.page, true);
  const page = await reopen(session, () => unlinkSync(session.path(NAME)));
  await page.getByRole("alert").getByText(/has been removed.* only the parts that you have changed are left/).waitFor();
  return { session, page };
}

browserTest("of a document that was removed, the changed parts alone are saved only after saying so", async (t) => {
  const { session, page } = await loseParts(t);
  await page.keyboard.press("Control+s");
  await dialog(page).getByText(/Office programs will not open/).waitFor();
  await dialog(page).getByRole("button", { name: "Do not save" }).click();
  await dialog(page).waitFor({ state: "detached" });
  assert.throws(() => session.read(NAME), { code: "ENOENT" });
  await page.keyboard.press("Control+s"); // it is asked until it is answered
  await dialog(page).getByRole("button", { name: "Save these parts" }).click();
  await isSaved(page);
  const parts = Object.keys(unpack(session.read(NAME))).filter((name) => /^word\/[^_]/.test(name));
  assert.deepEqual(parts.sort(), ["word/document.xml", "word/header1.xml"]);
});

browserTest("the changed parts alone do not replace the document that is back again", async (t) => {
  const { session, page } = await loseParts(t);
  session.write(NAME, archive(wordFiles()));
  const before = session.read(NAME);
  await page.keyboard.press("Control+s");
  await dialog(page).getByRole("button", { name: "Save these parts" }).click();
  await dialog(page).getByText("somebody else has saved").waitFor();
  assert.ok(session.read(NAME).equals(before));
  await dialog(page).getByRole("button", { name: "Compare" }).click();
  await dialog(page).getByRole("button", { name: "Save put together" }).click();
  await isSaved(page);
  assertSameBut(["word/document.xml", "word/header1.xml"], before, session.read(NAME));
  assert.match(textIn(session.read(NAME), "word/document.xml"), /The Budget</);
});

browserTest("of a document that was removed while it is shown, all parts are saved as new", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const { page } = session;
  const before = Object.keys(unpack(session.read(NAME))).sort();
  await replace(page, "Annual report", "Budget");
  unlinkSync(session.path(NAME));
  await page.keyboard.press("Control+s");
  await dialog(page).getByRole("button", { name: "Save as new" }).click();
  await isSaved(page);
  assert.deepEqual(Object.keys(unpack(session.read(NAME))).sort(), before);
});

browserTest("a document that somebody has damaged is saved over after asking, with all its parts", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const { page } = session;
  const before = session.read(NAME);
  await replace(page, "Annual report", "Budget");
  session.write(NAME, before.subarray(0, 500));
  await page.keyboard.press("Control+s");
  await dialog(page).getByText("cannot be read at the moment").waitFor();
  await dialog(page).getByRole("button", { name: "Decide later" }).click();
  await dialog(page).waitFor({ state: "detached" });
  assert.equal(session.read(NAME).length, 500);
  await page.keyboard.press("Control+s");
  await dialog(page).getByRole("button", { name: "Save over it" }).click();
  await isSaved(page);
  assert.deepEqual(Object.keys(unpack(session.read(NAME))).sort(), Object.keys(unpack(before)).sort());
  assert.match(textIn(session.read(NAME), "word/header1.xml"), /Budget, page/);
});

browserTest("a document that can be read again is not saved over", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const { page } = session;
  await replace(page, "Annual report", "Budget");
  const theirs = archive(wordFiles(wordPicture("rId1")));
  session.write(NAME, theirs.subarray(0, 500));
  await page.keyboard.press("Control+s");
  await dialog(page).getByText("cannot be read at the moment").waitFor();
  session.write(NAME, theirs);
  await page.keyboard.press("Enter"); // "Try again"
  await dialog(page).getByText("somebody else has saved").waitFor();
  assert.ok(session.read(NAME).equals(theirs));
});

browserTest("the changed parts alone do not replace a document that could not be read for a moment", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const before = session.read(NAME);
  await replace(session.page, "Annual report", "Budget");
  await session.waitForDraft(session.page, "Budget");
  await storedOriginals(session.page, true);
  await session.page.evaluate(() => localStorage.setItem("busy", "yes"));
  // Then reading it fails, though it is the same as ever: another file is asked for.
  await session.context.addInitScript(() => {
    const { send } = WebSocket.prototype;
    WebSocket.prototype.send = function (data) {
      const text = typeof data === "string" ? data : new TextDecoder("latin1").decode(data);
      const isRead = localStorage.getItem("busy") && text.includes("readRequest");
      return send.call(this, isRead ? new TextEncoder().encode(text.replace("report.docx", "absent.docx")) : data);
    };
  });
  const page = await reopen(session);
  await page.getByRole("alert").getByText(/could not be read, and only the parts that you have changed are left/).waitFor();
  await page.evaluate(() => localStorage.removeItem("busy"));
  await page.keyboard.press("Control+s");
  await dialog(page).getByRole("button", { name: "Save these parts" }).click();
  await dialog(page).getByText("somebody else has saved").waitFor();
  assert.ok(session.read(NAME).equals(before));
});

browserTest("unsaved changes to a document that cannot be read any more are there after a reload, and can be saved over it", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const { page } = session;
  const before = session.read(NAME);
  await replace(page, "Annual report", "Precious");
  await session.waitForDraft(page, "Precious");
  session.write(NAME, "\u00d0\u00cf\u0011\u00e0 encrypted");
  await page.reload();
  await page.getByText(/report.docx cannot be read: /).waitFor();
  await page.getByLabel("Find", { exact: true }).fill("Precious");
  await page.getByText("2 found").waitFor();
  await page.keyboard.press("Control+s");
  await dialog(page).getByText("cannot be read at the moment").waitFor();
  await dialog(page).getByRole("button", { name: "Save over it" }).click();
  await isSaved(page);
  const saved = session.read(NAME);
  assert.deepEqual(Object.keys(unpack(saved)).sort(), Object.keys(unpack(before)).sort());
  assert.match(textIn(saved, "word/header1.xml"), /Precious/);
});

browserTest("unsaved changes are shown also where they are based on what cannot be read", async (t) => {
  const session = await open(t, NAME, wordFiles());
  const { page, host } = session;
  await replace(page, "Annual report", "Budget");
  const broken = session.read(NAME).subarray(0, 500);
  session.write(NAME, broken);
  await page.keyboard.press("Control+s");
  await dialog(page).getByText("cannot be read at the moment").waitFor();
  const version = await (await clientOf(t, session)).version(session.path(NAME));
  host.signal("SIGSTOP"); // so that the page does not hear of its save
  await dialog(page).getByRole("button", { name: "Save over it" }).click();
  await session.waitForDraft(page, version);
  await page.close();
  host.signal("SIGCONT");
  await waitFor("the save", () => !session.read(NAME).equals(broken));
  session.write(NAME, broken);
  const next = await session.newPage();
  await next.getByText(/report.docx cannot be read: /).waitFor();
  await next.getByLabel("Find", { exact: true }).fill("Budget");
  await next.getByText("2 found").waitFor();
});
