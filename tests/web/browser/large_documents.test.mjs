// SPDX-License-Identifier: Apache-2.0
// The client library in a browser, with a document of 30 MB, or of 300 with EDITOR_SERIALIZATION_LONG_TESTS=1.
import assert from "node:assert/strict";
import { createHash } from "node:crypto";
import { readFileSync } from "node:fs";
import { join } from "node:path";

import { parseUrl } from "../../serve/client.mjs";
import { IS_LONG, ROOT } from "../../serve/processes.mjs";
import { Session, browserTest, lackedByFirefox } from "./harness.mjs";

const MEGABYTES = IS_LONG ? 300 : 30;

browserTest(`${MEGABYTES} MB are written and read byte for byte`, { skip: lackedByFirefox("way around the policy of a page"), timeout: 600_000 }, async (t) => {
  const session = await Session.start(t, {}, { bypassCSP: true });
  const library = readFileSync(join(ROOT, "web/client/dist/index.js"), "utf8");
  const content = `${library}\nglobalThis.library = { connect, stringOf };`;
  await session.page.addScriptTag({ type: "module", content });
  const { server, user, password } = parseUrl(session.host.webSocket);
  const file = session.path("large.txt");
  const outcome = await session.page.evaluate(
    async ({ megabytes, file, ...options }) => {
      const { connect, stringOf } = globalThis.library;
      const bytes = new Uint8Array(megabytes * 1e6);
      for (let begin = 0; begin < bytes.length; begin += 65_536) {
        crypto.getRandomValues(bytes.subarray(begin, begin + 65_536));
      }
      bytes.forEach((byte, index) => (bytes[index] = 48 + (byte & 63))); // "0" to "o"
      const digest = Array.from(new Uint8Array(await crypto.subtle.digest("SHA-256", bytes)));
      const text = stringOf(bytes);
      const client = await connect(options);
      const begin = performance.now();
      const isSaved = await client.write(file, text, { tries: 1 });
      const between = performance.now();
      const answer = await client.read(file, "text/plain", { tries: 1 });
      const end = performance.now();
      return { digest, isSaved, isSame: answer.data === text, written: between - begin, read: end - between };
    },
    { megabytes: MEGABYTES, file, servers: server, user, pass: password },
  );
  t.diagnostic(`written in ${outcome.written / 1000} s, read in ${outcome.read / 1000} s`);
  assert.equal(outcome.isSaved, true);
  assert.deepEqual([...createHash("sha256").update(readFileSync(file)).digest()], outcome.digest);
  assert.equal(outcome.isSame, true);
});
