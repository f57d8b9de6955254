// SPDX-License-Identifier: Apache-2.0
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "../room.mjs";

const { imageType, mayReplace } = await room("package/images.ts");
const bytes = (text) => Uint8Array.from(Buffer.from(text, "latin1"));

for (const [head, type] of [
  ["\x89PNG\r\n\x1a\n\0\0\0\rIHDR", "image/png"],
  ["\xff\xd8\xff\xe0\0\x10JFIF", "image/jpeg"],
  ["GIF89a", "image/gif"],
  ["BM\x01\x02\x03\x04\0\0\0\0", "image/bmp"],
  ["II*\0", "image/tiff"],
  ["MM\0*", "image/tiff"],
  ["RIFF\x01\x02\x03\x04WEBP", "image/webp"],
  ['<?xml version="1.0"?><svg xmlns="">', "image/svg+xml"],
  ["BMX", undefined],
  ["text", undefined],
  ["", undefined],
]) {
  test(`${JSON.stringify(head)} begins ${type ?? "no image"}`, () => {
    assert.equal(imageType(bytes(head)), type);
  });
}

test("an image takes the place of one that is shown in the same places", () => {
  assert.ok(mayReplace("image/png", "image/jpeg"));
  assert.ok(mayReplace("image/svg+xml", "image/svg+xml"));
  assert.ok(!mayReplace("image/png", "image/svg+xml"));
  assert.ok(!mayReplace("image/x-emf", "image/png"));
});
