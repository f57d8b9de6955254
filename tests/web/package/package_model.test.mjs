// SPDX-License-Identifier: Apache-2.0
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "../room.mjs";

const { PackageModel, documentSent, findDifferences, kindOf, originalOf, partBytes, propertyEdit, readProperties, sizeOf, withImage } =
  await room("package/comparison.ts", "package/package_model.ts", "package/part_kinds.ts", "package/properties.ts");

const part = (partUri, content, contentType = "application/xml", relationship = []) => ({
  ...{ partUri, contentType, content, relationship },
});
const read = () => ({ parts: [part("/a.xml", "<a/>"), part("/b.bin", "\0\xff", "application/x")], relationships: [] });
const setting = (uri, content, joins) => ({ parts: new Map([[uri, part(uri, content)]]), ...(joins && { joins }) });

test("what is not edited is sent as it came", () => {
  const loaded = read();
  const model = new PackageModel(loaded);
  model.edit(setting("/a.xml", "<b/>"));
  const document = model.document();
  assert.equal(document.parts[0].content, "<b/>");
  assert.equal(document.parts[1], loaded.parts[1]);
  assert.equal(document.relationships, loaded.relationships);
});

test("the main part is found however the relationship spells its name", () => {
  for (const target of ["xl/book.xml", "/xl/book.xml", "./xl/book.xml", "XL/Book.xml", "xl\\book.xml", "xl/b%6Fok.xml"]) {
    const relationships = [{ relationshipId: "r", relationshipType: "x/officeDocument", target, targetMode: "" }];
    const model = new PackageModel({ parts: [part("/xl/book.xml", "")], relationships });
    assert.equal(model.mainPart?.partUri, "/xl/book.xml", target);
  }
});

test("edits are undone and done again, in order", () => {
  const model = new PackageModel(read());
  model.edit(setting("/a.xml", "1"));
  model.edit({
    parts: new Map([
      ["/a.xml", null],
      ["/c.xml", part("/c.xml", "new")],
    ]),
  });
  assert.deepEqual(
    [...model.parts].map(({ partUri }) => partUri),
    ["/b.bin", "/c.xml"],
  );
  model.undo();
  assert.deepEqual([model.part("/a.xml").content, model.part("/c.xml")], ["1", undefined]);
  model.undo();
  assert.deepEqual([model.part("/a.xml").content, model.canUndo, model.isChanged("/a.xml")], ["<a/>", false, false]);
  model.redo();
  model.redo();
  assert.deepEqual([model.part("/a.xml"), model.part("/c.xml").content, model.canRedo], [undefined, "new", false]);
});

test("an edit after an undo takes the place of what was undone", () => {
  const model = new PackageModel(read());
  model.edit(setting("/a.xml", "1"));
  model.undo();
  model.edit(setting("/a.xml", "2"));
  assert.equal(model.canRedo, false);
  model.undo();
  assert.equal(model.part("/a.xml").content, "<a/>");
});

test("edits that belong together are undone together", () => {
  const model = new PackageModel(read());
  model.edit(setting("/a.xml", "1", "typing"));
  model.edit(setting("/a.xml", "12", "typing"));
  model.edit(setting("/a.xml", "x"));
  model.undo();
  assert.equal(model.part("/a.xml").content, "12");
  model.undo();
  assert.equal(model.part("/a.xml").content, "<a/>");
});

test("a part that is edited back is no longer changed", () => {
  const loaded = read();
  const model = new PackageModel(loaded);
  model.edit(setting("/a.xml", "1"));
  model.edit(setting("/a.xml", "<a/>"));
  assert.equal(model.isChanged("/a.xml"), false);
  assert.equal(model.part("/a.xml"), loaded.parts[0]);
});

test("a draft holds what is changed, and brings it back", () => {
  const model = new PackageModel(read());
  model.edit(setting("/a.xml", "1"));
  model.edit({ parts: new Map([["/b.bin", null]]), relationships: [{ relationshipId: "r" }] });
  const draft = structuredClone(model.draft());
  assert.deepEqual(Object.keys(draft.parts), ["/a.xml", "/b.bin"]);
  assert.deepEqual(new PackageModel(read(), draft).document(), model.document());
  assert.deepEqual(new PackageModel(read()).draft().parts, {});
});

