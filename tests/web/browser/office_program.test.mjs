// SPDX-License-Identifier: Apache-2.0
// What an office program makes of documents that the page has saved. Skipped, with a line that says so, where there is
// no LibreOffice; but not at night, when there has to be one.
import assert from "node:assert/strict";
import { execFile } from "node:child_process";
import { copyFileSync, existsSync, readFileSync } from "node:fs";
import { basename, join } from "node:path";
import { promisify } from "node:util";

import { IS_LONG, temporaryFolder } from "../../serve/processes.mjs";
import { browserTest, Session } from "./harness.mjs";
import { archive, presentationFiles, wordFiles, workbookFiles } from "./office_files.mjs";
import { save } from "./package_page.mjs";

const OFFICE = process.env.SOFFICE || "/usr/bin/soffice";
const IS_SKIPPED = !existsSync(OFFICE) && !IS_LONG;
if (IS_SKIPPED) {
  // ctest is told to look for this line.
  console.error(`SKIPPED: there is no LibreOffice at ${OFFICE}, so no office program opens what the page saves`);
}

// Converts `paths` to files of the kind `extension` in the folder `output`, whose paths are returned.
async function convert(folder, paths, extension, output) {
  const profile = `-env:UserInstallation=file://${folder}/profile`; // one that no other run of it has locked
  const options = [profile, "--headless", "--convert-to", extension, "--outdir", join(folder, output)];
  await promisify(execFile)(OFFICE, [...options, ...paths], { timeout: 300_000 });
  return paths.map((path) => join(folder, output, basename(path).replace(/[^.]*$/, extension)));
}

// The text in a document of flat OpenDocument.
function bodyOf(path) {
  const [body] = /<office:body>.*<\/office:body>/s.exec(readFileSync(path, "utf8"));
  return body.replace(/<[^>]*>/g, "").replace(/\s+/g, " ");
}

// Replaces what runs over several runs of text, and saves.
async function replaceReport(session, name) {
  session.page = await session.newPage(`&file=${encodeURIComponent(session.path(name))}`);
  const { page } = session;
  await page.getByLabel("Find", { exact: true }).fill("annual report");
  await page.locator(".package-paragraphs mark").first().waitFor();
  await page.getByLabel("Replace with").fill("Budget");
  await page.getByRole("button", { name: "Replace all" }).click();
  await save(session, name);
}

for (const [extension, flat, files] of [
  ["docx", "fodt", wordFiles()],
  ["xlsx", "fods", workbookFiles()],
  ["pptx", "fodp", presentationFiles()],
]) {
  const title = `an office program finds the text that was replaced in a ${extension}, and all the rest`;
  browserTest(title, { skip: IS_SKIPPED && "there is no LibreOffice", timeout: 600_000 }, async (t) => {
    const folder = temporaryFolder(t);
    const [made, own] = [`made.${extension}`, `own.${extension}`];
    const session = await Session.start(t, { [made]: archive(files) });
    // One that the office program has written itself, too.
    const [written] = await convert(folder, [session.path(made)], extension, "written");
    copyFileSync(written, session.path(own));
    const documents = [made, own].map((name) => session.path(name));
    const before = (await convert(folder, documents, flat, "before")).map(bodyOf);
    await replaceReport(session, made);
    await replaceReport(session, own);
    const after = (await convert(folder, documents, flat, "after")).map(bodyOf);
    assert.ok(before.every((text) => /annual report/i.test(text)), `${before}`);
    assert.deepEqual(after, before.map((text) => text.replace(/annual report/gi, "Budget")));
  });
}
