// SPDX-License-Identifier: Apache-2.0
// The page's charsets against the converters of the host, code by code.
import assert from "node:assert/strict";
import { spawnSync } from "node:child_process";
import { readFile } from "node:fs/promises";
import { join } from "node:path";
import { test } from "node:test";

import { room } from "./room.mjs";

const { ByteSink, Charsets, ESCAPED } = await room("text/charsets/index.ts");

const load = (file) => readFile(join(process.env.CHARSET_TABLES, file));
const charsets = new Charsets(load);
const names = await charsets.names();
const UNICODE = ["UTF-8", "UTF-16LE", "UTF-16BE", "UTF-32LE", "UTF-32BE"];
const SURROGATES = [0xd800, 0xdfff];

function oracle(args, input) {
  const { status, stdout, stderr } = spawnSync(process.env.CHARSET_ORACLE, args, { input, maxBuffer: 2 ** 30 });
  assert.equal(status, 0, String(stderr));
  return stdout;
}

// A test of millions of texts brings one sink for all of them, which spares the collector millions of buffers.
function encoded(charset, text, sink = new ByteSink(0)) {
  sink.length = 0;
  const lacking = charset.encode(text, sink);
  return { bytes: Buffer.from(sink.result()), lacking };
}

// Collects what differs, so that a test says what and how much.
class Differences {
  found = [];

  compare(what, actual, expected) {
    if (actual !== expected) {
      this.found.push(`${what}: ${actual} rather than ${expected}`);
    }
  }

  assertNone() {
    assert.equal(this.found.length, 0, `${this.found.length} differ: ${this.found.slice(0, 10).join("; ")}`);
  }
}

function compareEncoding(charset, first, last) {
  const differences = new Differences();
  const sink = new ByteSink(0);
  const answers = oracle([charset.name, "encode", String(first), String(last)]);
  let at = 0;
  for (let character = first; character <= last; ++character) {
    const length = answers[at++];
    const expected = length === 0 ? "lacking" : answers.toString("hex", at, at + length);
    at += length;
    if (character >= SURROGATES[0] && character <= SURROGATES[1]) {
      continue; // no characters
    }
    const { bytes, lacking } = encoded(charset, String.fromCodePoint(character), sink);
    differences.compare(`U+${character.toString(16)}`, lacking.length > 0 ? "lacking" : bytes.toString("hex"), expected);
  }
  assert.equal(at, answers.length);
  differences.assertNone();
}

function compareDecoding(charset, codes) {
  const differences = new Differences();
  const answers = oracle([charset.name, "decode"], Buffer.concat(codes.flatMap((code) => [[code.length], code]).map(Buffer.from)));
  let at = 0;
  for (const code of codes) {
    const units = answers[at++];
    const expected = units === 0xff ? "damaged" : answers.toString("utf16le", at, (at += 2 * units));
    const { text, isDamaged } = charset.decode(Uint8Array.from(code));
    differences.compare(Buffer.from(code).toString("hex"), isDamaged ? "damaged" : text, expected);
  }
  assert.equal(at, answers.length);
  differences.assertNone();
}

const bytesFrom = (first, last) => Array.from({ length: last - first + 1 }, (_, index) => first + index);
const ALL = bytesFrom(0, 0xff);

// Numbers that are the same in every run.
function* pseudorandom(limit, seed = 1) {
  for (let state = seed; ; ) {
    state = (Math.imul(state, 1664525) + 1013904223) >>> 0;
    yield Math.floor((state / 2 ** 32) * limit);
  }
}

test("the charsets that texts are found in are all there", () => {
  for (const name of [...UNICODE, "Shift_JIS", "x-Shift_JIS-nec", "EUC-JP", "GB18030", "Big5-HKSCS", "Johab", "IBM037"]) {
    assert.ok(names.includes(name), name);
  }
  assert.ok(names.length > 90, String(names.length));
});

