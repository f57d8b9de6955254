// SPDX-License-Identifier: Apache-2.0
// Saves of one document, on a disk that is a variable.
import assert from "node:assert/strict";
import { test } from "node:test";
import { setTimeout as sleep } from "node:timers/promises";

import { room } from "./room.mjs";

const { SaveRefused, Saver } = await room("save/saver.ts");

const textOf = (content) => ({ kind: "text", content, encoding: "UTF-8" });

// A host with one text, whose versions are "v" and what it holds, and a view on it.
class Desk {
  disk = "one";
  view = "one";
  writes = [];
  conflicts = [];
  saved = []; // as the view is told
  told = []; // what the view is told was sent
  typing; // what the view has not taken over from an editor yet
  decide = () => undefined;
  write = async (content, base) => this.store(content, base);
  load = async () => this.loaded();

  // Saves from now on are made, but nobody hears of it.
  loseAnswers() {
    this.write = async (content, base) => {
      this.store(content, base);
      throw new Error("no answer");
    };
  }

  store(content, base) {
    this.writes.push(content.content);
    if (base !== this.versionOf(this.disk)) {
      return { isSaved: content.content === this.disk, version: this.versionOf(content.content) };
    }
    this.disk = content.content;
    return { isSaved: true, version: this.versionOf(this.disk) };
  }

  versionOf(text) {
    return text === undefined ? "" : `v${text}`;
  }

  // `unsaved`: what a page that is gone has left.
  open(version = this.versionOf(this.disk), unsaved) {
    this.saver = new Saver(
      {
        draft: (sent) => (this.told.push(sent), this.view),
        content: async () => {
          if (this.typing !== undefined) {
            this.type(this.typing);
            this.typing = undefined;
          }
          return textOf(this.view);
        },
        write: (content, base) => this.write(content, base),
        saved: (content) => this.saved.push(content.content),
        load: () => this.load(),
        replace: (theirs) => (this.view = theirs.answer.data),
        resolve: async (theirs) => {
          this.conflicts.push(theirs?.answer.data);
          return this.decide(theirs);
        },
        update: () => {},
      },
      version,
      unsaved,
    );
    return this;
  }

  // The page is gone, and its draft, which holds `view`, is shown by another one. It was stored when `sent` had been
  // sent; or, without that, before anything was sent.
  reopen(version, view, sent) {
    this.view = view;
    const stateOf = (draft) => ({ draft, content: async () => textOf(draft) });
    return this.open(version, { held: stateOf(view), ...(sent !== undefined && { sent: stateOf(sent) }) });
  }

  loaded() {
    const version = this.versionOf(this.disk);
    return this.disk === undefined ? undefined : { path: "/t", version, answer: { status: true, data: this.disk } };
  }

  type(text) {
    this.view = text;
    this.saver.changed();
  }
}

test("what is saved is on disk, and no longer unsaved", async () => {
  const desk = new Desk().open();
  desk.type("two");
  assert.equal(desk.saver.isUnsaved, true);
  assert.equal(await desk.saver.save(), true);
  assert.equal(desk.disk, "two");
  assert.equal(desk.saver.isUnsaved, false);
  assert.equal(desk.saver.baseVersion, "vtwo");
});

test("what is typed during a save stays unsaved", async () => {
  const desk = new Desk().open();
  desk.write = async (content, base) => {
    desk.type("three");
    return desk.store(content, base);
  };
  desk.type("two");
  await desk.saver.save();
  assert.equal(desk.disk, "two");
  assert.equal(desk.saver.isUnsaved, true);
  assert.deepEqual(desk.saved, ["two"]);
});

test("one save is under way at a time, and of those wanted meanwhile the latest is made", async () => {
  const desk = new Desk().open();
  let underWay = 0;
  let answer;
  const isAnswered = new Promise((resolve) => (answer = resolve));
  desk.write = async (content, base) => {
    assert.equal(++underWay, 1);
    await isAnswered;
    --underWay;
    return desk.store(content, base);
  };
  const saves = [];
  for (let count = 0; count < 10; ++count) {
    desk.type(`text ${count}`);
    saves.push(desk.saver.save());
    await sleep(1);
  }
  answer();
  assert.deepEqual(new Set(await Promise.all(saves)), new Set([true]));
  assert.deepEqual(desk.writes, ["text 0", "text 9"]);
  assert.equal(desk.saver.isUnsaved, false);
  assert.deepEqual(desk.conflicts, []);
});

