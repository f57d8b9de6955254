// SPDX-License-Identifier: Apache-2.0
// The client library as the package that `npm pack` makes of it, in a project of somebody else's.
import assert from "node:assert/strict";
import { execFileSync } from "node:child_process";
import { cpSync, mkdirSync, readFileSync, readdirSync, symlinkSync, writeFileSync } from "node:fs";
import { join } from "node:path";
import { test } from "node:test";

import { ROOT, temporaryFolder } from "./processes.mjs";

const CLIENT = join(ROOT, "web/client");

const USE = `
import { AskAgain, connect, utf8, type Document, type ReadAnswer } from "editor-serialization-client";

export async function copy(from: string, to: string): Promise<boolean> {
  const client = await connect({ servers: "ws://127.0.0.1:1", user: "ada", pass: "secret" });
  const answer: ReadAnswer = await client.read(from, "text/xml", { timeout: 1000, onProgress: ({ bytes }) => bytes });
  const document: Document = { parts: answer.parts ?? [], relationships: answer.relationships ?? [] };
  return (await client.write(to, document)) && client.write(to, utf8("text"), { encoding: "UTF-8" });
}
export const isLost = (error: unknown): boolean => error instanceof AskAgain;
`;

// What `npm pack` puts into the package, with what it depends on beside it.
function installed(test) {
  const folder = temporaryFolder(test);
  const copy = join(folder, "client");
  mkdirSync(copy);
  for (const name of readdirSync(CLIENT).filter((name) => name !== "node_modules")) {
    cpSync(join(CLIENT, name), join(copy, name), { recursive: true });
  }
  const pack = ["pack", "--ignore-scripts", "--pack-destination", folder];
  execFileSync("npm", pack, { cwd: copy, stdio: "pipe" });
  const modules = join(folder, "project/node_modules");
  const target = join(modules, "editor-serialization-client");
  mkdirSync(target, { recursive: true });
  const archive = readdirSync(folder).find((name) => name.endsWith(".tgz"));
  execFileSync("tar", ["-xzf", join(folder, archive), "-C", target, "--strip-components=1"]);
  symlinkSync(join(CLIENT, "node_modules/@nats-io"), join(modules, "@nats-io"));
  return { project: join(folder, "project"), target };
}

test("the package has the module, its types and the README, and no more", (t) => {
  const { target } = installed(t);
  const { main, types, type } = JSON.parse(readFileSync(join(target, "package.json")));
  assert.equal(type, "module");
  const files = readdirSync(target).concat(readdirSync(join(target, "dist")).map((name) => `dist/${name}`));
  for (const file of ["README.md", main, types]) {
    assert.ok(files.includes(file), `${file} in ${files}`);
  }
  assert.deepEqual(readdirSync(target).sort(), ["README.md", "dist", "package.json"]);
});

test("it is imported as an ES module", (t) => {
  const { project } = installed(t);
  const script = 'console.log(Object.keys(await import("editor-serialization-client")).join(" "))';
  const names = execFileSync(process.execPath, ["--input-type=module", "-e", script], { cwd: project, encoding: "utf8" });
  for (const name of ["AskAgain", "Client", "connect", "utf8"]) {
    assert.ok(names.split(/\s/).includes(name), names);
  }
});

test("its types fit programs in TypeScript, and misuse is told", (t) => {
  const { project } = installed(t);
  const compile = (source) => {
    writeFileSync(join(project, "use.ts"), source);
    const options = ["--noEmit", "--strict", "--skipLibCheck", "--target", "es2022", "--module", "nodenext", "use.ts"];
    return execFileSync(process.execPath, [join(CLIENT, "node_modules/typescript/bin/tsc"), ...options], {
      cwd: project,
      encoding: "utf8",
    });
  };
  writeFileSync(join(project, "package.json"), '{ "type": "module" }');
  compile(USE);
  assert.throws(
    () => compile(USE.replace("timeout: 1000", 'timeout: "soon"')),
    ({ stdout }) => /Type 'string' is not assignable to type 'number'/.test(stdout),
  );
});