for (const name of names) {
  const charset = await charsets.open(name);
  const hasTable = !UNICODE.includes(name);
  const isMultiByte = hasTable && (await load(JSON.parse(await load("charsets.json"))[name]))[0] > 1;

  test(`${name}: every character is encoded as the host encodes it`, () => {
    compareEncoding(charset, 0, 0xffff);
    if (isMultiByte || !hasTable) {
      compareEncoding(charset, 0x1f000, 0x1ffff);
      compareEncoding(charset, 0x20000, 0x2ffff);
      compareEncoding(charset, 0xf0000, 0xf00ff);
      compareEncoding(charset, 0x10ff00, 0x10ffff);
    }
  });

  if (hasTable) {
    test(`${name}: every code is decoded as the host decodes it`, () => {
      const codes = ALL.map((byte) => [byte]);
      if (isMultiByte) {
        codes.push(...ALL.flatMap((lead) => ALL.map((trail) => [lead, trail])));
        codes.push(...[0x8e, 0x8f].flatMap((first) => bytesFrom(0xa0, 0xff).flatMap((second) => ALL.map((third) => [first, second, third]))));
        const random = pseudorandom(0x100);
        const next = () => random.next().value;
        for (let count = 0; count < 20_000; ++count) {
          codes.push([0x81 + (next() % 126), 0x30 + (next() % 10), 0x81 + (next() % 126), 0x30 + (next() % 11)]);
          codes.push([0x8e, 0xa0 + (next() % 17), 0xa0 + (next() % 96), 0xa0 + (next() % 96)]);
        }
      }
      compareDecoding(charset, codes);
    });
  }
}

test("what a charset lacks is told with its place, and the rest is encoded", async () => {
  const { bytes, lacking } = encoded(await charsets.open("windows-1252"), "a\u{1f600}\u0416b\u20acc\u0142");
  assert.deepEqual(lacking, [{ from: 1, to: 4 }, { from: 7, to: 8 }]);
  assert.equal(bytes.toString("latin1"), "ab\x80c");
});

test("halves of characters are lacking in every form of Unicode", async () => {
  for (const name of UNICODE) {
    assert.deepEqual(encoded(await charsets.open(name), "a\ud83d\u{1f600}\ude00").lacking, [{ from: 1, to: 2 }, { from: 4, to: 5 }]);
  }
});

test("damaged Unicode is told of, and U+FFFD that a file does hold is no damage", async () => {
  const damaged = { "UTF-8": "61ff", "UTF-16LE": "00d86100", "UTF-16BE": "006100", "UTF-32LE": "00d80000", "UTF-32BE": "00110000" };
  for (const [name, bytes] of Object.entries(damaged)) {
    const charset = await charsets.open(name);
    assert.equal(charset.decode(Buffer.from(bytes, "hex")).isDamaged, true, name);
    const whole = encoded(charset, "\ufeffa\ufffd\u{1f600}\n").bytes;
    assert.deepEqual(charset.decode(whole), { text: "\ufeffa\ufffd\u{1f600}\n", isDamaged: false }, name);
  }
});

const CODES = bytesFrom(0x20, 0x7e).map((code) => [code]);
const PAIRS = bytesFrom(0x21, 0x7e).flatMap((first) => bytesFrom(0x21, 0x7e).map((second) => [first, second]));

