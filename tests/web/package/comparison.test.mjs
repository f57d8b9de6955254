// SPDX-License-Identifier: Apache-2.0
// Two editions of a package, put together.
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "../room.mjs";

const { PackageModel, findDifferences, fittingText, madeWhole } = await room(
  ...["package/comparison.ts", "package/fitting_text.ts", "package/package_model.ts"],
);

const WORKBOOK = "application/vnd.openxmlformats-officedocument.spreadsheetml.sheet.main+xml";

// Relationships: "rId1 type target".
const relationshipsOf = (...list) =>
  list.map((one) => one.split(" ")).map(([relationshipId, relationshipType, target]) => ({ relationshipId, relationshipType, target, targetMode: "" }));
const part = (partUri, content, ...list) => ({ partUri, contentType: "application/xml", content, relationship: relationshipsOf(...list) });
const ROOT = relationshipsOf("rId1 t/officeDocument xl/workbook.xml", "rId2 t/core docProps/core.xml");
const edition = (...parts) => ({ parts, relationships: ROOT });
const named = (parts) => Object.fromEntries(parts.map(({ partUri, content }) => [partUri, content]));

// An edition of mine that was `before`, after edits that make it `now`.
function changed(before, now) {
  const model = new PackageModel(before);
  const parts = new Map(before.parts.map(({ partUri }) => [partUri, null]));
  now.parts.forEach((one) => parts.set(one.partUri, one));
  model.choose({ parts });
  return model;
}

// What the comparison makes of it when nothing is chosen but `choices`, and what it begins with is left alone.
function putTogether(mine, theirs, choices = {}) {
  const their = new PackageModel(theirs);
  const parts = new Map(
    findDifferences(mine, their).map(({ uri, changedBy, joint, ...sides }) => {
      const side = choices[uri] ?? ((joint ?? changedBy) === "theirs" ? "theirs" : "mine");
      return [uri, sides[side] ?? null];
    }),
  );
  mine.choose(madeWhole(mine, their, { parts, relationships: theirs.relationships }));
  return named(mine.document().parts);
}

// Contents of the parts of a workbook; what has none is not there, and nothing refers to it.
function workbook({ core = "0", image = "0", drawing = "0", ...contents }, contentType = WORKBOOK) {
  const links = Object.keys(contents).map((name, index) => `rId${index + 1} t/${name} /xl/${name}.xml`);
  return edition(
    { ...part("/xl/workbook.xml", "0", ...links), contentType },
    part("/docProps/core.xml", core),
    ...Object.entries(contents).map(([name, content]) =>
      part(`/xl/${name}.xml`, content, ...(name === "sheet" && drawing ? ["rId1 t/drawing drawings/drawing1.xml"] : [])),
    ),
    ...(drawing ? [part("/xl/drawings/drawing1.xml", drawing, "rId1 t/image ../media/Image%201.png"), part("/xl/media/image 1.png", image)] : []),
  );
}

test("the parts of a workbook that differ are chosen together, unless there is one alone", () => {
  const before = { sheet: "0", strings: "0" };
  const joints = (mine, theirs, contentType = WORKBOOK) => {
    const model = changed(workbook(before, contentType), workbook({ ...before, ...mine }, contentType));
    const differences = findDifferences(model, new PackageModel(workbook({ ...before, ...theirs }, contentType)));
    return Object.fromEntries(differences.map(({ uri, joint }) => [uri, joint]));
  };
  const [core, image, strings, sheet] = ["/docProps/core.xml", "/xl/media/image 1.png", "/xl/strings.xml", "/xl/sheet.xml"];
  assert.deepEqual(joints({ strings: "1" }, { strings: "2", sheet: "2", core: "2" }), { [core]: undefined, [strings]: "both", [sheet]: "both" });
  assert.deepEqual(joints({ strings: "1" }, { sheet: "2" }), { [strings]: "both", [sheet]: "both" });
  assert.deepEqual(joints({ strings: "1" }, { image: "2" }), { [strings]: "both", [image]: "both" });
  assert.deepEqual(joints({}, { sheet: "2", strings: "2" }), { [strings]: "theirs", [sheet]: "theirs" });
  assert.deepEqual(joints({ sheet: "1", strings: "1" }, { core: "2" }), { [core]: undefined, [strings]: "mine", [sheet]: "mine" });
  assert.deepEqual(joints({ strings: "1" }, { strings: "2" }), { [strings]: undefined });
  assert.deepEqual(joints({ strings: "1" }, { sheet: "2" }, "text/xml"), { [strings]: undefined, [sheet]: undefined });
});