test("what somebody else saved is not overwritten unseen", async () => {
  const desk = new Desk().open();
  desk.type("mine");
  desk.disk = "theirs";
  assert.equal(await desk.saver.save(), false);
  assert.deepEqual(desk.conflicts, ["theirs"]);
  assert.deepEqual([desk.disk, desk.view, desk.saver.isUnsaved, desk.saver.hasTheirs], ["theirs", "mine", true, true]);
});

test("mine is kept when the person says so", async () => {
  const desk = new Desk().open();
  desk.decide = () => "mine";
  desk.type("mine");
  desk.disk = "theirs";
  assert.equal(await desk.saver.save(), true);
  assert.deepEqual([desk.disk, desk.saver.isUnsaved, desk.saver.hasTheirs], ["mine", false, false]);
});

test("theirs is taken when the person says so", async () => {
  const desk = new Desk().open();
  desk.decide = () => "theirs";
  desk.type("mine");
  desk.disk = "theirs";
  assert.equal(await desk.saver.save(), true);
  assert.deepEqual([desk.disk, desk.view, desk.saver.isUnsaved], ["theirs", "theirs", false]);
  desk.type("next");
  assert.equal(await desk.saver.save(), true);
  assert.equal(desk.disk, "next");
});

test("a save that comes while the person decides is not overwritten either", async () => {
  const desk = new Desk().open();
  const answers = ["mine", undefined];
  desk.decide = (theirs) => {
    desk.disk = `${theirs.answer.data}+`;
    return answers.shift();
  };
  desk.type("mine");
  desk.disk = "theirs";
  assert.equal(await desk.saver.save(), false);
  assert.deepEqual(desk.conflicts, ["theirs", "theirs+"]);
  assert.equal(desk.disk, "theirs++");
});

test("a save whose answer was lost is not taken for somebody else's", async () => {
  const desk = new Desk().open();
  desk.loseAnswers();
  desk.type("two");
  await assert.rejects(desk.saver.save(), /no answer/);
  desk.write = async (content, base) => desk.store(content, base);
  desk.type("three");
  assert.equal(await desk.saver.save(), true);
  assert.deepEqual([desk.disk, desk.conflicts], ["three", []]);
});

test("nor is one before it, of which there was no answer either", async () => {
  const desk = new Desk().open();
  desk.loseAnswers();
  desk.type("two");
  await assert.rejects(desk.saver.save(), /no answer/);
  desk.write = () => Promise.reject(new Error("nobody is there"));
  desk.type("three");
  await assert.rejects(desk.saver.save(), /nobody is there/);
  desk.write = async (content, base) => desk.store(content, base);
  desk.type("four");
  assert.equal(await desk.saver.save(), true);
  assert.deepEqual([desk.disk, desk.conflicts], ["four", []]);
});

test("a draft that the file holds by now is saved", async () => {
  const desk = new Desk();
  desk.disk = "two";
  desk.reopen("vone", "two");
  assert.equal(desk.saver.isUnsaved, true);
  assert.equal(await desk.saver.noticed(desk.loaded()), "same");
  assert.deepEqual([desk.saver.isUnsaved, desk.saver.hasTheirs, desk.saver.baseVersion], [false, false, "vtwo"]);
  assert.deepEqual([desk.saved, desk.conflicts], [["two"], []]);
});

test("what a page sent before it was gone may reach the file after its draft is shown again", async () => {
  const desk = new Desk().reopen("vone", "two");
  assert.equal(await desk.saver.noticed(desk.loaded()), "same");
  assert.equal(desk.saver.isUnsaved, true);
  desk.disk = "two";
  assert.equal(await desk.saver.followTheirs(), "same");
  assert.deepEqual([desk.saver.isUnsaved, desk.saver.baseVersion], [false, "vtwo"]);
});

test("a draft that was edited after a save was sent is based on that save, and unsaved", async () => {
  const desk = new Desk();
  desk.disk = "two";
  desk.reopen("vone", "three", "two");
  assert.equal(desk.saver.draft().sent, "two");
  assert.equal(await desk.saver.noticed(desk.loaded()), "same");
  assert.deepEqual([desk.saver.isUnsaved, desk.saver.draft()], [true, { version: "vtwo", content: "three" }]);
  assert.equal(await desk.saver.save(), true);
  assert.deepEqual([desk.disk, desk.conflicts], ["three", []]);
});

test("of a draft that was edited after a save was sent, the file may hold all", async () => {
  const desk = new Desk();
  desk.disk = "three";
  desk.reopen("vone", "three", "two");
  assert.equal(await desk.saver.noticed(desk.loaded()), "same");
  assert.deepEqual([desk.saver.isUnsaved, desk.saver.baseVersion], [false, "vthree"]);
});

