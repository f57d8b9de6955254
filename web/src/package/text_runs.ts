// SPDX-License-Identifier: Apache-2.0
// The text that people read in a part of a document, paragraph by paragraph, and its replacement.
//
// A paragraph's text is spread over runs, each with a format of its own: what reads "Annual report" may be
// <w:r><w:t>Ann</w:t></w:r><w:r><w:rPr><w:b/></w:rPr><w:t>ual report</w:t></w:r>. A match may begin in one run
// and end in another. The replacement goes into the run in which it begins, the others lose what matched, and
// all of them stay, with their formats.
import { decodeReferences, encodeText, XmlScanner } from "./xml_scanner.js";

/** A paragraph, or whatever takes its place: a shared string, the text of a cell or of a comment. */
export interface TextBlock {
  /** All text, with tabs and line breaks as they are seen. */
  text: string;
  pieces: Piece[];
}

export interface Piece {
  /** Where the piece begins in the block's text, and what it has of it. */
  start: number;
  text: string;
  /** Where the text stands in the XML; nothing for what is no text: tabs, pictures, fields, footnote marks. */
  run?: Run;
}

interface Run {
  tag: Place;
  content: Place;
  /** Whether white space at the ends counts as the tag is, and whether an attribute can make it count. */
  keepsSpace: boolean;
  mayTakeAttribute: boolean;
}

interface Place {
  from: number;
  to: number;
}

// Of both editions of the format, transitional and strict.
const PREFIXES = new Map(
  Object.entries({ w: "wordprocessingml", a: "drawingml", s: "spreadsheetml" }).flatMap(([prefix, name]) => [
    [`http://schemas.openxmlformats.org/${name}/2006/main`, prefix],
    [`http://purl.oclc.org/ooxml/${name}/main`, prefix],
  ]),
)
  .set("http://schemas.openxmlformats.org/officeDocument/2006/math", "m")
  .set("http://purl.oclc.org/ooxml/officeDocument/math", "m");

const BLOCKS = new Set(["w:p", "a:p", "s:si", "s:is", "s:text"]);
const TEXTS = new Set(["w:t", "a:t", "s:t"]);
// Text that was deleted or moved away while changes were tracked, and readings of Japanese characters.
const HIDDEN = new Set(["w:del", "w:moveFrom", "s:rPh"]);
// What a program works out itself, and what would have to be set as mathematics.
const OPAQUE = new Set(["a:fld", "m:oMath"]);
const INVISIBLE = new Set(["w:t", "w:rPr", "w:lastRenderedPageBreak", "w:delText"]);
const SEEN_AS: Record<string, string> = {
  "w:tab": "\t",
  "w:ptab": "\t",
  "w:br": "\n",
  "w:cr": "\n",
  "a:br": "\n",
  "w:noBreakHyphen": "\u2011",
  "w:softHyphen": "\u00ad",
};

/** Whether an XML part can have such text at all: cheap, before it is looked through. */
export function mayHaveText(xml: string): boolean {
  const head = xml.slice(0, 20_000);
  return [...PREFIXES.keys()].some((namespace) => head.includes(namespace));
}

/**
 * The blocks of a part that have text, in order. Throws XmlError when it is not well-formed.
 * Linear in its length.
 */
export function textBlocks(xml: string): TextBlock[] {
  return new BlockReader(xml).read();
}

interface Element {
  /** The prefix by which this file knows the namespace, and the local name. */
  name: string;
  keepsSpace: boolean;
  /** The namespaces in scope outside of it, when it declares any. */
  outerScope?: Map<string, string>;
}

class BlockReader {
  #scanner: XmlScanner;
  #elements: Element[] = [];
  #scope = new Map<string, string>(); // namespaces by prefix
  #names = new Map<string, string>(); // what names are called here, in that scope
  #blocks: TextBlock[] = [];
  #open: TextBlock[] = []; // a text box stands in a paragraph and has paragraphs
  #unread = 0; // elements that are open and in which nothing is read

  constructor(xml: string) {
    this.#scanner = new XmlScanner(xml);
  }