test("a draft brings back the whole document that it was made from, whatever is saved now", async () => {
  const relationships = [{ relationshipId: "r\xc3\xa9\n", relationshipType: "t", target: "a.xml" }];
  const loaded = { parts: [...read().parts, part("/\xc3\xa9.xml", "\n\xc3\xa9", "text/xml", relationships)], relationships };
  const model = new PackageModel(loaded);
  model.edit(setting("/a.xml", "mine"));
  const draft = structuredClone(model.draft());
  const theirs = { parts: [part("/a.xml", "theirs"), part("/b.bin", "also theirs"), structuredClone(loaded.parts[2])], relationships: [] };
  const original = await originalOf(draft, theirs);
  assert.deepEqual(original, loaded);
  assert.equal(original.parts[2], theirs.parts[2]); // which is not held twice
  const restored = new PackageModel(original, draft);
  assert.deepEqual(restored.document(), model.document());
  assert.equal(restored.draft().original, draft.original);
  assert.equal(await originalOf({ ...draft, original: undefined }, theirs), undefined);
});

test("what a draft was made from is made once, until a save", async () => {
  const model = new PackageModel(read());
  model.edit(setting("/a.xml", "1"));
  const { original } = model.draft();
  model.edit(setting("/a.xml", "2"));
  assert.equal(model.draft().original, original);
  const saved = model.document();
  model.saved(saved);
  model.edit(setting("/a.xml", "3"));
  assert.deepEqual(await originalOf(model.draft(), read()), saved);
});

test("what was made from parts of two editions is not told to be what a draft was made from, until it is saved", () => {
  const model = new PackageModel(read());
  model.edit(setting("/a.xml", "mine"));
  const restored = new PackageModel(read(), { ...model.draft(), original: undefined });
  restored.edit(setting("/b.bin", "mine"));
  assert.equal(restored.draft().original, undefined);
  restored.saved(restored.document());
  assert.ok(restored.draft().original);
});

test("a draft of an earlier edition keeps what others have changed, and tells what both have", () => {
  const model = new PackageModel(read());
  model.edit(setting("/a.xml", "mine"));
  const theirs = read();
  theirs.parts[0].content = "theirs";
  theirs.parts[1].content = "also theirs";
  const restored = new PackageModel(theirs, model.draft());
  assert.deepEqual(
    [...restored.parts].map(({ content }) => content),
    ["mine", "also theirs"],
  );
  assert.deepEqual(
    findDifferences(restored, new PackageModel(theirs)).map(({ uri, changedBy }) => [uri, changedBy]),
    [["/a.xml", "both"]],
  );
});

test("parts that differ are told, with who has changed them", () => {
  const model = new PackageModel({ parts: ["/a", "/b", "/c", "/d"].map((uri) => part(uri, "0")), relationships: [] });
  model.edit({
    parts: new Map([
      ["/a", part("/a", "1")],
      ["/b", part("/b", "1")],
      ["/c", null],
    ]),
  });
  const theirs = {
    parts: [part("/a", "0"), part("/b", "2"), part("/c", "0"), part("/d", "2"), part("/e", "new")],
    relationships: [],
  };
  assert.deepEqual(
    findDifferences(model, new PackageModel(theirs)).map(({ uri, changedBy }) => [uri, changedBy]),
    [
      ["/a", "mine"],
      ["/b", "both"],
      ["/c", "mine"],
      ["/d", "theirs"],
      ["/e", "theirs"],
    ],
  );
});

test("of what somebody else saved, what both have is not unsaved, and what was changed is", () => {
  const model = new PackageModel({ parts: ["/a", "/b", "/c"].map((uri) => part(uri, "0")), relationships: [] });
  model.edit(setting("/a", "1"));
  model.saved({ parts: [part("/a", "0"), part("/b", "0"), part("/c", "2")], relationships: [] });
  assert.deepEqual(model.changedParts(), ["/a", "/c"]);
  model.edit(setting("/c", "2"));
  assert.deepEqual(model.changedParts(), ["/a"]);
  model.undo();
  model.undo();
  assert.deepEqual(model.changedParts(), ["/c"]);
});

