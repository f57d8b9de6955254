// SPDX-License-Identifier: Apache-2.0
// The page in a real browser, driven by playwright-core, on a host of its own that serves a new folder: in
// Chromium, or with BROWSER=firefox in Firefox. Where there is no such browser the tests are skipped, with a
// line that says so.
import { existsSync, mkdirSync, readFileSync, writeFileSync } from "node:fs";
import { createRequire } from "node:module";
import { dirname, join } from "node:path";
import { after, test } from "node:test";

import { Host, ROOT, atEnd, temporaryFolder, waitFor } from "../../serve/processes.mjs";

const { chromium, firefox } = createRequire(join(ROOT, "web/package.json"))("playwright-core");

const BROWSERS = {
  chromium: {
    type: chromium,
    executablePath: process.env.CHROMIUM || "/usr/bin/chromium",
    args: [
      // Chromium has no sandbox for root, the user of tests in containers.
      ...(process.getuid() === 0 ? ["--no-sandbox"] : []),
      ...["--disable-gpu", "--disable-quic", "--no-first-run", "--no-proxy-server"],
      ...["--disable-background-networking", "--disable-component-update", "--disable-sync"],
    ],
  },
  // As it comes; playwright's own is another build.
  firefox: { type: firefox, executablePath: process.env.FIREFOX || "/usr/bin/firefox-esr", channel: "moz-firefox" },
};
const BROWSER = process.env.BROWSER || "chromium";
const { type, ...launchOptions } = BROWSERS[BROWSER];
const IS_THERE = existsSync(launchOptions.executablePath);

let running; // the browser of this file's tests

async function browser() {
  running ??= type.launch(launchOptions);
  return running;
}

if (IS_THERE) {
  after(async () => (await running)?.close());
} else {
  // ctest is told to look for this line.
  console.error(`SKIPPED: there is no ${launchOptions.executablePath}, so the page is not tested in a browser`);
}

/** Why a test of what the driver of Firefox cannot do is skipped there. */
export const lackedByFirefox = (what) => BROWSER === "firefox" && `the driver of Firefox has no ${what}`;

/** A test, as those of node:test, that needs the browser. */
export function browserTest(name, ...rest) {
  const body = rest.pop();
  const { skip, ...options } = rest[0] ?? {};
  return test(name, { skip: IS_THERE ? skip : "there is no browser", ...options }, body);
}

// What the page of the browser has stored as drafts, as JSON; runs there.
function storedDrafts() {
  const result = (request) =>
    new Promise((resolve, reject) => {
      request.onsuccess = () => resolve(request.result);
      request.onerror = () => reject(request.error);
    });
  return result(indexedDB.open("editor")).then(async (database) => {
    const drafts = await result(database.transaction("drafts").objectStore("drafts").getAll());
    database.close();
    return JSON.stringify(drafts);
  });
}

const IS_LOCAL = /^(http|ws):\/\/127\.0\.0\.1:|^(blob|data|about):/;

/** A host, its folder of documents, and a page that is connected to it. */
export class Session {
  /**
   * `files` are those of the folder, contents by name. `hostOptions` are further ones of the command line.
   * Whatever is wrong on the page, from an exception to a request that leaves the machine, fails the test
   * at its end, unless it matches one of the patterns of `expectedProblems`.
   */
  static async start(test, files = {}, { hostOptions = [], expectedProblems = [], ...contextOptions } = {}) {
    const session = new Session(test, files);
    session.expectedProblems = expectedProblems;
    session.host = await Host.start(test, ["--listen", "127.0.0.1:0", "--root", session.folder, ...hostOptions]);
    atEnd(test, () => session.#end()); // before the host ends, which the page would complain of
    session.contextOptions = { locale: "en-US", ...contextOptions };
    session.context = await session.#newContext();
    session.page = await session.newPage();
    return session;
  }

  constructor(test, files) {
    this.folder = join(temporaryFolder(test), "documents");
    this.problems = [];
    this.contexts = [];
    mkdirSync(this.folder);
    for (const [name, content] of Object.entries(files)) {
      this.write(name, content);
    }
  }

  /** The path of a file of the folder, as clients ask for it. */
  path(name) {
    return join(this.folder, name);
  }

  /** The bytes of a file of the folder, as they are on disk now. */
  read(name) {
    return readFileSync(this.path(name));
  }

  write(name, content) {
    mkdirSync(dirname(this.path(name)), { recursive: true });
    writeFileSync(this.path(name), content);
  }

  /** Another page in the same browser, which shares its storage with the others. */
  async newPage(fragment = "") {
    return this.#openPage(this.context, fragment);
  }

  /** The page of another person, in a browser window of its own: neither hides the other, and slows it down. */
  async newWindow() {
    return this.#openPage(await this.#newContext(), "");
  }

  async #newContext() {
    const context = await (await browser()).newContext(this.contextOptions);
    this.contexts.push(context);
    return context;
  }

  async #openPage(context, fragment) {
    const page = await context.newPage();
    page.setDefaultTimeout(30_000);
    page.on("pageerror", (error) => this.#note(`exception: ${error.stack ?? error}`));
    page.on("console", (message) => message.type() === "error" && this.#note(`console: ${message.text()}`));
    page.on("request", (request) => IS_LOCAL.test(request.url()) || this.#note(`request: ${request.url()}`));
    await page.goto(this.host.page + fragment);
    await this.waitUntilConnected(page);
    return page;
  }

  waitUntilConnected(page = this.page) {
    return page.locator('[data-state="connected"]').first().waitFor({ state: "attached" });
  }

  /** Waits until the browser has stored a draft with `typed` in it. */
  async waitForDraft(page, typed) {
    const stored = JSON.stringify(typed).slice(1, -1);
    await waitFor("a draft", async () => (await page.evaluate(storedDrafts)).includes(stored));
  }

  #note(problem) {
    if (!this.expectedProblems.some((pattern) => pattern.test(problem))) {
      this.problems.push(problem);
    }
  }

  async #end() {
    await Promise.all(this.contexts.map((context) => context.close()));
    if (this.problems.length > 0) {
      throw new Error(`the page had problems:\n${this.problems.join("\n")}`);
    }
  }
}
