// SPDX-License-Identifier: Apache-2.0
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "../room.mjs";
import { generator } from "./generated.mjs";

const { findMatches, findXmlError, patternOf, replaceMatches, textBlocks } = await room(
  "package/text_runs.ts",
  "package/xml_scanner.ts",
);

const WORD = "http://schemas.openxmlformats.org/wordprocessingml/2006/main";
const DRAWING = "http://schemas.openxmlformats.org/drawingml/2006/main";
const SHEET = "http://schemas.openxmlformats.org/spreadsheetml/2006/main";

const word = (paragraphs) => `<w:document xmlns:w="${WORD}"><w:body>${paragraphs}</w:body></w:document>`;
const run = (text, format = "") => `<w:r>${format}<w:t>${text}</w:t></w:r>`;
const texts = (xml) => textBlocks(xml).map(({ text }) => text);

function replaceAll(xml, text, replacement, options = {}) {
  const pattern = patternOf({ text, matchCase: true, wholeWords: false, ...options });
  const replacements = textBlocks(xml).map((block) => ({ block, matches: findMatches(block, pattern) }));
  return replaceMatches(xml, replacements, replacement);
}

test("a paragraph's text is that of its runs", () => {
  assert.deepEqual(
    texts(word(`<w:p>${run("An")}${run("nual", "<w:rPr><w:b/></w:rPr>")}</w:p><w:p/><w:p>${run("B &amp; C")}</w:p>`)),
    ["Annual", "B & C"],
  );
});

test("slides, shared strings, cells and comments have text", () => {
  const slide = `<p:sld xmlns:p="urn:p" xmlns:a="${DRAWING}"><a:p><a:r><a:t>Title</a:t></a:r><a:br/><a:r><a:t>two</a:t></a:r></a:p></p:sld>`;
  assert.deepEqual(texts(slide), ["Title\ntwo"]);
  const strings = `<sst xmlns="${SHEET}"><si><t>one</t></si><si><r><t>t</t></r><r><t>wo</t></r><rPh sb="0" eb="1"><t>reading</t></rPh></si></sst>`;
  assert.deepEqual(texts(strings), ["one", "two"]);
  const sheet = `<x:worksheet xmlns:x="${SHEET}"><x:c t="inlineStr"><x:is><x:t>here</x:t></x:is></x:c><x:c><x:v>1</x:v></x:c></x:worksheet>`;
  assert.deepEqual(texts(sheet), ["here"]);
  assert.deepEqual(texts(`<comments xmlns="${SHEET}"><comment><text><r><t>note</t></r></text></comment></comments>`), [
    "note",
  ]);
});

test("namespaces count and prefixes do not", () => {
  assert.deepEqual(texts(`<d xmlns="${WORD}"><p><r><t>default</t></r></p></d>`), ["default"]);
  assert.deepEqual(texts(`<d xmlns:w="urn:other"><w:p><w:r><w:t>none</w:t></w:r></w:p></d>`), []);
  const strict = "http://purl.oclc.org/ooxml/wordprocessingml/main";
  assert.deepEqual(texts(`<q:d xmlns:q="${strict}"><q:p><q:r><q:t>strict</q:t></q:r></q:p></q:d>`), ["strict"]);
  const inner = `<d xmlns="urn:o"><p xmlns="${WORD}"><r><t>in</t></r></p><p><r><t>out</t></r></p></d>`;
  assert.deepEqual(texts(inner), ["in"]);
});

test("tabs and breaks are seen, tab stops and deleted text are not", () => {
  const xml = word(
    `<w:p><w:pPr><w:tabs><w:tab w:val="left"/></w:tabs></w:pPr><w:r><w:t>a</w:t><w:tab/><w:t>b</w:t><w:br/></w:r>` +
      `<w:del><w:r><w:delText>gone</w:delText><w:tab/></w:r></w:del>${run("c")}</w:p>`,
  );
  assert.deepEqual(texts(xml), ["a\tb\nc"]);
});

test("a text box's paragraphs are their own", () => {
  const box = `<w:r><w:pict><w:txbxContent><w:p>${run("box")}</w:p></w:txbxContent></w:pict></w:r>`;
  assert.deepEqual(texts(word(`<w:p>${run("be")}${box}${run("fore")}</w:p>`)), ["before", "box"]);
});

test("white space at the ends counts where the file says so", () => {
  const preserved = `<w:r><w:t xml:space="preserve"> b </w:t></w:r>`;
  assert.deepEqual(texts(word(`<w:p>${run(" a ")}${preserved}</w:p>`)), ["a b "]);
  assert.deepEqual(texts(`<a:p xmlns:a="${DRAWING}"><a:r><a:t> x </a:t></a:r></a:p>`), [" x "]);
});

test("a replacement goes into the run where the match begins", () => {
  const bold = "<w:rPr><w:b/></w:rPr>";
  const before = word(`<w:p>${run("The Ann")}${run("ual re", bold)}${run("port is")}</w:p>`);
  assert.equal(
    replaceAll(before, "Annual report", "Budget"),
    word(`<w:p>${run("The Budget")}${run("", bold)}<w:r><w:t xml:space="preserve"> is</w:t></w:r></w:p>`),
  );
});

test("white space that comes to stand at an end is preserved", () => {
  const before = word(`<w:p><w:r><w:t xml:space="default">one two</w:t></w:r></w:p>`);
  assert.equal(replaceAll(before, "two", ""), word(`<w:p><w:r><w:t xml:space="preserve">one </w:t></w:r></w:p>`));
});