test("what is taken over from somebody else is not undone with what was changed here", () => {
  const relationships = [{ relationshipId: "rId1" }];
  const model = new PackageModel({ parts: ["/a", "/b", "/c", "/d"].map((uri) => part(uri, "0")), relationships: [] });
  model.edit({ parts: new Map([["/a", part("/a", "1")], ["/c", part("/c", "1")]]) });
  model.edit(setting("/c", "0"));
  model.edit(setting("/d", "1"));
  const theirs = { parts: ["/a", "/b", "/c", "/d", "/e"].map((uri) => part(uri, uri === "/a" ? "0" : "2")), relationships };
  const heard = [];
  model.listen((parts) => heard.push(...parts));
  const together = new Map([["/a", model.part("/a")], ["/d", part("/d", "12")]]);
  theirs.parts.forEach((one) => together.has(one.partUri) || together.set(one.partUri, one));
  model.adopt(theirs, { parts: together, relationships }, new Set());
  const contents = () => Object.fromEntries([...model.parts].map(({ partUri, content }) => [partUri, content]));
  assert.deepEqual(heard.sort(), ["/b", "/c", "/d", "/e"]);
  const adopted = { "/a": "1", "/b": "2", "/c": "2", "/d": "12", "/e": "2" };
  assert.deepEqual([contents(), model.relationships], [adopted, relationships]);
  assert.deepEqual([model.changedParts(), model.areRelationshipsChanged], [["/a", "/d"], false]);
  model.undo(); // not a step of what has been put together, in which theirs is
  assert.deepEqual([contents(), model.canUndo], [{ ...adopted, "/a": "0" }, false]);
  assert.deepEqual(model.relationships, relationships);
  model.redo();
  assert.deepEqual(contents(), adopted);
});

test("of parts that go together, none is undone where one is taken over", () => {
  const edited = () => {
    const model = new PackageModel({ parts: ["/a", "/b", "/c"].map((uri) => part(uri, "0")), relationships: [] });
    model.edit({ parts: new Map([["/a", part("/a", "1")], ["/b", part("/b", "1")]]) });
    model.edit(setting("/c", "1"));
    return model;
  };
  const theirs = { parts: [part("/a", "2"), part("/b", "1"), part("/c", "1")], relationships: [] };
  const taken = edited();
  taken.adopt(theirs, { parts: new Map([["/a", part("/a", "2")]]) }, new Set(["/a", "/b"]));
  taken.undo();
  assert.deepEqual([[...taken.parts].map(({ content }) => content), taken.canUndo], [["2", "1", "0"], false]);
  const kept = edited();
  kept.adopt(theirs, { parts: new Map([["/a", part("/a", "1")]]) }, new Set(["/a", "/b"]));
  kept.undo();
  kept.undo();
  assert.deepEqual([...kept.parts].map(({ content }) => content), ["0", "0", "0"]);
});

test("what is chosen of an earlier version is undone as one step, and none where nothing changes", () => {
  const model = new PackageModel({ parts: [part("/a", "0")], relationships: [] });
  model.choose({ parts: new Map([["/a", part("/a", "0")]]), relationships: [] });
  assert.equal(model.canUndo, false);
  model.choose({ parts: new Map([["/a", part("/a", "1")]]), relationships: [{ relationshipId: "earlier" }] });
  assert.deepEqual([model.part("/a").content, model.relationships.length], ["1", 1]);
  model.undo();
  assert.deepEqual([model.part("/a").content, model.relationships.length, model.canUndo], ["0", 0, false]);
});

test("what was saved is what both have from then on", () => {
  const model = new PackageModel({ parts: ["/a", "/b"].map((uri) => part(uri, "0")), relationships: [] });
  model.edit(setting("/a", "1"));
  const saved = model.document();
  model.edit(setting("/b", "1")); // while the save is under way
  model.saved(saved);
  assert.deepEqual(model.changedParts(), ["/b"]);
  assert.deepEqual(Object.keys(model.draft().parts), ["/b"]);
  const theirs = { parts: [part("/a", "2"), part("/b", "0")], relationships: [] };
  assert.deepEqual(
    findDifferences(model, new PackageModel(theirs)).map(({ uri, changedBy }) => [uri, changedBy]),
    [
      ["/a", "theirs"],
      ["/b", "mine"],
    ],
  );
  model.undo();
  model.undo();
  assert.deepEqual(model.changedParts(), ["/a"]);
});

