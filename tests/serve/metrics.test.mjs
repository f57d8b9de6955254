// SPDX-License-Identifier: Apache-2.0
// What a host reports to monitoring programs.
import assert from "node:assert/strict";
import { spawnSync } from "node:child_process";
import { mkdirSync, readFileSync, renameSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";

import { Client } from "./client.mjs";
import { Host, IS_SANITIZED, ROOT, atEnd, temporaryFolder, waitFor } from "./processes.mjs";

// A host whose root is a folder with one text.
async function startWithMetrics(test) {
  const root = join(temporaryFolder(test), "root");
  mkdirSync(root);
  writeFileSync(join(root, "file.txt"), "text\n");
  const host = await Host.start(test, ["--metrics", "127.0.0.1:0", "--root", root]);
  const url = host.output.match(/^metrics: (.*)$/m)[1];
  return { host, root, url };
}

async function metricsAt(url) {
  const response = await fetch(url);
  assert.equal(response.status, 200);
  assert.match(response.headers.get("content-type"), /^text\/plain; version=0\.0\.4/);
  return response.text();
}

// The value of a metric, with its labels.
function valueOf(metrics, name) {
  const line = metrics.split("\n").find((each) => each.startsWith(`${name} `));
  assert.ok(line, `${name} in\n${metrics}`);
  return Number(line.slice(name.length + 1));
}

test("it counts what it is asked, by kind and outcome", async (t) => {
  const { host, root, url } = await startWithMetrics(t);
  const client = await Client.connect(host.webSocket);
  atEnd(t, () => client.close());
  await client.read(join(root, "file.txt"));
  await client.read(join(root, "file.txt"));
  await client.read(join(root, "none.docx"), "text/xml");
  assert.equal(await client.write(join(root, "new.txt"), "new"), true);
  assert.equal(await client.write(join(root, "no folder/new.txt"), "new"), false);
  // A request is counted when its handler is done, which is just after its answer.
  const metrics = await waitFor("the counts", async () => {
    const text = await metricsAt(url);
    const isWritten = (kind) => valueOf(text, `editor_requests_under_way{kind="${kind}"}`) === 0;
    return isWritten("read") && isWritten("write") && text;
  });
  const requests = (kind, outcome) =>
    valueOf(metrics, `editor_requests_total{kind="${kind}",outcome="${outcome}"}`);
  assert.equal(requests("read", "success"), 2);
  assert.equal(requests("read", "failure"), 1);
  assert.equal(requests("write", "success"), 1);
  assert.equal(requests("write", "failure"), 1);
  assert.equal(valueOf(metrics, 'editor_request_seconds_count{kind="read"}'), 3);
  assert.equal(valueOf(metrics, "editor_bus_connected"), 1);
  assert.equal(valueOf(metrics, "editor_roots_readable"), 1);
  assert.equal(valueOf(metrics, "editor_bus_waiting_messages"), 0);
  assert.equal(valueOf(metrics, "editor_request_memory_bytes"), 0);
  assert.ok(valueOf(metrics, "editor_request_memory_limit_bytes") > 1e6);
  assert.ok(valueOf(metrics, "process_resident_memory_bytes") > 1e6);
  assert.match(metrics, /^editor_build_info\{version="[0-9.]+"\} 1$/m);
  const promtool = spawnSync("promtool", ["check", "metrics"], { input: metrics });
  if (promtool.error?.code === "ENOENT") {
    t.diagnostic("the format is not checked without promtool, of the package prometheus");
  } else {
    assert.equal(promtool.status, 0, `${promtool.stdout}${promtool.stderr}`);
  }
  // The alerts use reported figures only.
  const file = join(ROOT, "packaging/prometheus/editor-serialization.rules.yml");
  const rules = readFileSync(file, "utf8");
  const names = new Set(rules.match(/\b(editor|process)_[a-z_]+\b/g));
  assert.ok(names.size >= 6);
  if (IS_SANITIZED) {
    names.delete("editor_memory_limit_bytes"); // Without a limit there is none to report.
  }
  for (const name of names) {
    assert.match(metrics, new RegExp(`^${name}[{ ]`, "m"));
  }
  const checked = spawnSync("promtool", ["check", "rules", file]);
  assert.ok(checked.error || checked.status === 0, `${checked.stdout}${checked.stderr}`);
});

test("it is healthy while its root can be read", async (t) => {
  const { root, url } = await startWithMetrics(t);
  const healthUrl = new URL("/healthz", url);
  const statusIs = (status) => async () => (await fetch(healthUrl)).status === status;
  await waitFor("health", statusIs(200));
  renameSync(root, `${root}.away`);
  await waitFor("the loss of the root", statusIs(503));
  assert.match(await (await fetch(healthUrl)).text(), /a folder of --root cannot be read/);
  renameSync(`${root}.away`, root);
  await waitFor("health", statusIs(200));
});

test("it is not healthy without a connection to the message servers", async (t) => {
  const { host, url } = await startWithMetrics(t);
  const healthUrl = new URL("/healthz", url);
  await waitFor("health", async () => (await fetch(healthUrl)).status === 200);
  assert.equal(valueOf(await metricsAt(url), "editor_bus_reconnects_total"), 0);
  process.kill(host.serverId(), "SIGKILL");
  await waitFor("the loss of the server", async () => (await fetch(healthUrl)).status === 503);
  await waitFor("health", async () => (await fetch(healthUrl)).status === 200);
  // Those for short messages, for requests to write, and for pieces.
  await waitFor(
    "the count of the new connections",
    async () => valueOf(await metricsAt(url), "editor_bus_reconnects_total") === 3,
  );
});

test("it tells nothing unless it is asked to, and nothing else", async (t) => {
  const { url } = await startWithMetrics(t);
  for (const path of ["/", "/metrics/", "/index.html"]) {
    assert.equal((await fetch(new URL(path, url))).status, 404, path);
  }
  assert.equal((await fetch(url, { method: "POST" })).status, 405);
  const silent = await Host.start(t, []);
  assert.doesNotMatch(silent.output, /^metrics:/m);
});