test("what may reach the file after a draft is shown again is known whatever is typed meanwhile", async () => {
  for (const [disk, sent] of [["held", undefined], ["held", "sent"], ["sent", "sent"]]) {
    const desk = new Desk().reopen("vone", "held", sent);
    desk.type("later");
    assert.deepEqual(desk.saver.draft(), { version: "vone", content: "later", sent: sent ?? "held" });
    desk.disk = disk;
    assert.equal(await desk.saver.followTheirs(), "same");
    assert.deepEqual([desk.saver.isUnsaved, desk.saver.baseVersion], [true, `v${disk}`]);
  }
});

test("what somebody else saved while a draft lay is kept beside it", async () => {
  for (const sent of [undefined, "two"]) {
    const desk = new Desk();
    desk.disk = "theirs";
    desk.reopen("vone", "mine", sent);
    assert.equal(await desk.saver.noticed(desk.loaded()), "kept");
    assert.deepEqual([desk.saver.isUnsaved, desk.saver.hasTheirs, desk.view], [true, true, "mine"]);
    assert.equal(await desk.saver.save(), false);
    assert.deepEqual([desk.disk, desk.conflicts], ["theirs", ["theirs"]]);
  }
});

test("an empty draft of a file that was removed is not taken for saved", async () => {
  const desk = new Desk().reopen("vone", "");
  const removed = { path: "/t", version: "", answer: { status: true, data: "" } };
  assert.equal(await desk.saver.noticed(removed), "kept");
  assert.equal(desk.saver.isUnsaved, true);
});

test("while an answer is awaited, what is to be stored tells what was sent", async () => {
  const desk = new Desk().open();
  const told = [];
  desk.write = async (content, base) => {
    told.push(desk.saver.draft());
    desk.type("three");
    told.push(desk.saver.draft());
    return desk.store(content, base);
  };
  desk.type("two");
  await desk.saver.save();
  assert.deepEqual(told, [
    { version: "vone", content: "two", sent: "two" },
    { version: "vone", content: "three", sent: "two" },
  ]);
  assert.deepEqual(desk.saver.draft(), { version: "vtwo", content: "three" });
});

test("a view is told what was sent when it is asked what is unsaved", async () => {
  const desk = new Desk().open();
  desk.write = () => Promise.reject(new Error("no answer"));
  for (const text of ["two", "three"]) {
    desk.type(text);
    await assert.rejects(desk.saver.save(), /no answer/);
  }
  desk.saver.draft();
  assert.deepEqual(desk.told, [undefined, "two", "three"]);
});

test("what a view takes over from an editor when it is asked for its content is saved with it", async () => {
  const desk = new Desk().open();
  desk.type("tw");
  desk.typing = "two";
  assert.equal(await desk.saver.save(), true);
  assert.deepEqual([desk.disk, desk.saver.isUnsaved], ["two", false]);
});

test("a save that is found to be the page's own while it is refused is not asked about", async () => {
  const desk = new Desk().reopen("vone", "two");
  desk.disk = "two";
  desk.type("three");
  desk.load = async () => {
    const theirs = desk.loaded();
    void desk.saver.noticed(theirs); // which the page has read at the same time
    return theirs;
  };
  assert.equal(await desk.saver.save(), true);
  assert.deepEqual([desk.disk, desk.conflicts], ["three", []]);
});

test("a save that was made without an answer is no longer unsaved when it is heard of", async () => {
  const desk = new Desk().open();
  desk.loseAnswers();
  desk.type("two");
  await assert.rejects(desk.saver.save(), /no answer/);
  assert.equal(await desk.saver.followTheirs(), "same");
  assert.deepEqual([desk.saver.isUnsaved, desk.saver.baseVersion], [false, "vtwo"]);
});

test("without a word of the version, what was saved is looked at before it is built on", async () => {
  const desk = new Desk().open();
  let other;
  desk.write = async (content, base) => {
    const { isSaved } = desk.store(content, base);
    desk.disk = isSaved && other ? other : desk.disk;
    return { isSaved };
  };
  desk.type("two");
  await desk.saver.save();
  assert.equal(desk.saver.baseVersion, "vtwo");
  other = "theirs, right after the save";
  desk.type("three");
  await desk.saver.save();
  desk.type("four");
  assert.equal(await desk.saver.save(), false);
  assert.deepEqual(desk.conflicts, [other]);
  assert.equal(desk.disk, other);
});

test("a save that is refused though nobody else has saved is an error", async () => {
  const desk = new Desk().open();
  desk.write = async () => ({ isSaved: false });
  desk.type("two");
  await assert.rejects(desk.saver.save(), SaveRefused);
  assert.equal(desk.saver.isUnsaved, true);
});

