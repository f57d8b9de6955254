// SPDX-License-Identifier: Apache-2.0
// The web page of a host that serves, over HTTP.
import assert from "node:assert/strict";
import { mkdirSync, readFileSync, symlinkSync, writeFileSync } from "node:fs";
import { request } from "node:http";
import { connect } from "node:net";
import { join } from "node:path";
import { test } from "node:test";

import { HOST, Host, Program, ROOT, temporaryFolder, waitFor } from "./processes.mjs";

// The answer to a request whose path is sent as it stands, where fetch would tidy it up.
function ask(origin, path, { method = "GET", headers = {} } = {}) {
  const { hostname, port } = new URL(origin);
  return new Promise((resolve, reject) => {
    const options = { hostname, port, path, method, headers };
    request(options, (response) => {
      const pieces = [];
      response.on("data", (piece) => pieces.push(piece));
      response.on("end", () =>
        resolve({
          status: response.statusCode,
          headers: response.headers,
          body: Buffer.concat(pieces).toString("latin1"),
        }),
      );
    })
      .on("error", reject)
      .end();
  });
}

// A host that serves a folder with a few files, and others beside it.
async function startWithFolder(test) {
  const folder = temporaryFolder(test);
  const web = join(folder, "web");
  mkdirSync(join(web, "below"), { recursive: true });
  mkdirSync(join(web, ".git"));
  writeFileSync(join(web, "index.html"), "<p>front</p>");
  writeFileSync(join(web, "below/index.html"), "<p>below</p>");
  writeFileSync(join(web, "below/a b.js"), "1");
  writeFileSync(join(web, ".git/config"), "secret");
  writeFileSync(join(folder, "secret.html"), "secret");
  symlinkSync(join(folder, "secret.html"), join(web, "link.html"));
  symlinkSync(folder, join(web, "folder"));
  const host = await Host.start(test, ["--listen", "127.0.0.1:0", "--web", web]);
  return { host, origin: new URL(host.page).origin };
}

test("its own page is served with all that it loads", async (t) => {
  const host = await Host.start(t, ["--listen", "127.0.0.1:0"]);
  const page = await (await fetch(host.page)).text();
  const files = [...page.matchAll(/(?:src|href)="([^"]+)"/g)].map((match) => match[1]);
  assert.deepEqual(files.sort(), ["icon.svg", "main.css", "main.js"]);
  const script = await (await fetch(new URL("main.js", host.page))).text();
  const chunks = [...script.matchAll(/import\("\.\/([^"]+)"\)/g)].map((match) => match[1]);
  assert.ok(chunks.length >= 2, script.slice(0, 1000));
  files.push(...chunks);
  for (const file of files) {
    const response = await fetch(new URL(file, host.page));
    assert.equal(response.status, 200, file);
    assert.equal(await response.text(), readFileSync(join(ROOT, "web/dist", file), "utf8"), file);
  }
});

test("the page lets no script run but its own", async (t) => {
  const host = await Host.start(t, ["--listen", "127.0.0.1:0"]);
  const page = await (await fetch(host.page)).text();
  const [, policy] = page.match(/http-equiv="Content-Security-Policy"\s+content="([^"]+)"/);
  const directives = Object.fromEntries(policy.split("; ").map((one) => one.split(/ (.*)/s)));
  assert.equal(directives["default-src"], "'none'");
  assert.equal(directives["script-src"], "'self'");
  assert.doesNotMatch(page, /<script(?![^>]*\ssrc=)|\son\w+=/);
});

test("the page's address tells how to connect in its fragment, and nowhere else", async (t) => {
  const host = await Host.start(t, ["--listen", "127.0.0.1:0"]);
  const url = new URL(host.page);
  assert.equal(url.pathname + url.search, "/");
  const settings = Object.fromEntries(new URLSearchParams(url.hash.slice(1)));
  const { username: user, password, host: server } = new URL(host.webSocket);
  assert.deepEqual(settings, { server: `ws://${server}`, user, password });
});

