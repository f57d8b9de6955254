// SPDX-License-Identifier: Apache-2.0
// Documents full of photographs: 15 MB, or 300 with EDITOR_SERIALIZATION_LONG_TESTS=1. How long things take, and how
// much memory the page needs, is told.
import assert from "node:assert/strict";
import { readFileSync } from "node:fs";

import { IS_LONG, waitFor } from "../../serve/processes.mjs";
import { browserTest, Session } from "./harness.mjs";
import { archive, photograph, presentationFiles, relationships, textIn, wordFiles, wordPicture } from "./office_files.mjs";
import { assertSameBut, tab } from "./package_page.mjs";

const MEGABYTES = IS_LONG ? 300 : 15;
const PHOTOGRAPHS = MEGABYTES / 5;

function photographs(folder) {
  const numbers = Array.from({ length: PHOTOGRAPHS }, (_, index) => index + 1);
  return Object.fromEntries(numbers.map((number) => [`${folder}/photograph${number}.png`, photograph(1500, 1111)]));
}

// Shows all of them.
function wordDocument() {
  const images = photographs("word/media");
  const ids = Object.keys(images).map((_, index) => `rId${100 + index}`);
  return wordFiles(ids.map(wordPicture).join(""), {
    ...images,
    "word/_rels/document.xml.rels": relationships(
      ["rId1", "image", "media/image1.png"],
      ["rId3", "header", "header1.xml"],
      ...Object.keys(images).map((name, index) => [ids[index], "image", name.slice("word/".length)]),
    ),
  });
}

// The most memory that the page's process had, in MB.
async function peakMemory(page) {
  const session = await page.context().browser().newBrowserCDPSession();
  const { processInfo } = await session.send("SystemInfo.getProcessInfo");
  const peaks = processInfo
    .filter(({ type }) => type === "renderer")
    .map(({ id }) => Number(/^VmHWM:\s+(\d+) kB/m.exec(readFileSync(`/proc/${id}/status`, "utf8"))[1]) / 1e3);
  await session.detach();
  return Math.round(Math.max(...peaks));
}

async function replaceReport(page) {
  await page.getByLabel("Find", { exact: true }).fill("annual report");
  await page.getByLabel("Replace with").fill("Budget");
  await page.getByRole("button", { name: "Replace all" }).click();
}

async function setTitle(page) {
  await tab(page, "Properties").click();
  await page.getByLabel("Title").fill("Photographs");
}

for (const [name, files, edit, changed] of [
  ["photographs.docx", wordDocument, replaceReport, ["word/document.xml", "word/header1.xml"]],
  ["photographs.pptx", () => ({ ...presentationFiles(), ...photographs("ppt/media") }), setTitle, ["docProps/core.xml"]],
]) {
  browserTest(`${name} of ${MEGABYTES} MB is opened, changed and saved`, { timeout: 600_000 }, async (t) => {
    const before = archive(files());
    const session = await Session.start(t, { [name]: before });
    const { page } = session;
    page.setDefaultTimeout(300_000);
    const time = async (what, action) => {
      const begin = performance.now();
      await action();
      t.diagnostic(`${what} in ${Math.round(performance.now() - begin)} ms`);
    };
    await time("opened", async () => {
      await page.locator(".tree .row").getByText(name, { exact: true }).click();
      await page.locator(".package").waitFor();
    });
    const preview = page.frameLocator("iframe[title=Preview]");
    if (name.endsWith(".docx")) {
      await time("previewed", () => preview.locator("img").nth(PHOTOGRAPHS).waitFor());
    }
    await time("edited", () => edit(page));
    await page.locator(".mark.unsaved").waitFor();
    if (name.endsWith(".docx")) {
      await time("previewed again", () => preview.getByText("The Budget of 2026").waitFor());
    }
    await time("saved", async () => {
      await page.keyboard.press("Control+s");
      await page.locator(".mark.unsaved").waitFor({ state: "detached" });
    });
    t.diagnostic(`the page had up to ${await peakMemory(page)} MB`);
    assertSameBut(changed, before, session.read(name));
  });
}