  read(): TextBlock[] {
    const scanner = this.#scanner;
    while (scanner.next()) {
      if (scanner.kind === "start") {
        const element = this.#enter();
        if (TEXTS.has(element.name) && this.#unread === 0 && this.#open.length > 0) {
          this.#readText(element);
        }
      } else if (scanner.kind === "empty") {
        this.#enter();
        this.#leave();
      } else if (scanner.kind === "end") {
        this.#leave();
      }
    }
    return this.#blocks.filter(({ text }) => text !== "");
  }

  #enter(): Element {
    const scanner = this.#scanner;
    const parent = this.#elements[this.#elements.length - 1];
    const element: Element = { name: "", keepsSpace: parent?.keepsSpace ?? false };
    if (scanner.mentions("xmlns")) {
      element.outerScope = this.#scope;
      this.#declare();
    }
    if (scanner.mentions("xml:space")) {
      element.keepsSpace = scanner.attributes().get("xml:space") === "preserve";
    }
    element.name = this.#nameOf(scanner.name);
    this.#elements.push(element);
    if (this.#unread > 0 || HIDDEN.has(element.name)) {
      ++this.#unread;
    } else if (OPAQUE.has(element.name)) {
      this.#append("");
      ++this.#unread;
    } else if (BLOCKS.has(element.name)) {
      const block = { text: "", pieces: [] };
      this.#blocks.push(block);
      this.#open.push(block);
    } else if (element.name === "a:br" || (parent?.name === "w:r" && !INVISIBLE.has(element.name))) {
      this.#append(SEEN_AS[element.name] ?? "");
    }
    return element;
  }

  #leave(): void {
    const element = this.#elements.pop()!;
    if (this.#unread > 0) {
      --this.#unread;
    } else if (BLOCKS.has(element.name)) {
      this.#open.pop();
    }
    if (element.outerScope) {
      this.#scope = element.outerScope;
      this.#names.clear();
    }
  }

  #declare(): void {
    this.#scope = new Map(this.#scope);
    this.#names.clear();
    for (const [name, value] of this.#scanner.attributes()) {
      if (name === "xmlns" || name.startsWith("xmlns:")) {
        this.#scope.set(name.slice(6), value);
      }
    }
  }

  #nameOf(name: string): string {
    let known = this.#names.get(name);
    if (known === undefined) {
      const colon = name.indexOf(":");
      const prefix = PREFIXES.get(this.#scope.get(colon < 0 ? "" : name.slice(0, colon)) ?? "");
      known = prefix ? `${prefix}:${name.slice(colon + 1)}` : "";
      this.#names.set(name, known);
    }
    return known;
  }

  // From the start tag to the end tag. What holds more than text is left alone.
  #readText(element: Element): void {
    const scanner = this.#scanner;
    const tag = { from: scanner.from, to: scanner.to };
    const depth = scanner.open.length;
    let text = "";
    let isPlain = true;
    while (scanner.next() && scanner.open.length >= depth) {
      if (scanner.kind === "text") {
        text += decodeReferences(scanner.source);
        isPlain &&= !/&(?!(amp|lt|gt|quot|apos|#\w+);)/.test(scanner.source);
      } else if (scanner.kind === "cdata") {
        text += scanner.source.slice(9, -3);
      } else {
        isPlain = false;
      }
    }
    this.#leave();
    const mayTakeAttribute = element.name !== "a:t";
    const keepsSpace = element.keepsSpace || !mayTakeAttribute;
    const content = { from: tag.to, to: scanner.from };
    const shown = keepsSpace ? text : text.replace(/^[ \t\r\n]+|[ \t\r\n]+$/g, "");
    this.#append(shown, isPlain ? { tag, content, keepsSpace, mayTakeAttribute } : undefined);
  }

  #append(text: string, run?: Run): void {
    const block = this.#open[this.#open.length - 1];
    if (block) {
      block.pieces.push({ start: block.text.length, text, ...(run && { run }) });
      block.text += text;
    }
  }
}

export interface Query {
  text: string;
  matchCase: boolean;
  wholeWords: boolean;
}