test("files come with their types, and headers that keep browsers safe", async (t) => {
  const { origin } = await startWithFolder(t);
  const types = {
    "/": "text/html; charset=utf-8",
    "/index.html?with=query": "text/html; charset=utf-8",
    "/below/": "text/html; charset=utf-8",
    "/below/a%20b.js": "text/javascript; charset=utf-8",
  };
  for (const [path, type] of Object.entries(types)) {
    const { status, headers } = await ask(origin, path);
    assert.equal(status, 200, path);
    assert.equal(headers["content-type"], type);
    assert.equal(headers["x-content-type-options"], "nosniff");
    assert.equal(headers["referrer-policy"], "no-referrer");
    assert.match(headers["content-security-policy"], /default-src 'self'.*frame-ancestors 'none'/);
  }
  const head = await ask(origin, "/", { method: "HEAD" });
  assert.deepEqual([head.status, head.body], [200, ""]);
  assert.equal(head.headers["content-length"], "12");
});

test("nothing outside of the folder is served", async (t) => {
  const { origin } = await startWithFolder(t);
  const paths = [
    ...["/../secret.html", "/%2e%2e/secret.html", "/..%2fsecret.html", "/below/../../secret.html"],
    ...["/link.html", "/folder/secret.html", "/folder/web/index.html"],
    ...["/.git/config", "/%2egit/config", "//etc/hostname", "/%2fetc/hostname", "/etc/hostname"],
    ...["/index.html%00.js", "/below", "/index.html/", "/./index.html", "/no-such-file"],
  ];
  for (const path of paths) {
    const { status, body } = await ask(origin, path);
    assert.equal(status, 404, path);
    assert.ok(!body.includes("secret"), path);
  }
});

test("a site whose name points here gets nothing", async (t) => {
  const { origin } = await startWithFolder(t);
  for (const name of ["example.org", "localhost", "127.0.0.1", "127.0.0.1:1"]) {
    assert.equal((await ask(origin, "/", { headers: { Host: name } })).status, 421, name);
  }
});

test("only GET and HEAD are answered", async (t) => {
  const { origin } = await startWithFolder(t);
  for (const method of ["POST", "PUT", "DELETE", "OPTIONS"]) {
    const { status, headers } = await ask(origin, "/", { method });
    assert.deepEqual([status, headers.allow], [405, "GET, HEAD"], method);
  }
});

test("files are sent whole, whatever parts are asked for", async (t) => {
  const { origin } = await startWithFolder(t);
  const headers = { range: `bytes=${"0-,".repeat(2000)}0-` };
  const { status, body } = await ask(origin, "/", { headers });
  assert.deepEqual([status, body], [200, "<p>front</p>"]);
});

test("clients that send without end, or not at all, are cut off", async (t) => {
  const { host, origin } = await startWithFolder(t);
  const { hostname, port } = new URL(origin);
  const sockets = Array.from({ length: 24 }, (_, index) => {
    const socket = connect({ host: hostname, port });
    socket.on("error", () => {});
    socket.on("close", () => (socket.isClosed = true));
    socket.resume();
    socket.write(index % 2 === 0 ? "GET / HTTP/1.1\r\nx: " : "GET / HT");
    if (index % 4 === 0) {
      socket.write("x".repeat(1_000_000));
    }
    return socket;
  });
  assert.equal((await ask(origin, "/")).status, 200);
  await waitFor("the end of the connections", () => sockets.every((socket) => socket.isClosed));
  host.signal("SIGTERM");
  assert.equal(await host.end, 0);
});

test("an address that is taken is told of", async (t) => {
  const { origin } = await startWithFolder(t);
  const second = new Program(t, [HOST, "serve", "--listen", new URL(origin).host]);
  assert.equal(await second.end, 1);
  assert.match(second.errors, /cannot listen at 127\.0\.0\.1:\d+: Address already in use/);
});
