// SPDX-License-Identifier: Apache-2.0
// A host with a message server of its own, from its start to its end.
import assert from "node:assert/strict";
import {
  existsSync,
  mkdirSync,
  readFileSync,
  readdirSync,
  statSync,
  symlinkSync,
  truncateSync,
  unlinkSync,
  writeFileSync,
} from "node:fs";
import { createServer } from "node:net";
import { totalmem } from "node:os";
import { dirname, join } from "node:path";
import { test } from "node:test";
import { setTimeout as sleep } from "node:timers/promises";

import { Client, READ_REQUEST, READ_RESPONSE, encode, parseUrl } from "./client.mjs";
import {
  HOST,
  Host,
  IS_SANITIZED,
  Program,
  ROOT,
  atEnd,
  isRunning,
  temporaryFolder,
  waitFor,
} from "./processes.mjs";
import { RawClient } from "./raw_client.mjs";

const UNRESPONSIVE_BUNDLE = process.env.UNRESPONSIVE_BUNDLE;

async function connected(test, host, options) {
  const client = await Client.connect(host.webSocket, options);
  atEnd(test, () => client.close());
  return client;
}

// A host whose message server's files are in a folder of the test's.
async function hostWithRuntimeFolder(test, args) {
  const folder = temporaryFolder(test);
  const host = await Host.start(test, args, folder);
  return { host, folder };
}

test("it serves what any server with workers does", async (t) => {
  const folder = temporaryFolder(t);
  const host = await Host.start(t, ["--root", folder]);
  const suite = new Program(t, [
    process.execPath,
    join(ROOT, "tests/serve/client_suite.mjs"),
    ...["--websocket", host.webSocket, "--nats", host.nats, "--folder", folder, "--origins"],
    ...(IS_SANITIZED ? ["--connections", "200"] : []),
  ]);
  assert.equal(await suite.end, 0, `${suite.output}\n${suite.errors}\n${host.errors}`);
});

test("its message server collects garbage seldom, but below a bound of its memory", async (t) => {
  const host = await Host.start(t, []);
  const environment = readFileSync(`/proc/${host.serverId()}/environ`, "latin1").split("\0");
  assert.ok(environment.includes("GOGC=400"));
  const bound = Number(environment.find((one) => one.startsWith("GOMEMLIMIT="))?.split("=")[1]);
  assert.ok(bound > 0 && bound < totalmem(), `${bound}`);
});

test("its password is in nobody's sight", async (t) => {
  const { host, folder } = await hostWithRuntimeFolder(t, ["--listen", "127.0.0.1:0"]);
  const { password } = parseUrl(host.webSocket);
  assert.match(password, /^[0-9a-f]{64}$/);
  const client = await connected(t, host);
  await client.read("/no/such/file");
  await fetch(host.page);
  for (const id of [host.id, host.serverId()]) {
    assert.ok(!readFileSync(`/proc/${id}/cmdline`, "latin1").includes(password));
    assert.ok(!readFileSync(`/proc/${id}/environ`, "latin1").includes(password));
  }
  assert.ok(!host.errors.includes(password));
  const [name, ...others] = readdirSync(folder);
  assert.deepEqual(others, []);
  assert.equal(statSync(join(folder, name)).mode & 0o777, 0o700);
  assert.equal(statSync(join(folder, name, "nats-server.conf")).mode & 0o777, 0o600);
});

test("its password is another each time", async (t) => {
  const hosts = [await Host.start(t, []), await Host.start(t, [])];
  const [one, other] = hosts.map((host) => parseUrl(host.nats).password);
  assert.notEqual(one, other);
});

test("it takes the ports that it is told to", async (t) => {
  const other = createServer().listen(0, "127.0.0.1");
  await new Promise((resolve) => other.once("listening", resolve));
  const { port } = other.address();
  const refused = new Program(t, [HOST, "serve", "--no-web", "--port", `${port}`]);
  assert.equal(await refused.end, 1);
  assert.match(refused.errors, /nats-server does not start .*address already in use/);
  other.close();
  const host = await Host.start(t, ["--port", `${port}`]);
  assert.equal(parseUrl(host.nats).port, port);
});

test("a page of an allowed origin connects, and of no other", async (t) => {
  const host = await Host.start(t, [
    ...["--listen", "127.0.0.1:0", "--allow-origin", "http://localhost:3000"],
    ...["--allow-origin", "https://example.org"],
  ]);
  for (const origin of [new URL(host.page).origin, "http://localhost:3000", "https://example.org"]) {
    (await RawClient.open(host.webSocket, { origin })).close();
  }
  for (const origin of ["http://localhost:3001", "http://example.org", "http://127.0.0.1:1"]) {
    await assert.rejects(RawClient.open(host.webSocket, { origin }), /403 Forbidden/, origin);
  }
});

