// SPDX-License-Identifier: Apache-2.0
// What is known of the tree of files, and which rows of it are seen.
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "./room.mjs";

const { TreeModel } = await room("files/tree_model.ts");

const file = (name) => ({ name, kind: "file", size: 1, time: 0 });
const folder = (name) => ({ name, kind: "folder", size: 0, time: 0 });
const names = (model) => model.rows().map((node) => node.name);

function tree() {
  const model = new TreeModel();
  model.setRoots(["/data/Root"]);
  const [root] = model.roots;
  model.setChildren(root, [file("b10.txt"), file("b9.txt"), folder("inner")]);
  model.setOpen(root, true);
  model.setChildren(model.find("/data/Root/inner"), [file("Needle.txt")]);
  return { model, root };
}

test("folders come first, and numbers in names count as numbers", () => {
  assert.deepEqual(names(tree().model), ["Root", "inner", "b9.txt", "b10.txt"]);
});

test("what is in a folder is seen while it is open", () => {
  const { model } = tree();
  const inner = model.find("/data/Root/inner");
  model.setOpen(inner, true);
  assert.deepEqual(names(model), ["Root", "inner", "Needle.txt", "b9.txt", "b10.txt"]);
  model.setOpen(inner, false);
  assert.equal(names(model).length, 4);
});

test("a filter shows the files that have all its words in their path, with their folders", () => {
  const { model } = tree();
  model.setFilter("NEED inn");
  assert.deepEqual(names(model), ["Root", "inner", "Needle.txt"]);
  model.setFilter("b1");
  assert.deepEqual(names(model), ["Root", "b10.txt"]);
  model.setFilter("data");
  assert.deepEqual(names(model), []); // that is above the root
  model.setFilter("  ");
  assert.deepEqual(names(model), ["Root", "inner", "b9.txt", "b10.txt"]);
});

test("a folder that is read again keeps what is known of what stays, and forgets what is gone", () => {
  const { model, root } = tree();
  model.setOpen(model.find("/data/Root/inner"), true);
  model.setChildren(root, [folder("inner"), file("new.txt")]);
  assert.deepEqual(names(model), ["Root", "inner", "Needle.txt", "new.txt"]);
  assert.equal(model.find("/data/Root/b9.txt"), undefined);
  model.setChildren(root, []);
  assert.equal(model.find("/data/Root/inner/Needle.txt"), undefined);
});

test("a changed file is marked, and its folder told", () => {
  const { model, root } = tree();
  assert.equal(model.markChanged("/data/Root/b9.txt"), root);
  assert.equal(model.find("/data/Root/b9.txt").isChanged, true);
  assert.equal(model.markChanged("/data/Root/new.txt"), root);
  assert.equal(model.markChanged("/elsewhere/new.txt"), undefined);
});
