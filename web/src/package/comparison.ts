// SPDX-License-Identifier: Apache-2.0
// Two editions of a package beside each other: which parts differ, and what becomes of each.
import { defaultKeymap, history, historyKeymap } from "@codemirror/commands";
import { MergeView } from "@codemirror/merge";
import { EditorState } from "@codemirror/state";
import { EditorView, keymap } from "@codemirror/view";

import type { Document, Part } from "../../client/src/index.js";
import type { Comparison, Page } from "../document_view.js";
import { element, mergeArrow } from "../ui/dom.js";
import { bytesText } from "../ui/text.js";
import { type FittingText, fittingText } from "./fitting_text.js";
import { areSame, isSame, type Edit, PackageModel } from "./package_model.js";
import { byName, kindOf, partBytes, sizeOf, textOf } from "./part_kinds.js";
import { decodePart, encodePart, type PartText } from "./part_text.js";
import { partKey, partsByKey, reachable } from "./relationships.js";
import { editorBasics, laidOut, lineEndOf } from "./xml_editor.js";
import { copiedLayout, withoutLayout } from "./xml_formatting.js";

export type Side = "mine" | "theirs";

/** A part in which two editions differ. */
export interface Difference {
  uri: string;
  mine: Part | undefined;
  theirs: Part | undefined;
  /** Who has changed it since both had the same. */
  changedBy: Side | "both";
  /** Where it is chosen together with others: who has changed any of them. */
  joint?: Side | "both";
}

/**
 * The parts that differ. Those of a workbook are chosen together, since they refer to each other, its cells by the
 * numbers of their texts and styles: with those of another edition they would show something else.
 */
export function findDifferences(mine: PackageModel, theirs: PackageModel): Difference[] {
  const uris = new Set([...mine.parts, ...theirs.parts].map(({ partUri }) => partUri));
  const differences = [...uris].sort(byName).flatMap((uri): Difference[] => {
    const [my, its, original] = [mine.part(uri), theirs.part(uri), mine.originalPart(uri)];
    if (isSame(my, its)) {
      return [];
    }
    const changedBy = isSame(its, original) ? "mine" : isSame(my, original) ? "theirs" : "both";
    return [{ uri, mine: my, theirs: its, changedBy }];
  });
  const workbook = workbookParts(mine, theirs);
  const ofWorkbook = differences.filter(({ uri }) => workbook.has(uri));
  const [first, ...others] = new Set(ofWorkbook.map(({ changedBy }) => changedBy));
  const isRemnant = mine.mainPart === undefined;
  // What is left of mine alone fits theirs where that has all of it as it was before.
  if (isRemnant ? [first, ...others].includes("both") : ofWorkbook.length > 1) {
    const joint = isRemnant ? "theirs" : others.length > 0 ? "both" : first!;
    ofWorkbook.forEach((one) => (one.joint = joint));
  }
  return differences;
}

/** The names of the parts that a workbook is made of in any of its editions; none where it is no workbook. */
export function workbookParts(...editions: PackageModel[]): Set<string> {
  const isWorkbook = editions.some(({ mainPart }) => /spreadsheetml|ms-excel/i.test(mainPart?.contentType ?? ""));
  const partsOf = ({ parts, mainPart }: PackageModel) =>
    isWorkbook && mainPart
      ? [mainPart, ...reachable(partsByKey(parts), mainPart.partUri, mainPart.relationship)]
      : [];
  return new Set(editions.flatMap(partsOf).map(({ partUri }) => partUri));
}

/**
 * What was chosen of all differences, made whole: a part stays as long as something in the outcome refers to it, and
 * one that they have added is not added where nothing does. `copies` are further parts that may be referred to.
 */
export function madeWhole(
  mine: PackageModel,
  theirs: PackageModel,
  chosen: Required<Pick<Edit, "parts" | "relationships">>,
  copies: Part[] = [],
): Edit {
  const parts = new Map(chosen.parts);
  const kept = [...mine.parts].filter(({ partUri }) => !parts.has(partUri));
  const outcome = partsByKey([...kept, ...[...parts.values()].filter((part) => part !== null)]);
  const all = new Map([...partsByKey([...copies, ...theirs.parts, ...mine.parts]), ...outcome]);
  const needed = reachable(all, "/", chosen.relationships);
  for (const part of needed) {
    if (!outcome.has(partKey(part.partUri))) {
      parts.set(part.partUri, part);
    }
  }
  for (const part of reachable(partsByKey(theirs.parts), "/", theirs.relationships)) {
    if (parts.get(part.partUri) === part && !mine.part(part.partUri) && !needed.has(part)) {
      parts.set(part.partUri, null);
    }
  }
  return { ...chosen, parts };
}