// Its threads, those of the page included, take a part of that for their stacks.
test("it serves with the least memory that it may have", { skip: IS_SANITIZED }, async (t) => {
  const folder = temporaryFolder(t);
  writeFileSync(join(folder, "a.txt"), "text");
  const least = ["--memory-limit", "64MB", "--root", folder, "--listen", "127.0.0.1:0"];
  const host = await Host.start(t, least);
  const client = await connected(t, host);
  const pages = Array.from({ length: 20 }, () => fetch(host.page));
  const reads = Array.from({ length: 20 }, () => client.read(join(folder, "a.txt")));
  for (const answer of await Promise.all(reads)) {
    assert.deepEqual(answer, { data: "text", status: true });
  }
  await Promise.all(pages);
  assert.ok(!host.hasEnded, host.errors);
});

test("its message server is held to a limit of its own", { skip: IS_SANITIZED }, async (t) => {
  const host = await Host.start(t, ["--memory-limit", "64MB"]);
  const limitOf = (id) => readFileSync(`/proc/${id}/limits`, "utf8").match(/Max data size.*/)[0];
  assert.match(limitOf(host.id), / 67108864 /);
  assert.equal(limitOf(host.serverId()), limitOf("self"));
  const environment = readFileSync(`/proc/${host.serverId()}/environ`, "utf8").split("\0");
  const [limit, ...others] = environment.filter((entry) => entry.startsWith("GOMEMLIMIT="));
  assert.match(limit, /^GOMEMLIMIT=[1-9]\d{7,}$/);
  assert.deepEqual(others, []);
});

test("a message server that is killed is started again, and clients go on", async (t) => {
  const host = await Host.start(t, []);
  const client = await connected(t, host, { maxReconnectAttempts: -1, reconnectTimeWait: 50 });
  for (let count = 1; count <= 3; ++count) {
    const id = host.serverId();
    const start = Date.now();
    process.kill(id, "SIGKILL");
    const answer = await client.read("/no/such/file", "text/plain", { seconds: 0.5, tries: 60 });
    assert.equal(answer.status, false);
    assert.notEqual(host.serverId(), id);
    t.diagnostic(`an answer came ${Date.now() - start} ms after the kill`);
  }
  assert.match(host.errors, /nats-server has ended \(signal 9\) and is started again/);
  assert.match(host.errors, /Connected to NATS again/);
});

test("a message server that does not stay is started again ever more slowly", async (t) => {
  const folder = temporaryFolder(t);
  const [program, isIll, starts] = ["nats-server", "is ill", "starts"].map((name) =>
    join(folder, name),
  );
  const script = [
    "#!/bin/sh",
    `echo >>"${starts}"`,
    `test -e "${isIll}" && exit 3`,
    `PATH="$PATH:/usr/sbin" exec nats-server "$@"`,
  ];
  writeFileSync(program, script.join("\n"), { mode: 0o700 });
  const host = await Host.start(t, ["--nats-server", program]);
  writeFileSync(isIll, "");
  const start = performance.now();
  process.kill(host.serverId(), "SIGKILL");
  await waitFor("five more starts", () => readFileSync(starts).length >= 6);
  assert.ok(performance.now() - start >= 50 + 100 + 200 + 400 + 800);
  assert.match(host.errors, /nats-server has ended \(exit status 3\) and is started again/);
  unlinkSync(isIll);
  const client = await connected(t, host, { waitOnFirstConnect: true, maxReconnectAttempts: -1 });
  const answer = await client.read("/no/such/file", "text/plain", { seconds: 1, tries: 30 });
  assert.equal(answer.status, false);
});

for (const signal of ["SIGTERM", "SIGINT"]) {
  test(`${signal} has it finish what it has taken`, async (t) => {
    const { host, folder } = await hostWithRuntimeFolder(t, []);
    const serverId = host.serverId();
    const documents = temporaryFolder(t);
    const file = join(documents, "large.txt");
    writeFileSync(file, "x".repeat(IS_SANITIZED ? 2_000_000 : 8_000_000));
    const client = await connected(t, host, { reconnect: false });
    const answers = Array.from({ length: 5 }, () => client.read(file));
    await client.connection.flush(); // The server has passed the requests on.
    host.signal(signal);
    for (const answer of await Promise.all(answers)) {
      assert.equal(answer.data.length, statSync(file).size);
    }
    assert.equal(await host.end, 0, host.errors);
    assert.ok(!isRunning(serverId));
    assert.deepEqual(readdirSync(folder), []);
  });
}

test("its message server is listened to while clients take their last answers", async (t) => {
  const folder = temporaryFolder(t);
  const file = join(folder, "large.txt");
  writeFileSync(file, "x".repeat(8_000_000));
  const host = await Host.start(t, []);
  const { user } = parseUrl(host.nats);
  const slow = await RawClient.connect(host.nats);
  atEnd(t, () => slow.close());
  const rtcId = `${user}.slow`;
  slow.send(`SUB ${READ_RESPONSE}${rtcId} 1\r\n`);
  // More than sockets hold.
  for (let count = 0; count < 3; ++count) {
    slow.publish(READ_REQUEST, encode({ rtcId, contentType: "text/plain", filePath: file }));
  }
  await slow.waitFor("MSG ");
  slow.socket.pause();
  const forger = await RawClient.connect(host.nats);
  atEnd(t, () => forger.close());
  host.signal("SIGTERM");
  await waitFor("the signal", () => host.errors.includes("asked to by signal 15"));
  // The server has a line to say about each: more than a pipe holds.
  for (let count = 0; count < 2000; ++count) {
    forger.publish("forbidden", "x");
  }
  forger.received = "";
  forger.send("PING\r\n");
  await forger.waitFor("PONG");
  slow.socket.resume();
  assert.equal(await host.end, 0, host.errors);
});

