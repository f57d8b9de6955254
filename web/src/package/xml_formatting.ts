// SPDX-License-Identifier: Apache-2.0
// XML laid out for reading, and edited as if it were not: line breaks and indentation are put in between the
// tags of elements that hold nothing but elements, remembered as gaps while the text is edited, and left out
// when it is saved.
import { invertedEffects } from "@codemirror/commands";
import {
  Facet,
  RangeSet,
  RangeSetBuilder,
  RangeValue,
  StateEffect,
  StateField,
  type EditorState,
  type Extension,
  type Transaction,
} from "@codemirror/state";

import { XmlScanner } from "./xml_scanner.js";

export interface FormattedXml {
  text: string;
  /** Where white space was put in: begins and ends in turn. */
  gaps: number[];
}

const DEEPEST_INDENTATION = 40; // so that deep nesting does not take space by its square

/** Lays a document out. Throws XmlError when it is not well-formed. Linear in its length. */
export function formatXml(xml: string): FormattedXml {
  const text: string[] = [];
  const gaps: number[] = [];
  let copied = 0;
  let length = 0;
  for (const { at, depth } of findBreaks(xml)) {
    const gap = `\n${"  ".repeat(Math.min(depth, DEEPEST_INDENTATION))}`;
    text.push(xml.slice(copied, at), gap);
    length += at - copied + gap.length;
    gaps.push(length - gap.length, length);
    copied = at;
  }
  text.push(xml.slice(copied));
  return { text: text.join(""), gaps };
}

interface Break {
  at: number;
  depth: number;
  /** Which element it stands in: the place of its start tag. */
  owner: number;
}

interface OpenElement {
  from: number;
  /** The breaks that were there before the element's own. */
  breaks: number;
  hasBlank: boolean;
  hasText: boolean;
  hasChildren: boolean;
  isLeftAlone: boolean;
}

// White space beside text may mean something, so what holds text is left alone, with all that is in it; and
// what has white space between its tags is laid out already.
function findBreaks(xml: string): Break[] {
  const scanner = new XmlScanner(xml);
  let breaks: Break[] = [];
  const elements: OpenElement[] = [openElement(-1, 0, false)];
  const top = () => elements[elements.length - 1]!;
  const breakBefore = (at: number, depth: number) => {
    top().hasChildren = true;
    if (!top().isLeftAlone && at > 0) {
      breaks.push({ at, depth, owner: top().from });
    }
  };
  while (scanner.next()) {
    const { kind, from } = scanner;
    if (kind === "text" || kind === "cdata") {
      const isBlank = kind === "text" && /^[ \t\r\n\ufeff]*$/.test(scanner.source);
      top()[isBlank ? "hasBlank" : "hasText"] = true;
    } else if (kind === "end") {
      const element = top();
      if (element.hasChildren) {
        breakBefore(from, elements.length - 2);
      }
      elements.pop();
      breaks = withoutUnwanted(breaks, element);
    } else {
      breakBefore(from, elements.length - 1);
      if (kind === "start") {
        const keepsSpace = scanner.mentions("xml:space") && scanner.attributes().get("xml:space") === "preserve";
        elements.push(openElement(from, breaks.length, top().isLeftAlone || keepsSpace));
      }
    }
  }
  return withoutUnwanted(breaks, top());
}

function openElement(from: number, breaks: number, isLeftAlone: boolean): OpenElement {
  return { from, breaks, hasBlank: false, hasText: false, hasChildren: false, isLeftAlone };
}

function withoutUnwanted(breaks: Break[], element: OpenElement): Break[] {
  if (element.hasText) {
    breaks.length = element.breaks;
  } else if (element.hasBlank) {
    let kept = element.breaks;
    for (let index = element.breaks; index < breaks.length; ++index) {
      if (breaks[index]!.owner !== element.from) {
        breaks[kept++] = breaks[index]!;
      }
    }
    breaks.length = kept;
  }
  return breaks;
}

// What is typed at a gap's ends is no part of it.
class Gap extends RangeValue {
  override startSide = 1;
  override endSide = -1;
}

interface Place {
  from: number;
  to: number;
}