test("a workbook of mine keeps the drawing that somebody else has removed, and gets none that somebody else has added", () => {
  const [plain, drawn] = [{ sheet: "0", strings: "0", drawing: "" }, { sheet: "0", strings: "0" }];
  const mine = changed(workbook(drawn), workbook({ ...drawn, strings: "1" }));
  const expected = named(mine.document().parts);
  assert.deepEqual(putTogether(mine, workbook(plain)), expected);
  const other = changed(workbook(plain), workbook({ ...plain, strings: "1" }));
  assert.deepEqual(putTogether(other, workbook(drawn)), named(workbook({ ...plain, strings: "1" }).parts));
});

test("what is left of a workbook alone is taken with what it was made from, and else not at all", () => {
  const left = (base) =>
    new PackageModel({ parts: [], relationships: [] }, {
      kind: "package",
      parts: { "/xl/strings.xml": { part: part("/xl/strings.xml", "1"), base: part("/xl/strings.xml", base) } },
    });
  const theirs = workbook({ sheet: "2", strings: "2" });
  assert.deepEqual(putTogether(left("2"), theirs), { ...named(theirs.parts), "/xl/strings.xml": "1" });
  assert.deepEqual(putTogether(left("0"), theirs), named(theirs.parts));
});

const document = (text, ...parts) =>
  edition(part("/xl/workbook.xml", text, ...parts.map(([name], index) => `rId${index + 1} t/image ${name}`)), ...parts.map(([name, content]) => part(`/xl/${name}`, content)));

test("a part that somebody else has removed stays where what is kept refers to it", () => {
  const before = document("0", ["a.png", "0"], ["b.png", "0"]);
  const mine = () => changed(before, document("1", ["a.png", "0"], ["b.png", "0"]));
  const theirs = document("2", ["a.png", "2"]);
  assert.deepEqual(putTogether(mine(), theirs), { "/xl/workbook.xml": "1", "/xl/a.png": "2", "/xl/b.png": "0" });
  assert.deepEqual(putTogether(mine(), theirs, { "/xl/workbook.xml": "theirs" }), { "/xl/workbook.xml": "2", "/xl/a.png": "2" });
});

test("a part that somebody else has added is added where something kept refers to it", () => {
  const mine = () => changed(document("0"), document("1"));
  const theirs = document("2", ["a.png", "2"]);
  assert.deepEqual(putTogether(mine(), theirs), { "/xl/workbook.xml": "1" });
  const choices = { "/xl/workbook.xml": "theirs", "/xl/a.png": "mine" };
  assert.deepEqual(putTogether(mine(), theirs, choices), { "/xl/workbook.xml": "2", "/xl/a.png": "2" });
});

// A main part with references to what its relationships lead to.
const HEAD = '<d xmlns:q="http://example.org/relationships">';
const paragraph = (id) => `<p q:embed="${id}" w:val="${id}"/>`;
const written = (ids, list, ...parts) => edition(part("/xl/workbook.xml", `${HEAD}${ids.map(paragraph).join("")}</d>`, ...list), ...parts);