test("a document that was removed is saved again when the person says so", async () => {
  const desk = new Desk().open();
  desk.decide = () => "mine";
  desk.type("two");
  desk.disk = undefined;
  assert.equal(await desk.saver.save(), true);
  assert.deepEqual([desk.conflicts, desk.disk], [[undefined], "two"]);
});

test("a file that cannot be read is saved over only as it was when the person was asked", async () => {
  const desk = new Desk().open();
  desk.load = async () => ({ ...desk.loaded(), ...(desk.disk.startsWith("broken") && { unreadable: "no archive" }) });
  desk.disk = "broken";
  assert.equal(await desk.saver.followTheirs(), "same");
  assert.equal(desk.view, "one");
  desk.type("two");
  desk.decide = () => {
    if (desk.disk === "broken") {
      desk.disk = "mended"; // while the person is asked
      return "mine";
    }
    return undefined;
  };
  assert.equal(await desk.saver.save(), false);
  assert.deepEqual([desk.conflicts, desk.disk], [["broken", "mended"], "mended"]);
  desk.disk = "broken again";
  desk.decide = () => "mine";
  assert.equal(await desk.saver.save(), true);
  assert.equal(desk.disk, "two");
});

test("a file that could not be read for a moment is looked at again, and not saved over", async () => {
  for (const [later, decisions, saved] of [["theirs", ["again", undefined], false], ["one", ["again"], true]]) {
    const desk = new Desk().open();
    desk.load = async () => ({ ...desk.loaded(), ...(desk.disk === "busy" && { unreadable: "out of memory" }) });
    desk.disk = "busy";
    desk.type("two");
    desk.decide = () => {
      desk.disk = later;
      return decisions.shift();
    };
    assert.equal(await desk.saver.save(), saved);
    assert.deepEqual([decisions, desk.disk, desk.saver.hasTheirs], [[], saved ? "two" : later, !saved]);
  }
});

test("what somebody else saved is shown where nothing is unsaved, and told of where something is", async () => {
  const desk = new Desk().open();
  assert.equal(await desk.saver.followTheirs(), "same");
  desk.disk = "theirs";
  assert.equal(await desk.saver.followTheirs(), "shown");
  assert.deepEqual([desk.view, desk.saver.isUnsaved, desk.saver.baseVersion], ["theirs", false, "vtheirs"]);
  desk.type("mine");
  desk.disk = "theirs again";
  assert.equal(await desk.saver.followTheirs(), "kept");
  assert.deepEqual([desk.view, desk.saver.hasTheirs], ["mine", true]);
});

test("what was read before a save is not shown after it", async () => {
  const desk = new Desk().open();
  desk.disk = "theirs";
  const { load } = desk;
  let endReading;
  const isRead = new Promise((resolve) => (endReading = resolve));
  desk.load = async () => {
    desk.load = load;
    const read = desk.loaded();
    await isRead;
    return read;
  };
  const followed = desk.saver.followTheirs();
  desk.decide = () => "mine";
  desk.type("mine");
  assert.equal(await desk.saver.save(), true);
  endReading();
  assert.equal(await followed, "same");
  assert.equal(desk.view, "mine");
  assert.equal(desk.saver.baseVersion, desk.versionOf("mine"));
});

test("of two people who save in turn or at once, nobody loses anything unseen", async () => {
  const disk = { text: "start" };
  const people = ["a", "b"].map((name) => {
    const desk = new Desk();
    Object.defineProperty(desk, "disk", { get: () => disk.text, set: (text) => (disk.text = text) });
    desk.name = name;
    desk.view = disk.text;
    desk.decide = (theirs) => {
      desk.view = `${theirs.answer.data}|${desk.view.split("|").at(-1)}`; // put together
      return "mine";
    };
    return desk;
  });
  people.forEach((desk) => desk.open());
  for (let round = 0; round < 100; ++round) {
    for (const desk of people) {
      desk.type(`${desk.view}|${desk.name}${round}`);
    }
    const [first, second] = round % 2 ? people : [...people].reverse();
    const save = first.saver.save();
    await sleep(Math.random() < 0.5 ? 0 : 1);
    assert.deepEqual(await Promise.all([save, second.saver.save()]), [true, true]);
    await Promise.all(people.map((desk) => desk.saver.followTheirs()));
    for (const desk of people) {
      assert.ok(disk.text.includes(`|${desk.name}${round}`), `round ${round}: ${disk.text}`);
    }
  }
});