const GAP = new Gap();
const restoreGap = StateEffect.define<Place>({
  map: ({ from, to }, changes) => ({ from: changes.mapPos(from), to: changes.mapPos(to) }),
});
/** Makes the layout part of the text. */
export const keepLayout = StateEffect.define<null>();

const gapsField = StateField.define<RangeSet<Gap>>({
  create: () => RangeSet.empty,
  update(gaps, transaction) {
    let result = transaction.docChanged ? splitGaps(gaps.map(transaction.changes), transaction) : gaps;
    for (const effect of transaction.effects) {
      if (effect.is(restoreGap) && effect.value.from < effect.value.to) {
        result = result.update({ add: [GAP.range(effect.value.from, effect.value.to)] });
      } else if (effect.is(keepLayout)) {
        result = RangeSet.empty;
      }
    }
    return result;
  },
});

// What was put into a gap is no part of it, wherever the mapping of its ends leaves it.
function splitGaps(gaps: RangeSet<Gap>, transaction: Transaction): RangeSet<Gap> {
  let result = gaps;
  transaction.changes.iterChangedRanges((_fromA, _toA, from, to) => {
    const cut: Place[] = [];
    result.between(from, to, (gapFrom, gapTo) => {
      if (Math.max(gapFrom, from) < Math.min(gapTo, to)) {
        cut.push({ from: gapFrom, to: gapTo });
      }
    });
    for (const gap of cut) {
      const pieces = [
        { from: gap.from, to: from },
        { from: to, to: gap.to },
      ];
      result = result.update({
        filterFrom: gap.from,
        filterTo: gap.to,
        filter: (gapFrom, gapTo) => gapFrom !== gap.from || gapTo !== gap.to,
        add: pieces.filter((piece) => piece.from < piece.to).map((piece) => GAP.range(piece.from, piece.to)),
      });
    }
  }, true);
  return result;
}

// Undoing the deletion of a gap makes a gap again.
const restoreGaps = invertedEffects.of((transaction) => {
  const effects: StateEffect<Place>[] = [];
  if (transaction.docChanged) {
    const gaps = transaction.startState.field(gapsField);
    transaction.changes.iterChangedRanges((changedFrom, changedTo) => {
      gaps.between(changedFrom, changedTo, (from, to) => {
        const lost = { from: Math.max(from, changedFrom), to: Math.min(to, changedTo) };
        if (lost.from < lost.to) {
          effects.push(restoreGap.of(lost));
        }
      });
    }, true);
  }
  return effects;
});

/** An editor's extension that remembers where `gaps` go while the text is edited. */
export function layout({ gaps }: FormattedXml): Extension {
  const builder = new RangeSetBuilder<Gap>();
  for (let index = 0; index < gaps.length; index += 2) {
    builder.add(gaps[index]!, gaps[index + 1]!, GAP);
  }
  return [gapsField.init(() => builder.finish()), restoreGaps];
}

/** What a text's lines end in when it is saved. In its editor they end in line feeds. */
export const lineEnd = Facet.define<string, string>({ combine: ([one = "\n"]) => one });

/** The text of an editor without what `layout` put in, as it is to be saved. */
export function withoutLayout(state: EditorState): string {
  const text = state.sliceDoc();
  const pieces: string[] = [];
  let copied = 0;
  for (const cursor = state.field(gapsField).iter(); cursor.value; cursor.next()) {
    pieces.push(text.slice(copied, cursor.from));
    copied = cursor.to;
  }
  pieces.push(text.slice(copied));
  const saved = pieces.join("");
  const end = state.facet(lineEnd);
  return end === "\n" ? saved : saved.replace(/\r?\n/g, end); // what was pasted may have brought its own
}

/** Keeps the layout what it is in text that is copied: from a place in `source` to `target`, in another editor. */
export function copiedLayout(source: EditorState, { from, to }: Place, target: number): StateEffect<unknown>[] {
  const effects: StateEffect<Place>[] = [];
  source.field(gapsField).between(from, to, (gapFrom, gapTo) => {
    const offset = target - from;
    effects.push(restoreGap.of({ from: Math.max(gapFrom, from) + offset, to: Math.min(gapTo, to) + offset }));
  });
  return effects;
}
