// SPDX-License-Identifier: Apache-2.0
// Bytes as the characters of strings, and back.
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "./room.mjs";

const { bytesOf, isPlainText, stringOf, utf8 } = await room("../client/src/bytes.ts");

const LONG = 100_000; // more than is made in one piece

test("each byte is the character of its number, whatever stands around it", () => {
  for (const around of [Buffer.alloc(0), Buffer.from("ascii"), Buffer.from("\u00e9\u6e2f\u{1f600}"), Buffer.alloc(LONG, "a")]) {
    for (let byte = 0; byte < 256; ++byte) {
      const bytes = Buffer.concat([around, Buffer.of(byte), around]);
      const characters = stringOf(bytes);
      assert.ok(characters === bytes.toString("latin1"), `${byte} in ${around.length} bytes`);
      assert.ok(bytes.equals(bytesOf(characters)), `${byte} in ${around.length} bytes`);
    }
  }
});

test("text is plain unless it has what hosts replace in parts of \"application/\" types", () => {
  const replaced = (code) =>
    (code < 0x20 && ![0x09, 0x0a, 0x0d].includes(code)) ||
    (code >= 0x7f && code < 0xa0) ||
    [0x200b, 0xfffe, 0xffff].includes(code);
  for (let code = 0; code <= 0xffff; code += code === 0xd7ff ? 0x801 : 1) {
    const content = utf8(`a${String.fromCharCode(code)}b`);
    assert.equal(isPlainText(content), !replaced(code), `U+${code.toString(16)}`);
  }
  assert.equal(isPlainText("\xff"), false);
  assert.equal(isPlainText(utf8("\u{1f600}")), true);
});

test("a byte-order mark stays", () => {
  assert.equal(stringOf(Uint8Array.of(0xef, 0xbb, 0xbf)), "\xef\xbb\xbf");
});

test("a character that is no byte is refused", () => {
  assert.throws(() => bytesOf("a\u0100"), /U\+100/);
});