test("listeners hear of the parts that change, and of who changed them", () => {
  const model = new PackageModel(read());
  const heard = [];
  const stop = model.listen((parts, editor) => heard.push([[...parts], editor]));
  model.edit(setting("/a.xml", "1"), "me");
  model.undo();
  stop();
  model.redo();
  assert.deepEqual(heard, [
    [["/a.xml"], "me"],
    [["/a.xml"], undefined],
  ]);
});

test("parts are told apart by what they are", () => {
  assert.equal(kindOf(part("/a", "<a/>", "application/vnd.openxmlformats-officedocument.theme+xml")), "xml");
  assert.equal(kindOf(part("/a", "<a/>", "text/XML; charset=utf-8")), "xml");
  assert.equal(kindOf(part("/a", "a,b", "text/csv")), "text");
  assert.equal(kindOf(part("/a", "plain", "application/x")), "text");
  assert.equal(kindOf(part("/a", "\0\x01", "application/x")), "binary");
  assert.equal(kindOf(part("/a", "data:image/png;base64,", "image/png")), "image");
});

test("sizes and bytes are those in the package", () => {
  for (const bytes of [[], [1], [1, 255], [1, 2, 3]]) {
    const image = withImage(part("/i.png", "", "image/gif"), Uint8Array.from(bytes), "image/png");
    assert.equal(image.contentType, "image/png");
    assert.equal(sizeOf(image), bytes.length);
    assert.deepEqual([...partBytes(image)], bytes);
  }
  assert.equal(sizeOf(part("/a", "\xff\0")), 2);
});

const CORE = "http://schemas.openxmlformats.org/package/2006/metadata/core-properties";
const relationship = {
  relationshipId: "rId1",
  relationshipType: "http://schemas.openxmlformats.org/package/2006/relationships/metadata/core-properties",
  target: "docProps/core.xml",
};
const withCore = (xml) =>
  new PackageModel({
    parts: [part("/docProps/core.xml", Buffer.from(xml).toString("latin1"))],
    relationships: [relationship],
  });

test("properties are read and set, and all else in the part stays", () => {
  const xml = (title) =>
    `<cp:coreProperties xmlns:cp="${CORE}" xmlns:dc="http://purl.org/dc/elements/1.1/"><dc:title>${title}</dc:title><dc:creator>Zoë</dc:creator><cp:revision>3</cp:revision></cp:coreProperties>`;
  const model = withCore(xml("Tom &amp; Co"));
  assert.deepEqual(readProperties(model), { title: "Tom & Co", creator: "Zoë" });
  model.edit(propertyEdit(model, "title", "a < b"));
  assert.equal(model.part("/docProps/core.xml").content, Buffer.from(xml("a &lt; b")).toString("latin1"));
  model.edit(propertyEdit(model, "keywords", "x"));
  model.edit(propertyEdit(model, "keywords", "x, y"));
  assert.deepEqual(readProperties(model), { title: "a < b", creator: "Zoë", keywords: "x, y" });
  assert.match(model.part("/docProps/core.xml").content, /<cp:revision>3</);
});

test("empty elements and an empty root take properties", () => {
  const model = withCore(`<coreProperties xmlns="${CORE}"/>`);
  model.edit(propertyEdit(model, "title", "T"));
  assert.deepEqual(readProperties(model), { title: "T" });
  const other = withCore(
    `<coreProperties xmlns="${CORE}"><title xmlns="http://purl.org/dc/elements/1.1/" /></coreProperties>`,
  );
  other.edit(propertyEdit(other, "title", "T"));
  assert.deepEqual(readProperties(other), { title: "T" });
});