// Of each charset with escapes: what stands around the codes of one of its sets.
for (const [name, before, codes, after] of [
  ["ISO-2022-JP", "\x1b$B", PAIRS, "\x1b(B"],
  ["ISO-2022-JP", "\x1b$@", PAIRS, "\x1b(B"],
  ["ISO-2022-JP", "\x1b(J", CODES, "\x1b(B"],
  ["ISO-2022-JP-1", "\x1b$(D", PAIRS, "\x1b(B"],
  ["ISO-2022-JP-2", "\x1b$A", PAIRS, "\x1b(B"],
  ["ISO-2022-JP-2", "\x1b$(C", PAIRS, "\x1b(B"],
  ["ISO-2022-JP-2", "\x1b.A\x1bN", CODES, ""],
  ["ISO-2022-JP-2", "\x1b.F\x1bN", CODES, ""],
  ["ISO-2022-KR", "\x1b$)C\x0e", PAIRS, "\x0f"],
  ["ISO-2022-CN", "\x1b$)A\x0e", PAIRS, "\x0f"],
  ["ISO-2022-CN", "\x1b$)G\x0e", PAIRS, "\x0f"],
  ["ISO-2022-CN", "\x1b$*H\x1bN", PAIRS, ""],
  ["ISO-2022-CN-EXT", "\x1b$)E\x0e", PAIRS, "\x0f"],
  ["HZ-GB-2312", "~{", PAIRS, "~}"],
  ["UTF-7", "", CODES, ""],
  ["UTF-7", "+", PAIRS, "-"],
  ["UTF-7", "+TgBO", PAIRS, "-"],
]) {
  test(`${name}: every code behind ${JSON.stringify(before)} is decoded as the host decodes it`, async () => {
    const texts = codes.map((code) => [...Buffer.from(before, "latin1"), ...code, ...Buffer.from(after, "latin1")]);
    compareDecoding(await charsets.open(name), texts);
  });
}

const ESCAPED_TEXTS = [
  ["ISO-2022-JP", "abc \x1b$B$\"$$\x1b(Bd\n\x1b(J\\~\x1b(B\r\n", "abc \u3042\u3044d\n\u00a5\u203e\r\n"],
  ["ISO-2022-JP", "\x1b(I1\n2\x1b$B$\"\n$", "\uff71\n2\u3042\n$"], // a line ends what the one before has designated
  ["ISO-2022-KR", "\x1b$)Ca\x0e0!\x0fb\n\x0e0\"\x0f\n", "a\uac00b\n\uac01\n"],
  ["ISO-2022-CN", "a\x1b$)A\x0e0!\x0fb\x1b$)G\x0eD!\x0f\n\x1b$)A\x0e0!\x0f", "a\u554ab\u4e00\n\u554a"],
  ["HZ-GB-2312", "a~~b ~{0!~}c~\nd ~{0!\ne", "a~b \u554acd \u554a\ne"],
  ["UTF-7", "a+-b +AOQ-c +2D3eAA.", "a+b \u00e4c \u{1f600}."],
];

test("texts with escapes are shown, through all their shifts", async () => {
  for (const [name, bytes, text] of ESCAPED_TEXTS) {
    assert.deepEqual((await charsets.open(name)).decode(Buffer.from(bytes, "latin1")), { text, isDamaged: false }, name);
  }
});

test("damaged texts with escapes are told of", async () => {
  const damaged = { "ISO-2022-JP": "\x1b$C", "ISO-2022-KR": "\x0e0!", "ISO-2022-CN": "\x1b$)A\x0e0", "HZ-GB-2312": "~a", "UTF-7": "+2D0-" };
  for (const [name, bytes] of Object.entries(damaged)) {
    assert.equal((await charsets.open(name)).decode(Buffer.from(bytes, "latin1")).isDamaged, true, name);
    assert.equal((await charsets.open(name)).decode(Uint8Array.of(0x61, 0xe4)).isDamaged, true, name);
  }
});

test("texts with escapes are not encoded", async () => {
  for (const name of ESCAPED) {
    assert.equal((await charsets.open(name)).canEncode, false, name);
    assert.ok(!names.includes(name), name);
  }
});

test("a charset that is not known is none, and one whose table could not be loaded is tried again", async () => {
  assert.equal(await charsets.open("EBCDIC-XYZ"), undefined);
  let fails = true;
  const flaky = new Charsets((file) => (fails ? Promise.reject(new Error("no network")) : load(file)));
  await assert.rejects(flaky.open("KOI8-R"), /no network/);
  fails = false;
  assert.equal((await flaky.open("KOI8-R")).decode(Uint8Array.of(0xf0)).text, "\u041f");
});
