// SPDX-License-Identifier: Apache-2.0
// The page and its connection to the host.
import assert from "node:assert/strict";

import { browserTest, Session } from "./harness.mjs";

browserTest("the page connects with what its address says, and takes the password out of it", async (t) => {
  const { host, page } = await Session.start(t);
  assert.match(host.page, /password=/);
  const address = await page.evaluate(() => location.href);
  assert.doesNotMatch(address, /password/);
});
