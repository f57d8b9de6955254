// SPDX-License-Identifier: Apache-2.0
// All text of a document as a list, with find and replace.
import type { Part } from "../../client/src/index.js";
import type { Page } from "../document_view.js";
import { button, element } from "../ui/dom.js";
import type { PackageModel } from "./package_model.js";
import type { Panel } from "./package_view.js";
import { byName, kindOf, textOf } from "./part_kinds.js";
import { decodePart, encodePart, type PartText } from "./part_text.js";
import { hasFormulas, withRecalculation } from "./recalculation.js";
import { columnNames, comparable, isTable } from "./table_columns.js";
import { findMatches, mayHaveText, patternOf, replaceMatches, textBlocks, type TextBlock } from "./text_runs.js";

interface TextPart {
  decoded: PartText;
  blocks: TextBlock[];
}

type Matches = ReturnType<typeof findMatches>;

/** A paragraph in the list. */
interface Entry {
  part: Part;
  block: TextBlock;
  matches: Matches;
  /** Whether it names a column of a table, and so cannot be replaced by itself. */
  isHeading: boolean;
}

const SHOWN_AT_ONCE = 200; // entries; the next ones follow when the list is scrolled
const LONGEST_SHOWN = 2_000; // characters of one entry

// Where text is in the parts of a document, in the order in which people look for it.
const PLACES: [RegExp, string][] = [
  [/wordprocessingml\.document|ms-word\.(document|template)|wordprocessingml\.template/i, "document"],
  [/presentationml\.slide\+/i, "slide"],
  [/sharedStrings/i, "cells"],
  [/worksheet/i, "sheet"],
  [/header\+/i, "header"],
  [/footer\+/i, "footer"],
  [/footnotes\+/i, "footnotes"],
  [/endnotes\+/i, "endnotes"],
  [/comments?\+/i, "comments"],
  [/notesSlide/i, "notes"],
  [/chart\+/i, "chart"],
  [/diagram/i, "diagram"],
  [/drawing\+/i, "drawing"],
  [/slideLayout/i, "layout"],
  [/slideMaster|notesMaster|handoutMaster/i, "master"],
];

export class TextPanel implements Panel {
  readonly element = element("div", { className: "package-text" });

  #find = element("input", { type: "search", autocomplete: "off", spellcheck: false });
  #replacement = element("input", { type: "text", autocomplete: "off" });
  #matchCase = element("input", { type: "checkbox" });
  #wholeWords = element("input", { type: "checkbox" });
  #status = element("p", { role: "status", className: "package-count" });
  #list = element("div", { className: "package-paragraphs", tabIndex: 0, role: "region" });
  #more = element("div", { className: "package-more" });
  #replaceAll: HTMLButtonElement;
  #lastUsed = this.#find; // of the two fields

  #parts = new WeakMap<Part, TextPart>();
  #columns = new WeakMap<Part, string[]>(); // of the parts that are tables
  #entries: Entry[] = [];
  #listed = 0;
  #heading = ""; // of the part whose entries are being listed
  #reading = 0; // which pass over the parts is the latest
  #isStale = true;
  #isShown = false;
  #whenScrolled = new IntersectionObserver(
    (seen) => {
      if (seen.some(({ isIntersecting }) => isIntersecting)) {
        this.#listMore();
      }
    },
    { root: this.#list, rootMargin: "400px" },
  );
  #stopListening: () => void;

