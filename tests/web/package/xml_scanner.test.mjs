// SPDX-License-Identifier: Apache-2.0
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "../room.mjs";
import { generateXml, generator } from "./generated.mjs";

const { XmlScanner, decodeReferences, encodeText, findXmlError } = await room("package/xml_scanner.ts");

function tokens(xml) {
  const scanner = new XmlScanner(xml);
  const result = [];
  while (scanner.next()) {
    result.push([scanner.kind, scanner.source]);
  }
  return result;
}

test("tokens are told apart by kind", () => {
  assert.deepEqual(tokens(`<?xml version="1.0"?><a b='>'><!-- <x> -->t&amp;<b/><![CDATA[<]]></a>\n`), [
    ["instruction", '<?xml version="1.0"?>'],
    ["start", "<a b='>'>"],
    ["comment", "<!-- <x> -->"],
    ["text", "t&amp;"],
    ["empty", "<b/>"],
    ["cdata", "<![CDATA[<]]>"],
    ["end", "</a>"],
    ["text", "\n"],
  ]);
});

test("tokens together are the document", () => {
  for (let seed = 0; seed < 500; ++seed) {
    const xml = generateXml(generator(seed));
    assert.equal(
      tokens(xml)
        .map(([, source]) => source)
        .join(""),
      xml,
    );
  }
});

test("attributes come with their references resolved", () => {
  const scanner = new XmlScanner(`<a b="&lt;&#x41;&#66;" xml:space = 'preserve'/>`);
  scanner.next();
  assert.deepEqual(Object.fromEntries(scanner.attributes()), { b: "<AB", "xml:space": "preserve" });
});

for (const [xml, reason] of [
  ["<a><b></a></b>", "mismatch"],
  ["<a>", "unclosed"],
  ["", "unclosed"],
  ["<a/><b/>", "outside"],
  ["text", "outside"],
  ["<a/>&amp;", "outside"],
  ["</a>", "mismatch"],
  ["<a>&</a>", "reference"],
  ["<a b='&x'/>", "reference"],
  ["<a>\u0001</a>", "character"],
  ["<!DOCTYPE a [<!ENTITY e 'x'>]><a>&e;</a>", "doctype"],
  ["<a b=c/>", "syntax"],
  ["<a b='<'/>", "syntax"],
  ["<a", "syntax"],
  ["<a><!-- </a>", "syntax"],
  ["<a>< b/></a>", "syntax"],
]) {
  test(`${JSON.stringify(xml)} is not well-formed: ${reason}`, () => {
    assert.equal(findXmlError(xml)?.reason, reason);
  });
}

test("a well-formed document has no error", () => {
  assert.equal(findXmlError("\ufeff<a x='1'>ü&#10;<b /></a >\n"), undefined);
});

test("depth and length take no stack", () => {
  const deep = `${"<a>".repeat(200_000)}${"</a>".repeat(200_000)}`;
  assert.equal(findXmlError(deep), undefined);
  assert.equal(findXmlError(`<a b="${"x".repeat(5_000_000)}">${"y".repeat(5_000_000)}</a>`), undefined);
  assert.equal(
    findXmlError(`<a ${Array.from({ length: 50_000 }, (_, index) => `b${index}="1"`).join(" ")}/>`),
    undefined,
  );
});

test("text comes back from its encoded form", () => {
  const text = `a<b>&amp; "ü" 😀 ]]> \r\n\t`;
  assert.equal(decodeReferences(encodeText(text)), text);
  assert.equal(encodeText("a\u0000\u000b\uffffb"), "ab");
});

test("references that are none of XML's own stay", () => {
  assert.equal(decodeReferences("&nbsp;&lt;&#x110000;"), "&nbsp;<&#x110000;");
});
