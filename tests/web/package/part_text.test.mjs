// SPDX-License-Identifier: Apache-2.0
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "../room.mjs";

const { decodePart, encodePart, isAsDeclared } = await room("package/part_text.ts");
const bytes = (...args) => Buffer.from(...args).toString("latin1");

test("UTF-8 with and without a mark comes back", () => {
  for (const content of [bytes("<a>ü 港 😀</a>"), bytes("\ufeff<a/>"), "", bytes("no XML ü\r\n")]) {
    assert.equal(encodePart(decodePart(content)), content);
  }
  assert.equal(decodePart(bytes("\ufeff<a/>")).text, "<a/>");
});

test("UTF-16 of both orders comes back, with and without a mark", () => {
  const text = `<?xml version="1.0" encoding="UTF-16"?>\r\n<a>ü 港 😀</a>`;
  for (const mark of ["", "\ufeff"]) {
    const little = Buffer.from(mark + text, "utf16le");
    const big = Buffer.from(little).swap16();
    for (const content of [bytes(little), bytes(big)]) {
      const decoded = decodePart(content);
      assert.equal(decoded.text, text);
      assert.equal(encodePart(decoded), content);
    }
  }
});

test("a declared charset of single bytes comes back, with references for what it lacks", () => {
  const content = bytes(`<?xml version="1.0" encoding="windows-1251"?><a>\xcf\xf0\xe8\xe2\xe5\xf2</a>`, "latin1");
  const decoded = decodePart(content);
  assert.match(decoded.text, /Привет/);
  assert.equal(encodePart(decoded), content);
  const edited = encodePart({ ...decoded, text: decoded.text.replace("Привет", "港") });
  assert.match(edited, /<a>&#x6E2F;<\/a>/);
});

test("the charset follows the declaration as it is edited", () => {
  const decoded = decodePart(`<?xml version="1.0" encoding="UTF-8"?><a>\xc3\xbc</a>`);
  const latin = encodePart({ ...decoded, text: decoded.text.replace("UTF-8", "ISO-8859-15") });
  assert.match(latin, /<a>\xfc<\/a>/);
  const utf16 = encodePart({ ...decoded, text: decoded.text.replace("UTF-8", "UTF-16") });
  assert.ok(utf16.startsWith("\xff\xfe<\0?\0"));
});

test("what declares a charset that nobody writes is kept in UTF-8", () => {
  const decoded = decodePart(bytes(`<?xml version="1.0" encoding="UTF-8"?><a>ü 港</a>`));
  assert.equal(isAsDeclared(decoded), true);
  for (const charset of ["UTF-9", "Shift_JIS"]) {
    const edited = { ...decoded, text: decoded.text.replace("UTF-8", charset) };
    assert.equal(encodePart(edited), bytes(edited.text));
    assert.equal(isAsDeclared(edited), false);
  }
});

test("what declares a charset that nobody knows is a text in UTF-8, if it is in that, with and without a mark", () => {
  const text = `<?xml version="1.0" encoding="UTF-9"?><a>ü 港</a>`;
  for (const mark of ["", "\ufeff"]) {
    const decoded = decodePart(bytes(mark + text));
    assert.equal(decoded.text, text);
    assert.equal(encodePart(decoded), bytes(mark + text));
    assert.equal(isAsDeclared(decoded), false);
  }
  assert.equal(decodePart(bytes(text, "latin1")), undefined);
});

test("ASCII in a charset of several bytes is a text as it is declared", () => {
  const content = '<?xml version="1.0" encoding="Shift_JIS"?><a>one</a>';
  assert.equal(encodePart(decodePart(content)), content);
  assert.equal(isAsDeclared(decodePart(content)), true);
});

test("what loses the declaration of its charset is UTF-8", () => {
  const decoded = decodePart(bytes(`<?xml version="1.0" encoding="windows-1251"?><a>\xcf</a>`, "latin1"));
  assert.equal(encodePart({ ...decoded, text: "П港" }), bytes("П港"));
});

test("what would not come back is no text", () => {
  for (const content of [
    "\xff\xff\xff",
    bytes(`<?xml version="1.0" encoding="Shift_JIS"?><a>\x83\x65</a>`, "latin1"),
    "\xc0\x80",
  ]) {
    assert.equal(decodePart(content), undefined);
  }
});