test("a second signal ends it at once", async (t) => {
  const { host, folder } = await hostWithRuntimeFolder(t, ["--bundle", UNRESPONSIVE_BUNDLE]);
  const serverId = host.serverId();
  const client = await connected(t, host, { reconnect: false });
  client.connection.publish(READ_REQUEST, encode("stuck"));
  await client.connection.flush();
  await waitFor("the request", () => host.errors.includes("stuck in a request"));
  host.signal("SIGTERM");
  await waitFor("the first signal", () => host.errors.includes("asked to by signal 15"));
  await sleep(200); // time for an end that one signal brings
  assert.ok(!host.hasEnded);
  host.signal("SIGTERM");
  assert.equal(await host.end, 1);
  assert.deepEqual(readdirSync(folder), []);
  await waitFor("the server's end", () => !isRunning(serverId), 5);
});

test("its message server goes with it when it is killed, and the next host cleans up", async (t) => {
  const { host, folder } = await hostWithRuntimeFolder(t, []);
  const [left] = readdirSync(folder);
  const serverId = host.serverId();
  assert.ok(isRunning(serverId));
  host.signal("SIGKILL");
  await host.end;
  await waitFor("the server's end", () => !isRunning(serverId), 5);
  assert.deepEqual(readdirSync(folder), [left]);
  await Host.start(t, [], folder);
  const [name, ...others] = readdirSync(folder);
  assert.notEqual(name, left);
  assert.deepEqual(others, []);
});

test("clients get to no file outside of its roots", async (t) => {
  const folder = temporaryFolder(t);
  const [inside, outside] = [join(folder, "inside"), join(folder, "outside")];
  for (const name of [inside, outside]) {
    mkdirSync(name);
    writeFileSync(join(name, "file.txt"), "text\n");
  }
  symlinkSync(outside, join(inside, "link"));
  // Too large to be answered, which would tell its size.
  writeFileSync(join(outside, "large.txt"), "");
  truncateSync(join(outside, "large.txt"), 100_000_000);
  const host = await Host.start(t, ["--root", inside]);
  const client = await connected(t, host);
  assert.equal((await client.read(join(inside, "file.txt"))).data, "text\n");
  assert.equal(await client.write(join(inside, "new.txt"), "new\n"), true);
  const paths = [
    join(outside, "file.txt"),
    join(outside, "large.txt"),
    `${inside}/../outside/file.txt`,
    `${inside}/link/file.txt`,
    `/proc/self/root${outside}/file.txt`,
    `/proc/self/cwd/../../../../../../../../..${outside}/file.txt`,
    "/etc/hostname",
    "/proc/self/environ",
    join(dirname(HOST), "../lib/libcom_vorplanex_serialization.so"),
  ];
  for (const path of paths) {
    assert.deepEqual(await client.read(path), { data: "", status: true }, path);
    assert.equal(await client.write(path, "changed\n"), false, path);
  }
  for (const path of [join(outside, "file.txt"), `${inside}/link/file.txt`]) {
    assert.ok(host.errors.includes(`refused ${path}, which is in no folder of --root`), path);
  }
  assert.equal(await client.write(join(outside, "new.txt"), "new\n"), false);
  assert.ok(!existsSync(join(outside, "new.txt")));
  assert.equal(readFileSync(join(outside, "file.txt"), "utf8"), "text\n");
  const document = { parts: [], relationships: [] };
  const more = { contentType: "text/xml" };
  assert.equal(await client.write(join(outside, "new.docx"), document, more), false);
  assert.equal(await client.write(join(inside, "new.docx"), document, more), true);
});

test("its server's files are closed to clients, and still open to the server", async (t) => {
  const inside = temporaryFolder(t);
  const { host, folder } = await hostWithRuntimeFolder(t, ["--root", inside]);
  const [name] = readdirSync(folder);
  const client = await connected(t, host, { maxReconnectAttempts: -1, reconnectTimeWait: 50 });
  assert.deepEqual(await client.read(join(folder, name, "nats-server.conf")), {
    data: "",
    status: true,
  });
  process.kill(host.serverId(), "SIGKILL");
  const answer = await client.read("/no/such/file", "text/plain", { seconds: 1, tries: 30 });
  assert.equal(answer.status, false);
  host.signal("SIGTERM");
  assert.equal(await host.end, 0);
  assert.deepEqual(readdirSync(folder), []);
});
