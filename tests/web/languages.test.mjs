// SPDX-License-Identifier: Apache-2.0
// The page's texts.
import assert from "node:assert/strict";
import { readFileSync, readdirSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";
import { fileURLToPath } from "node:url";

import { room } from "./room.mjs";

const SOURCES = fileURLToPath(new URL("../../web/src/", import.meta.url));
const { LANGUAGES, TEXTS, bytesText, preferredLanguage, text, useLanguage } = await room("ui/text.ts");

const placeholders = (said) => [...said.matchAll(/\{\w+\}/g)].map(([one]) => one).sort();

test("every language says everything, with the same values in it", () => {
  for (const language of Object.keys(LANGUAGES)) {
    assert.deepEqual(Object.keys(TEXTS[language]).sort(), Object.keys(TEXTS.en).sort(), language);
    for (const [key, said] of Object.entries(TEXTS[language])) {
      assert.notEqual(said.trim(), "", `${language} ${key}`);
      assert.deepEqual(placeholders(said), placeholders(TEXTS.en[key]), `${language} ${key}`);
    }
  }
});

test("what the sources say has a text", () => {
  const files = readdirSync(SOURCES, { recursive: true }).filter((name) => name.endsWith(".ts"));
  const missing = files.flatMap((file) =>
    [...readFileSync(join(SOURCES, file), "utf8").matchAll(/\btext\("([^"]+)"/g)]
      .map(([, key]) => key)
      .filter((key) => !(key in TEXTS.en))
      .map((key) => `${file}: ${key}`),
  );
  assert.deepEqual(missing, []);
});

test("the language is the chosen one, else the first of the browser's that there is, else English", () => {
  assert.equal(preferredLanguage(null, ["fr-FR", "de-CH", "en"]), "de");
  assert.equal(preferredLanguage("en", ["de"]), "en");
  assert.equal(preferredLanguage("xx", ["fr"]), "en");
});

test("values are put into texts, numbers as the language writes them", () => {
  useLanguage("de");
  assert.match(text("files.found", { count: 12345 }), /12\.345/);
  assert.equal(bytesText(1_500_000), "1,5 MB");
  useLanguage("en");
  assert.match(text("files.found", { count: 12345 }), /12,345/);
  assert.equal(bytesText(999), "999 B");
  assert.equal(text("no such key"), "no such key");
});