/** Shows the differences; `use` gets what is chosen of all of them, and the names of the parts that go together. */
export class PackageComparison implements Comparison {
  readonly element = element("div", { className: "package-comparison" });

  #rows: ComparedPart[];
  #theirs: PackageModel;
  #relationshipsBy: Side;
  #detail = element("div", { className: "package-difference" });

  constructor(
    private mine: PackageModel,
    theirs: Document,
    private page: Page,
    private use: (chosen: Edit, joint: ReadonlySet<string>) => void,
  ) {
    this.#theirs = new PackageModel(theirs);
    this.#relationshipsBy = mine.areRelationshipsChanged ? "mine" : "theirs";
    this.#rows = findDifferences(mine, this.#theirs).map(
      (difference) => new ComparedPart(difference, [mine, this.#theirs], page, (row) => this.#show(row)),
    );
    const list = element(
      "ul",
      { "aria-label": page.text("package.differences") },
      ...this.#rows.map((row) => row.element),
    );
    if (!areSame(mine.relationships, theirs.relationships)) {
      list.append(this.#relationships());
    }
    const nothing = element("p", {}, page.text("package.differences.none"));
    if (this.#rows.some(({ isJoint }) => isJoint)) {
      this.element.append(element("p", {}, page.text("package.differences.joint")));
    }
    this.element.append(list.children.length > 0 ? list : nothing, this.#detail);
    if (this.#rows[0]) {
      this.#show(this.#rows[0]);
    }
  }

  get isEdited(): boolean {
    return this.#rows.some((row) => row.isEdited);
  }

  apply(): void {
    const parts = new Map(this.#rows.map((row) => [row.uri, row.result ?? null]));
    const { relationships } = this.#relationshipsBy === "theirs" ? this.#theirs : this.mine;
    const copies = this.#rows.flatMap((row) => row.copies);
    const outcome = madeWhole(this.mine, this.#theirs, { parts, relationships: [...relationships] }, copies);
    this.use(outcome, workbookParts(this.mine, this.#theirs));
  }

  close(): void {
    for (const row of this.#rows) {
      row.close();
    }
  }

  #show(row: ComparedPart): void {
    for (const other of this.#rows) {
      other.element.classList.toggle("active", other === row);
      if (other.isJoint && row.isJoint) {
        other.side = row.side;
      }
    }
    this.#detail.replaceChildren(row.detail);
  }

  #relationships(): HTMLElement {
    const choice = sideChoice(this.page, this.page.text("package.differences.relationships"), ["mine", "theirs"]);
    choice.value = this.#relationshipsBy;
    choice.addEventListener("change", () => (this.#relationshipsBy = choice.value as Side));
    return element("li", {}, element("span", {}, this.page.text("package.differences.relationships")), choice);
  }
}

class ComparedPart {
  readonly element: HTMLElement;
  readonly uri: string;

  #choice: HTMLSelectElement;
  #detail: HTMLElement | undefined;
  #merge: { view: MergeView; decoded: PartText; part: Part; fitting: FittingText } | undefined;

  constructor(
    private difference: Difference,
    private editions: [PackageModel, PackageModel],
    private page: Page,
    select: (row: ComparedPart) => void,
  ) {
    this.uri = difference.uri;
    const name = textOf(this.uri);
    const isMerged = this.#isText() && !this.isJoint;
    this.#choice = sideChoice(page, name, isMerged ? ["mine", "theirs", "together"] : ["mine", "theirs"]);
    this.#choice.value = this.#default;
    const open = element("button", { type: "button", className: "package-link" }, name);
    open.addEventListener("click", () => select(this));
    this.#choice.addEventListener("change", () => select(this));
    const by = element("small", {}, page.text(`package.differences.${difference.changedBy}`));
    this.element = element("li", {}, open, by, this.#choice);
  }

  /** Whether something else was chosen, or put together, than the comparison begins with. */
  get isEdited(): boolean {
    return this.#choice.value !== this.#default;
  }

  get isJoint(): boolean {
    return this.difference.joint !== undefined;
  }

  get side(): string {
    return this.#choice.value;
  }

  set side(side: string) {
    this.#choice.value = side;
  }

  /** What becomes of the part; nothing when it is taken out. */
  get result(): Part | undefined {
    const { mine, theirs } = this.difference;
    if (this.#choice.value === "together" && this.#merge) {
      const { view, decoded, part, fitting } = this.#merge;
      const text = withoutLayout(view.b.state);
      return { ...part, relationship: fitting.relationshipsOf(text), content: encodePart({ ...decoded, text }) };
    }
    return this.#choice.value === "theirs" ? theirs : mine;
  }

  /** What may be referred to by what was put together, by names that no part has. */
  get copies(): Part[] {
    return this.#merge?.fitting.copies ?? [];
  }

  /** Both editions of it, made when it is first looked at. */
  get detail(): HTMLElement {
    return (this.#detail ??= this.#isText() ? this.#texts() : this.#sides());
  }

  close(): void {
    this.#merge?.view.destroy();
  }

  get #default(): Side {
    return (this.difference.joint ?? this.difference.changedBy) === "theirs" ? "theirs" : "mine";
  }

  #isText(): boolean {
    const { mine, theirs } = this.difference;
    return [mine, theirs].every((part) => part && ["xml", "text"].includes(kindOf(part)) && decodePart(part.content));
  }

  // Theirs on the left; mine on the right, to be edited into what both become.
  #texts(): HTMLElement {
    const [mine, theirs] = [this.difference.mine!, this.difference.theirs!];
    const [my, its] = [decodePart(mine.content)!, decodePart(theirs.content)!];
    const isXml = kindOf(mine) === "xml";
    const lineEnd = lineEndOf(my.text, its.text);
    const side = (text: string, label: string) => {
      const { doc, extension } = laidOut(text, isXml, lineEnd);
      const labelled = EditorView.contentAttributes.of({ "aria-label": label });
      return { doc, extensions: [editorBasics(isXml, doc.length), extension, labelled] };
    };
    const fitting = fittingText(this.uri, its.text, ...this.editions);
    const a = side(fitting.text, this.page.text("package.theirs"));
    const b = side(my.text, this.page.text("package.mine"));
    b.extensions.push(
      history(),
      keymap.of([...historyKeymap, ...defaultKeymap]),
      EditorState.transactionExtender.of((transaction) => {
        if (!transaction.isUserEvent("revert")) {
          return null;
        }
        let effects: ReturnType<typeof copiedLayout> = [];
        transaction.changes.iterChanges((at, _to, target, end) => {
          const from = view.chunks.find(({ fromB }) => fromB === at)?.fromA ?? 0;
          effects = copiedLayout(view.a.state, { from, to: from + end - target }, target);
        });
        return { effects };
      }),
      EditorView.updateListener.of((update) => {
        if (update.docChanged) {
          this.#choice.value = "together";
        }
      }),
    );
    for (const { extensions } of this.isJoint ? [a, b] : [a]) {
      extensions.push(EditorState.readOnly.of(true), EditorView.editable.of(false));
    }
    const view: MergeView = new MergeView({
      a,
      b,
      ...(!this.isJoint && { revertControls: "a-to-b" }),
      renderRevertControl: () => mergeArrow(this.page.text("comparison.take")),
      collapseUnchanged: { margin: 3, minSize: 6 },
    });
    this.#merge = { view, decoded: my, part: mine, fitting };
    const titles = element("div", { className: "package-sides" });
    titles.append(
      element("h3", {}, this.page.text("package.theirs")),
      element("h3", {}, this.page.text("package.mine")),
    );
    const hint = this.isJoint ? [] : [element("p", {}, this.page.text("package.differences.hint"))];
    return element("div", {}, titles, ...hint, view.dom);
  }

  #sides(): HTMLElement {
    const { mine, theirs } = this.difference;
    return element("div", { className: "package-sides" }, this.#side("theirs", theirs), this.#side("mine", mine));
  }

  #side(side: Side, part: Part | undefined): HTMLElement {
    const { page } = this;
    const shown = element("section", {}, element("h3", {}, page.text(`package.${side}`)));
    if (!part) {
      shown.append(element("p", {}, page.text("package.differences.absent")));
      return shown;
    }
    shown.append(element("p", {}, `${textOf(part.contentType)}, ${bytesText(sizeOf(part))}`));
    if (kindOf(part) === "image") {
      const url = URL.createObjectURL(
        new Blob([partBytes(part) as Uint8Array<ArrayBuffer>], { type: part.contentType }),
      );
      const image = element("img", { alt: `${textOf(this.uri)}: ${page.text(`package.${side}`)}`, src: url });
      image.addEventListener("load", () => URL.revokeObjectURL(url));
      image.addEventListener("error", () => URL.revokeObjectURL(url));
      shown.append(image);
    }
    return shown;
  }
}

function sideChoice(page: Page, label: string, sides: (Side | "together")[]): HTMLSelectElement {
  const options = sides.map((side) => element("option", { value: side }, page.text(`package.choose.${side}`)));
  return element("select", { "aria-label": page.text("package.choose", { name: label }) }, ...options);
}
