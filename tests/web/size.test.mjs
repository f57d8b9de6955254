// SPDX-License-Identifier: Apache-2.0
// What a browser has to load.
import assert from "node:assert/strict";
import { readFileSync, readdirSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";
import { fileURLToPath } from "node:url";
import { gzipSync } from "node:zlib";

const DIST = fileURLToPath(new URL("../../web/dist/", import.meta.url));
const MOST = 600_000; // bytes of all scripts, compressed

test("all scripts together have at most 600 KB when they are compressed", (t) => {
  const scripts = readdirSync(DIST, { recursive: true }).filter((name) => name.endsWith(".js"));
  const sizes = scripts.map((name) => gzipSync(readFileSync(join(DIST, name))).length);
  const sum = sizes.reduce((total, size) => total + size, 0);
  t.diagnostic(`${sum} bytes in ${scripts.length} scripts`);
  assert.ok(scripts.length > 0);
  assert.ok(sum <= MOST, `${sum}`);
});
