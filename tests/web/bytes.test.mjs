// SPDX-License-Identifier: Apache-2.0
// Bytes as the characters of strings, and back.
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "./room.mjs";

const { bytesOf, stringOf } = await room("../client/src/bytes.ts");

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

test("a byte-order mark stays", () => {
  assert.equal(stringOf(Uint8Array.of(0xef, 0xbb, 0xbf)), "\xef\xbb\xbf");
});

test("a character that is no byte is refused", () => {
  assert.throws(() => bytesOf("a\u0100"), /U\+100/);
});