/** What finds a query's text; nothing when it is empty. */
export function patternOf({ text, matchCase, wholeWords }: Query): RegExp | undefined {
  if (text === "") {
    return undefined;
  }
  const escaped = text.replace(/[\\^$.*+?()[\]{}|/]/g, "\\$&");
  const inWords = "[\\p{L}\\p{N}\\p{M}_]";
  const source = wholeWords ? `(?<!${inWords})${escaped}(?!${inWords})` : escaped;
  return new RegExp(source, matchCase ? "gu" : "giu");
}

/** Where a block's text matches. Only what is text in one go counts: no match has a tab or a picture in it. */
export function findMatches(block: TextBlock, pattern: RegExp): Place[] {
  const matches: Place[] = [];
  pattern.lastIndex = 0;
  for (let found = pattern.exec(block.text); found; found = pattern.exec(block.text)) {
    const match = { from: found.index, to: found.index + found[0].length };
    if (isReplaceable(block, match)) {
      matches.push(match);
    } else {
      // Behind a whole character: from within one, such a pattern would find the same match for ever.
      pattern.lastIndex = match.from + (block.text.codePointAt(match.from)! > 0xffff ? 2 : 1);
    }
  }
  return matches;
}

function isReplaceable({ pieces }: TextBlock, { from, to }: Place): boolean {
  for (let index = firstPieceFrom(pieces, from); index < pieces.length; ++index) {
    const { run, start, text } = pieces[index]!;
    if (start >= to) {
      break;
    }
    if (!run && (start > from || start + text.length > from)) {
      return false;
    }
  }
  return true;
}

// The first piece that does not end before `offset`.
function firstPieceFrom(pieces: Piece[], offset: number): number {
  let low = 0;
  let high = pieces.length;
  while (low < high) {
    const middle = (low + high) >> 1;
    const { start, text } = pieces[middle]!;
    if (start + text.length < offset) {
      low = middle + 1;
    } else {
      high = middle;
    }
  }
  return low;
}

export interface Replacement {
  block: TextBlock;
  /** In order, and without overlap. */
  matches: Place[];
}

/** The XML of which `replacements` has blocks, with `text` in the place of their matches. */
export function replaceMatches(xml: string, replacements: Replacement[], text: string): string {
  const edits = replacements.flatMap(({ block, matches }) => blockEdits(xml, block, matches, text));
  edits.sort((a, b) => a.from - b.from);
  const output: string[] = [];
  let copied = 0;
  for (const { from, to, insert } of edits) {
    output.push(xml.slice(copied, from), insert);
    copied = to;
  }
  output.push(xml.slice(copied));
  return output.join("");
}

interface Edit extends Place {
  insert: string;
}

function blockEdits(xml: string, { pieces }: TextBlock, matches: Place[], replacement: string): Edit[] {
  const edits: Edit[] = [];
  let next = 0; // the first match that does not end before the piece
  for (const { start, text, run } of pieces) {
    const end = start + text.length;
    while (next < matches.length && matches[next]!.to <= start) {
      ++next;
    }
    if (!run || next === matches.length || matches[next]!.from >= end) {
      continue;
    }
    let result = "";
    let kept = start;
    for (let index = next; index < matches.length && matches[index]!.from < end; ++index) {
      const { from, to } = matches[index]!;
      result += text.slice(kept - start, Math.max(from, start) - start);
      result += from >= start ? replacement : "";
      kept = Math.min(to, end);
    }
    edits.push(...runEdits(xml, run, result + text.slice(kept - start)));
  }
  return edits;
}

function runEdits(xml: string, { tag, content, keepsSpace, mayTakeAttribute }: Run, text: string): Edit[] {
  const edits: Edit[] = [{ ...content, insert: encodeText(text) }];
  if (mayTakeAttribute && !keepsSpace && /^[ \t\r\n]|[ \t\r\n]$/.test(text)) {
    const bare = xml.slice(tag.from, tag.to).replace(/[ \t\r\n]+xml:space[ \t\r\n]*=[ \t\r\n]*(?:"[^"]*"|'[^']*')/, "");
    edits.unshift({ ...tag, insert: bare.replace(/[ \t\r\n]*>$/, ' xml:space="preserve">') });
  }
  return edits;
}
