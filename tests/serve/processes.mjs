// SPDX-License-Identifier: Apache-2.0
// Programs that the tests run: hosts, message servers, other test programs.
import assert from "node:assert/strict";
import { spawn } from "node:child_process";
import { mkdtempSync, readFileSync, readdirSync, rmSync } from "node:fs";
import { tmpdir } from "node:os";
import { join } from "node:path";
import { setTimeout as sleep } from "node:timers/promises";

// The program to test.
export const HOST = process.env.SERIALIZATION_HOST;

// Under the sanitizers, programs are many times slower and get less to do.
export const IS_SANITIZED = Boolean(process.env.IS_SANITIZED);

// In the emulator, which knows nothing of Landlock.
const IS_EMULATED = Boolean(process.env.IS_EMULATED);

// Whether there is time for what takes more than some seconds: at night.
export const IS_LONG = process.env.EDITOR_SERIALIZATION_LONG_TESTS === "1";

export const ROOT = new URL("../../", import.meta.url).pathname;

const actionsAtEnd = new WeakMap();

// Has `action` done when the test is over, after those that are asked for later: a client leaves before its server
// ends, and that before its folder is removed. Hooks of `test` itself run the other way round.
export function atEnd(test, action) {
  if (!actionsAtEnd.has(test)) {
    const actions = [];
    actionsAtEnd.set(test, actions);
    test.after(async () => {
      const failures = [];
      while (actions.length > 0) {
        await Promise.resolve().then(actions.pop()).catch((failure) => failures.push(failure));
      }
      if (failures.length > 0) {
        throw failures[0];
      }
    });
  }
  actionsAtEnd.get(test).push(action);
}

// A new folder, which is removed when the test is over.
export function temporaryFolder(test, parent = tmpdir()) {
  const folder = mkdtempSync(join(parent, "serve-test-"));
  atEnd(test, () => rmSync(folder, { recursive: true, force: true }));
  return folder;
}

// Waits until `condition` returns something that counts as true, and returns that.
export async function waitFor(what, condition, seconds = 240) {
  const latest = Date.now() + seconds * 1000;
  for (;;) {
    const result = await condition();
    if (result) {
      return result;
    }
    if (Date.now() > latest) {
      throw new Error(`gave up waiting for ${what}`);
    }
    await sleep(10);
  }
}

export function isRunning(id) {
  try {
    // Of a process that has ended and was not collected, no command line is left.
    return readFileSync(`/proc/${id}/cmdline`).length > 0;
  } catch {
    return false;
  }
}

export class Program {
  constructor(test, command, environment = {}) {
    // A test program among them reports to people, not to the runner of this one.
    const { NODE_TEST_CONTEXT, ...env } = process.env;
    // Earlier versions must not be kept among the user's own.
    env.XDG_STATE_HOME = temporaryFolder(test);
    if (IS_SANITIZED) {
      const suppressions = join(ROOT, "tests/serve/thread_sanitizer.supp");
      env.TSAN_OPTIONS = `${env.TSAN_OPTIONS ?? ""}:suppressions="${suppressions}"`;
    }
    if (IS_SANITIZED && command.includes("--root")) {
      // The search for leaks needs files below /proc that a confined host is kept from.
      env.ASAN_OPTIONS = `${env.ASAN_OPTIONS ?? ""}:detect_leaks=0`;
    }
    const confinement = IS_EMULATED && command.includes("--root") ? ["--no-confinement"] : [];
    this.process = spawn(command[0], [...command.slice(1), ...confinement], {
      stdio: ["ignore", "pipe", "pipe"],
      env: { ...env, ...environment },
    });
    this.output = "";
    this.errors = "";
    this.process.stdout.setEncoding("utf8").on("data", (text) => (this.output += text));
    this.process.stderr.setEncoding("utf8").on("data", (text) => (this.errors += text));
    // Resolves to the exit status, or to the name of the signal that ended the program.
    this.end = new Promise((resolve, reject) => {
      this.process.once("error", reject);
      this.process.once("close", (status, signal) => {
        this.hasEnded = true;
        resolve(status ?? signal);
      });
    });
    atEnd(test, () => this.kill());
  }

  get id() {
    return this.process.pid;
  }

  signal(name) {
    this.process.kill(name);
  }

  async kill() {
    this.signal("SIGKILL");
    await this.end;
  }

  async waitForOutput(pattern) {
    return waitFor(`${pattern} in the output of ${this.process.spawnargs.join(" ")}`, () => {
      const match = this.output.match(pattern);
      if (!match && this.hasEnded) {
        throw new Error(`the program has ended: ${this.errors}`);
      }
      return match;
    });
  }
}

// A host that serves, and how to reach it.
export class Host extends Program {
  // One with a server of its own, whose files are in a folder below `folder`, and without a web page
  // unless `args` ask for one.
  static async start(test, args, folder = temporaryFolder(test)) {
    const environment = { XDG_RUNTIME_DIR: folder };
    const web = args.includes("--web") || args.includes("--listen") ? [] : ["--no-web"];
    const host = new Host(test, [HOST, "--log-level", "info", "serve", ...web, ...args], environment);
    await host.waitForOutput(/^websocket: .*\n/m);
    host.page = host.output.match(/^page: (.*)$/m)?.[1];
    host.nats = host.output.match(/^nats: (.*)$/m)[1];
    host.webSocket = host.output.match(/^websocket: (.*)$/m)[1];
    return host;
  }

  // The process of the host's message server.
  serverId() {
    const children = readdirSync(`/proc/${this.id}/task`).flatMap((thread) =>
      readFileSync(`/proc/${this.id}/task/${thread}/children`, "utf8").split(" ").filter(Boolean),
    );
    assert.equal(children.length, 1);
    return Number(children[0]);
  }
}