test("text of drawings never gets an attribute, which it may not have", () => {
  const slide = (text) => `<a:p xmlns:a="${DRAWING}"><a:r><a:t>${text}</a:t></a:r></a:p>`;
  assert.equal(replaceAll(slide("one two"), "two", ""), slide("one "));
});

test("several matches in one run, and matches that share a run, are all replaced", () => {
  const before = word(`<w:p>${run("aXbXc")}${run("XX")}${run("XdX")}</w:p>`);
  assert.equal(replaceAll(before, "X", "--"), word(`<w:p>${run("a--b--c")}${run("----")}${run("--d--")}</w:p>`));
  assert.equal(
    replaceAll(word(`<w:p>${run("ab")}${run("ab")}${run("a")}</w:p>`), "ba", "-"),
    word(`<w:p>${run("a-")}${run("-")}${run("")}</w:p>`),
  );
});

test("what a replacement has of markup is text", () => {
  const replaced = replaceAll(word(`<w:p>${run("x")}</w:p>`), "x", `<w:p>&"$&`);
  assert.deepEqual(texts(replaced), [`<w:p>&"$&`]);
});

test("no match goes over a tab, a picture, a field or mathematics", () => {
  for (const between of ["<w:tab/>", "<w:drawing/>", "<w:fldChar/>", "<w:footnoteReference/>"]) {
    const xml = word(`<w:p>${run("ab")}<w:r>${between}</w:r>${run("ab")}</w:p>`);
    assert.equal(replaceAll(xml, "bab", "-"), xml, between);
    assert.equal(replaceAll(xml, "b\tab", "-"), xml, between);
    assert.deepEqual(replaceAll(xml, "ab", "-"), xml.replaceAll("<w:t>ab", "<w:t>-"), between);
  }
  const math = `<m:oMath xmlns:m="http://schemas.openxmlformats.org/officeDocument/2006/math"><m:r><m:t>x</m:t></m:r></m:oMath>`;
  assert.deepEqual(texts(word(`<w:p>${run("a")}${math}${run("b")}</w:p>`)), ["ab"]);
  const xml = word(`<w:p>${run("a")}${math}${run("b")}</w:p>`);
  assert.equal(replaceAll(xml, "ab", "-"), xml);
});

test("a match that begins with an emoji and cannot be replaced does not end the search, or keep it going for ever", () => {
  const xml = (last) => word(`<w:p>${run("😀")}<w:r><w:drawing/></w:r>${run(`😀${last}😀`)}</w:p>`);
  assert.equal(replaceAll(xml("😀"), "😀😀", "-"), xml("😀").replace("😀😀😀", "-😀"));
  assert.equal(replaceAll(xml(""), "😀😀😀", "-"), xml(""));
});

test("case and whole words are as asked for", () => {
  const xml = word(`<w:p>${run("Straße STRASSE straße Nebenstraße Äpfel")}</w:p>`);
  const count = (text, options) =>
    findMatches(textBlocks(xml)[0], patternOf({ text, matchCase: false, wholeWords: false, ...options })).length;
  assert.equal(count("straße"), 3);
  assert.equal(count("straße", { matchCase: true }), 2);
  assert.equal(count("straße", { wholeWords: true }), 2);
  assert.equal(count("äpfel", { wholeWords: true }), 1);
  assert.equal(count(".*"), 0);
  assert.equal(patternOf({ text: "" }), undefined);
});

test("references, CDATA and what is neither are kept apart", () => {
  const xml = word("<w:p><w:r><w:t>a &lt;<![CDATA[ <b>]]></w:t></w:r><w:r><w:t>c<!-- d -->e</w:t></w:r></w:p>");
  assert.deepEqual(texts(xml), ["a < <b>ce"]);
  assert.deepEqual(texts(replaceAll(xml, "<b>", "&")), ["a < &ce"]);
  assert.equal(replaceAll(xml, "ce", "x"), xml);
});

test("replacing finds and changes exactly what a search in the text would, however the runs are cut", () => {
  for (let seed = 0; seed < 400; ++seed) {
    const next = generator(seed);
    const words = Array.from({ length: 1 + next(40) }, () => ["a", "b", " ", "<", "&", "ü", "😀"][next(7)]);
    let runs = "";
    let written = "";
    while (words.length > 0) {
      const piece = words.splice(0, 1 + next(4)).join("");
      written += piece;
      const escaped = piece.replaceAll("&", "&amp;").replaceAll("<", "&lt;");
      runs += `<w:r><w:t xml:space="preserve">${escaped}</w:t></w:r>`;
    }
    const xml = word(`<w:p>${runs}</w:p>`);
    const [sought, replacement] = [["ab", "a", "b ", "<&", "ü"][next(5)], ["", "x", " ab "][next(3)]];
    const replaced = replaceAll(xml, sought, replacement);
    assert.equal(findXmlError(replaced), undefined);
    assert.equal(texts(replaced)[0] ?? "", written.replaceAll(sought, replacement), `seed ${seed}`);
    assert.equal(replaced.split("<w:r>").length, xml.split("<w:r>").length);
  }
});

test("a paragraph with very many runs and matches is replaced from end to end", () => {
  const xml = word(`<w:p>${run("ab").repeat(60_000)}</w:p>`);
  assert.equal(texts(replaceAll(xml, "ba", "-"))[0], `a${"-".repeat(59_999)}b`);
});
