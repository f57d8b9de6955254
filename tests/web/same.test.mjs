// SPDX-License-Identifier: Apache-2.0
// When a document on disk is taken for the one that was sent.
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "./room.mjs";

const { isSame } = await room("save/same.ts");

// Whether a text of `data`, which is behind a mark in its file or not, is the one whose bytes are `content`.
const isSameText = (data, byteOrderMark, content) =>
  isSame({ path: "/t", version: "v", answer: { status: true, data }, byteOrderMark }, { kind: "text", content, encoding: "UTF-8" });

const MARKS = { "UTF-8": "\xef\xbb\xbf", "UTF-16LE": "\xff\xfe", "UTF-16BE": "\xfe\xff", "UTF-32LE": "\xff\xfe\0\0", "UTF-32BE": "\0\0\xfe\xff" };

for (const [charset, mark] of Object.entries(MARKS)) {
  test(`a text in ${charset} is the same where both have a byte-order mark, or neither`, () => {
    assert.equal(isSameText("abcd", true, `${mark}abcd`), true);
    assert.equal(isSameText("abcd", false, "abcd"), true);
    assert.equal(isSameText("abcd", false, `${mark}abcd`), false);
    assert.equal(isSameText("abcd", true, "abcd"), false);
    assert.equal(isSameText("abce", true, `${mark}abcd`), false);
  });
}

test("what looks like a byte-order mark may be text, too", () => {
  assert.equal(isSameText("\xff\xfea", false, "\xff\xfea"), true); // in ISO-8859-1
  assert.equal(isSameText("\xef\xbb\xbfa", true, "\xef\xbb\xbf\xef\xbb\xbfa"), true);
  assert.equal(isSameText("\xef\xbb\xbfa", true, "\xef\xbb\xbfa"), false);
});

test("a file that cannot be read is not the same as an empty text", () => {
  const file = { path: "/t", version: "v", answer: { status: true, data: "" } };
  const sent = { kind: "text", content: "", encoding: "UTF-8" };
  assert.equal(isSame(file, sent), true);
  assert.equal(isSame({ ...file, unreadable: "it is a folder" }, sent), false);
});