  /** Goes on with what is typed in `earlier`, whose place it takes. */
  constructor(
    private model: PackageModel,
    private page: Page,
    earlier?: TextPanel,
  ) {
    this.#replaceAll = button(page.text("package.text.replaceall"), () => this.#replace(this.#replaceable()));
    this.#list.setAttribute("aria-label", page.text("package.text.list"));
    this.element.append(this.#form(), this.#status, this.#list);
    this.#whenScrolled.observe(this.#more);
    if (earlier) {
      this.#find.value = earlier.#find.value;
      this.#replacement.value = earlier.#replacement.value;
      this.#matchCase.checked = earlier.#matchCase.checked;
      this.#wholeWords.checked = earlier.#wholeWords.checked;
      this.#lastUsed = earlier.#lastUsed === earlier.#find ? this.#find : this.#replacement;
    }
    this.#stopListening = model.listen(() => {
      this.#isStale = true;
      if (this.#isShown) {
        void this.#search({ keepsPlace: true });
      }
    });
  }

  commit(): void {}

  show(): void {
    this.#isShown = true;
    if (this.#isStale) {
      void this.#search();
    }
  }

  hide(): void {
    this.#isShown = false;
  }

  focus(): void {
    this.#lastUsed.focus();
  }

  close(): void {
    ++this.#reading;
    this.#whenScrolled.disconnect();
    this.#stopListening();
  }

  #form(): HTMLElement {
    const { page } = this;
    const form = element(
      "form",
      { className: "package-find", role: "search" },
      element("label", {}, page.text("package.text.find"), this.#find),
      element("label", {}, page.text("package.text.replacement"), this.#replacement),
      this.#replaceAll,
      element("label", { className: "package-check" }, this.#matchCase, page.text("package.text.case")),
      element("label", { className: "package-check" }, this.#wholeWords, page.text("package.text.words")),
    );
    form.addEventListener("submit", (event) => event.preventDefault());
    for (const input of [this.#find, this.#matchCase, this.#wholeWords]) {
      input.addEventListener("input", () => void this.#search());
    }
    for (const field of [this.#find, this.#replacement]) {
      field.addEventListener("focus", () => (this.#lastUsed = field));
    }
    this.#replacement.addEventListener("keydown", (event) => {
      if (event.key === "Enter" && !event.isComposing) {
        this.#replaceAll.click();
      }
    });
    return form;
  }

  // Part by part, letting the page do other things between them, until it is asked for again.
  async #search({ keepsPlace = false } = {}): Promise<void> {
    const reading = ++this.#reading;
    this.#isStale = false;
    this.#replaceAll.disabled = true;
    this.#status.textContent = this.page.text("package.text.reading");
    const pattern = this.#pattern();
    const entries: Entry[] = [];
    const headings = this.#headings();
    let since = performance.now();
    for (const part of this.#textParts()) {
      const read = this.#read(part);
      const areCells = hasCells(part);
      for (const block of read?.blocks ?? []) {
        const matches = pattern ? findMatches(block, pattern) : [];
        if (!pattern || matches.length > 0) {
          entries.push({ part, block, matches, isHeading: areCells && headings.has(comparable(block.text)) });
        }
      }
      if (performance.now() - since > 30) {
        await new Promise((resume) => setTimeout(resume));
        since = performance.now();
        if (reading !== this.#reading) {
          return;
        }
      }
    }
    this.#entries = entries;
    const place = keepsPlace ? { listed: this.#listed, scrollTop: this.#list.scrollTop } : { listed: 0, scrollTop: 0 };
    this.#showEntries(pattern !== undefined);
    while (this.#listed < Math.min(place.listed, entries.length)) {
      this.#listMore();
    }
    this.#list.scrollTop = place.scrollTop;
  }

  #pattern(): RegExp | undefined {
    return patternOf({
      text: this.#find.value,
      matchCase: this.#matchCase.checked,
      wholeWords: this.#wholeWords.checked,
    });
  }

  #textParts(): Part[] {
    const parts = [...this.model.parts].filter((part) => kindOf(part) === "xml");
    return parts
      .map((part) => ({ part, place: placeOf(part) }))
      .sort((a, b) => a.place - b.place || byName(a.part.partUri, b.part.partUri))
      .map(({ part }) => part);
  }

  #read(part: Part): TextPart | undefined {
    const known = this.#parts.get(part);
    if (known) {
      return known;
    }
    const decoded = decodePart(part.content);
    if (!decoded) {
      return undefined;
    }
    let blocks: TextBlock[] = [];
    try {
      blocks = mayHaveText(decoded.text) ? textBlocks(decoded.text) : [];
    } catch {
      // Not well-formed, which is told where it is edited.
    }
    const read = { decoded, blocks };
    this.#parts.set(part, read);
    return read;
  }

  // What the columns of the document's tables are called.
  #headings(): Set<string> {
    const tables = [...this.model.parts].filter(({ contentType }) => isTable(contentType));
    return new Set(tables.flatMap((table) => this.#columnNames(table)));
  }

  #columnNames(table: Part): string[] {
    let names = this.#columns.get(table);
    if (!names) {
      try {
        names = columnNames(decodePart(table.content)?.text ?? "");
      } catch {
        names = []; // not well-formed
      }
      this.#columns.set(table, names);
    }
    return names;
  }

  #replaceable(): Entry[] {
    return this.#entries.filter(({ matches, isHeading }) => matches.length > 0 && !isHeading);
  }

  #showEntries(isSearch: boolean): void {
    const count = this.#entries.reduce((sum, { matches }) => sum + matches.length, 0);
    this.#replaceAll.disabled = this.#replaceable().length === 0;
    const key = !isSearch ? "package.text.all" : count === 0 ? "package.text.none" : "package.text.found";
    this.#status.textContent = this.page.text(key, { count: isSearch ? count : this.#entries.length });
    this.#listed = 0;
    this.#heading = "";
    this.#list.replaceChildren(this.#more);
    this.#listMore();
  }

  #listMore(): void {
    const end = Math.min(this.#entries.length, this.#listed + SHOWN_AT_ONCE);
    const made: HTMLElement[] = [];
    for (; this.#listed < end; ++this.#listed) {
      const entry = this.#entries[this.#listed]!;
      if (entry.part.partUri !== this.#heading) {
        this.#heading = entry.part.partUri;
        made.push(element("h2", { title: textOf(this.#heading) }, nameOf(entry.part, this.page)));
      }
      made.push(this.#paragraph(entry));
    }
    this.#more.before(...made);
    this.#more.hidden = this.#listed === this.#entries.length;
    // Observed anew, since it may still be in sight.
    this.#whenScrolled.unobserve(this.#more);
    this.#whenScrolled.observe(this.#more);
  }

  #paragraph(entry: Entry): HTMLElement {
    const { block, matches, isHeading } = entry;
    const paragraph = element("p", { dir: "auto" });
    let copied = 0;
    for (const { from, to } of matches) {
      if (from > LONGEST_SHOWN) {
        break;
      }
      paragraph.append(block.text.slice(copied, from), element("mark", {}, block.text.slice(from, to)));
      copied = to;
    }
    const end = Math.max(copied, LONGEST_SHOWN);
    paragraph.append(block.text.slice(copied, end), end < block.text.length ? " …" : "");
    if (matches.length > 0 && isHeading) {
      paragraph.append(" ", element("small", {}, this.page.text("package.text.heading")));
    } else if (matches.length > 0) {
      const label = this.page.text("package.text.replace");
      paragraph.append(button(label, () => this.#replace([entry]), { className: "package-replace" }));
    }
    return paragraph;
  }

  #replace(entries: Entry[]): void {
    const byPart = new Map<Part, Entry[]>();
    for (const entry of entries) {
      const { part } = entry;
      if (this.model.part(part.partUri) !== part) {
        return; // it has changed, and is being read again for a new list
      }
      const replacements = byPart.get(part) ?? [];
      replacements.push(entry);
      byPart.set(part, replacements);
    }
    const parts = new Map<string, Part>();
    for (const [part, replacements] of byPart) {
      const { decoded } = this.#read(part)!;
      const text = replaceMatches(decoded.text, replacements, this.#replacement.value);
      parts.set(part.partUri, { ...part, content: encodePart({ ...decoded, text }) });
    }
    if ([...parts.values()].some(hasCells)) {
      this.#askToRecalculate(parts);
    }
    this.model.edit({ parts });
    const count = entries.reduce((sum, { matches }) => sum + matches.length, 0);
    this.page.tell(this.page.text("package.text.replaced", { count }));
    this.#find.focus();
  }

  // Puts the workbook among `parts`, where it has formulas.
  #askToRecalculate(parts: Map<string, Part>): void {
    const workbook = this.model.mainPart;
    const decoded = workbook && this.#read(workbook)?.decoded;
    if (decoded && this.#textParts().some((part) => hasCells(part) && hasFormulas(this.#read(part)?.decoded.text ?? ""))) {
      try {
        const content = encodePart({ ...decoded, text: withRecalculation(decoded.text) });
        parts.set(workbook.partUri, { ...workbook, content });
      } catch {
        // Not well-formed, which is told where it is edited.
      }
    }
  }
}

function hasCells({ contentType }: Part): boolean {
  return /sharedStrings|worksheet/i.test(contentType);
}

function nameOf(part: Part, page: Page): string {
  const place = PLACES[placeOf(part)]?.[1];
  const number = /([0-9]+)\.[^./]*$/.exec(part.partUri)?.[1] ?? "";
  return place ? `${page.text(`package.place.${place}`)} ${number}`.trim() : textOf(part.partUri);
}

function placeOf({ contentType }: Part): number {
  const place = PLACES.findIndex(([type]) => type.test(contentType));
  return place < 0 ? PLACES.length : place;
}
