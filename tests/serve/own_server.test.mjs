// A host with a message server of its own, from its start to its end.
import assert from "node:assert/strict";
import { copyFileSync, existsSync, readFileSync, readdirSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";

import { Client } from "./client.mjs";
import { Host, HOST, IS_SANITIZED, Program, ROOT, temporaryFolder, waitFor } from "./processes.mjs";

test("it serves what any server with workers does", async (t) => {
  const folder = temporaryFolder(t);
  const host = await Host.start(t, ["--root", folder]);
  const suite = new Program(t, [
    process.execPath,
    join(ROOT, "tests/serve/client_suite.mjs"),
    ...["--websocket", host.webSocket, "--nats", host.nats, "--folder", folder, "--origins"],
    ...(IS_SANITIZED ? ["--megabytes", "5", "--connections", "200"] : []),
  ]);
  assert.equal(await suite.end, 0, `${suite.output}\n${suite.errors}\n${host.errors}`);
});