test("a document without properties gets a part and a relationship for them, which undo takes away and redo brings back", () => {
  const model = new PackageModel({
    parts: [part("/docProps/core.xml", "taken")],
    relationships: [{ relationshipId: "rId1" }],
  });
  assert.deepEqual(readProperties(model), {});
  model.edit(propertyEdit(model, "creator", "Ada"));
  assert.deepEqual(readProperties(model), { creator: "Ada" });
  assert.deepEqual(
    model.relationships.map(({ relationshipId, target }) => [relationshipId, target]),
    [
      ["rId1", undefined],
      ["rId2", "docProps/core1.xml"],
    ],
  );
  model.edit(propertyEdit(model, "creator", "Ada L."));
  model.undo();
  assert.equal(model.document().parts.length, 1);
  assert.equal(model.relationships.length, 1);
  model.redo();
  assert.deepEqual(readProperties(model), { creator: "Ada L." });
});

test("drafts tell which document was sent, however it was edited since", () => {
  const model = new PackageModel(read());
  model.edit(setting("/a.xml", "<sent/>"));
  const [sent, document] = [model.draft(), model.document()];
  assert.deepEqual(documentSent(document, sent, sent), document);
  model.edit(setting("/a.xml", "<later/>"));
  model.edit(setting("/b.bin", "later"));
  assert.deepEqual(documentSent(document, sent, model.draft()), document);
});

test("a part that was edited after a document was sent is not taken from what is saved by now", () => {
  const model = new PackageModel(read());
  model.edit(setting("/a.xml", "<sent/>"));
  const [sent, document] = [model.draft(), model.document()];
  model.edit(setting("/b.bin", "later"));
  const theirs = { ...document, parts: [document.parts[0], part("/b.bin", "theirs", "application/x")] };
  assert.deepEqual(documentSent(theirs, sent, model.draft()), document); // and so differs from theirs
  model.edit({ relationships: [{ relationshipId: "rId1", relationshipType: "t", target: "a.xml" }] });
  assert.deepEqual(documentSent({ ...document, relationships: [{ relationshipId: "theirs" }] }, sent, model.draft()), document);
});

test("a draft that does not tell the relationships of before does not tell what was sent", () => {
  const [document, relationships] = [read(), [{ relationshipId: "rId1" }]];
  const [same, changed] = [{ kind: "package", parts: {} }, { kind: "package", parts: {}, relationships }];
  for (const [sent, later] of [[changed, same], [same, changed], [changed, changed]]) {
    assert.equal(documentSent(document, sent, later), undefined);
  }
});

const RELATIONSHIP = { relationshipId: "rId1", relationshipType: "t", target: "c.xml" };
const EDITS = {
  "a part that is changed": setting("/a.xml", "<sent/>"),
  "a part that is added": setting("/c.xml", "<new/>"),
  "a part that is removed": { parts: new Map([["/a.xml", null]]) },
  "relationships that are changed": { relationships: [RELATIONSHIP] },
};
for (const [what, edit] of Object.entries(EDITS)) {
  test(`${what}, sent and then undone: that is kept by the draft, whether the save was made or not`, () => {
    const model = new PackageModel(read());
    model.edit(edit);
    const [sent, document] = [model.draft(), model.document()];
    model.undo();
    model.edit(setting("/b.bin", "later"));
    const later = structuredClone(model.draft(sent));

    const unsaved = new PackageModel(read(), later);
    assert.deepEqual(unsaved.draft(), new PackageModel(read(), structuredClone(model.draft())).draft()); // as if nothing had been sent
    assert.deepEqual(partsByName(unsaved), partsByName(model));

    const own = documentSent(document, sent, later);
    assert.deepEqual(partsByName(new PackageModel(own)), partsByName(new PackageModel(document)));
    const saved = new PackageModel(document, later);
    assert.deepEqual(partsByName(saved), partsByName(model));
    saved.saved(own);
    const { parts, relationships } = saved.draft(); // all of it is unsaved
    assert.deepEqual([Object.keys(parts).sort(), relationships], [["/b.bin", ...(edit.parts?.keys() ?? [])].sort(), edit.relationships && []]);
  });
}

// A document whose parts may be in another order.
function partsByName(model) {
  const { parts, relationships } = model.document();
  return { parts: Object.fromEntries(parts.map((one) => [one.partUri, one])), relationships };
}