// What becomes of mine when all of their paragraphs are taken over after mine.
function takenOver(before, now, theirs) {
  const mine = changed(before, now);
  const their = new PackageModel(theirs);
  const uri = "/xl/workbook.xml";
  const fitting = fittingText(uri, their.part(uri).content, mine, their);
  const content = mine.part(uri).content.replace("</d>", "") + fitting.text.slice(HEAD.length);
  const together = { ...mine.part(uri), content, relationship: fitting.relationshipsOf(content) };
  const parts = new Map(findDifferences(mine, their).map(({ uri, changedBy, ...sides }) => [uri, sides[changedBy === "theirs" ? "theirs" : "mine"] ?? null]));
  mine.choose(madeWhole(mine, their, { parts: parts.set(uri, together), relationships: theirs.relationships }, fitting.copies));
  // By what they are in the text, and by what they lead to.
  const leadTo = new Map(mine.part(uri).relationship.map(({ relationshipId, target }) => [relationshipId, target]));
  const contents = named(mine.document().parts);
  const shown = [...mine.part(uri).content.matchAll(/embed="(.*?)"/g)].map(([, id]) => leadTo.get(id)).map((target) => contents[`/xl/${target}`] ?? contents[target] ?? target);
  return { shown, model: mine, text: fitting.text };
}

test("what is taken over from the other version refers to what it referred to there", () => {
  const before = written([], []);
  const mine = written(["rId1"], ["rId1 t/image a.png", "rId2 t/image c.png"], part("/xl/a.png", "mine"), part("/xl/c.png", "also mine"));
  const theirs = written(
    ["rId1", "rId2", "rId9"],
    ["rId1 t/link https://example.org/", "rId2 t/image b.png", "rId9 t/image b.png"],
    part("/xl/b.png", "theirs"),
  );
  const { shown, model } = takenOver(before, mine, theirs);
  assert.deepEqual(shown, ["mine", "https://example.org/", "theirs", "theirs"]);
  assert.equal(model.part("/xl/workbook.xml").relationship.length, 5);
  assert.match(model.part("/xl/workbook.xml").content, /w:val="rId2"/); // which only looks like one
});

test("what leads to the same in both has one id, and what is not taken over is not referred to", () => {
  const before = written(["rId1"], ["rId1 t/image a.png"], part("/xl/a.png", "0"));
  const theirs = written(["rId7", "rId2"], ["rId7 t/image /xl/a.png", "rId2 t/image b.png"], part("/xl/a.png", "0"), part("/xl/b.png", "2"));
  const mine = new PackageModel(before);
  const their = new PackageModel(theirs);
  const fitting = fittingText("/xl/workbook.xml", their.part("/xl/workbook.xml").content, mine, their);
  assert.equal(fitting.text, `${HEAD}${paragraph("rId1").replace('w:val="rId1"', 'w:val="rId7"')}${paragraph("rId2")}</d>`);
  assert.deepEqual(fitting.relationshipsOf(mine.part("/xl/workbook.xml").content), mine.part("/xl/workbook.xml").relationship);
});

test("a part that both have added by one name, with what it leads to, comes over by another name", () => {
  const drawn = (who) =>
    written(["rId1"], ["rId1 t/chart chart1.xml"], part("/xl/chart1.xml", `chart of ${who}`, "rId1 t/data data1.bin", "rId2 t/back workbook.xml"), part("/xl/data1.bin", `data of ${who}`));
  const { shown, model } = takenOver(written([], []), drawn("me"), drawn("them"));
  assert.deepEqual(shown, ["chart of me", "chart of them"]);
  const copy = [...model.parts].find(({ content }) => content === "chart of them");
  assert.equal(model.part(copy.relationship[0].target).content, "data of them");
});

test("what the whole text refers to without an id comes over where mine has none of its kind", () => {
  const theirs = written([], ["rId1 t/comments comments.xml", "rId2 t/styles styles2.xml"], part("/xl/comments.xml", "theirs"), part("/xl/styles2.xml", "theirs"));
  const mine = written([], ["rId1 t/styles styles.xml"], part("/xl/styles.xml", "mine"));
  const { model } = takenOver(mine, mine, theirs);
  const targets = model.part("/xl/workbook.xml").relationship.map(({ relationshipId, target }) => `${relationshipId} ${target}`);
  assert.deepEqual(targets, ["rId1 styles.xml", "rId3 comments.xml"]);
  assert.equal(model.part("/xl/comments.xml").content, "theirs");
  assert.equal(model.part("/xl/styles2.xml"), undefined);
});
