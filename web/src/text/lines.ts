// SPDX-License-Identifier: Apache-2.0
// The line ends of a text. The editor knows lines only, so the ends of those that differ from the rest are
// kept beside its text, as ranges over the breaks, which follow every edit.
import { ChangeDesc, RangeSet, RangeSetBuilder, RangeValue, Text } from "@codemirror/state";

/** "\n", "\r\n" and "\r". */
export const LINE_ENDS = ["\n", "\r\n", "\r"] as const;
export type LineEnd = (typeof LINE_ENDS)[number];

class ExceptionalEnd extends RangeValue {
  // What is typed before a break or behind it is no part of it.
  override startSide = 1;
  override endSide = -1;

  constructor(readonly lineEnd: LineEnd) {
    super();
  }

  override eq(other: RangeValue): boolean {
    return other instanceof ExceptionalEnd && other.lineEnd === this.lineEnd;
  }
}

const EXCEPTIONS = new Map(LINE_ENDS.map((lineEnd) => [lineEnd, new ExceptionalEnd(lineEnd)]));

/** How lines end: as `usual`, which new ones do, too, but for those breaks that are listed. */
export interface LineEnds {
  usual: LineEnd;
  exceptions: RangeSet<ExceptionalEnd>;
}

export function uniform(usual: LineEnd): LineEnds {
  return { usual, exceptions: RangeSet.empty };
}

/** The lines of `text` and their ends, of which the commonest is the usual one. Linear. */
export function splitLines(text: string): { doc: Text; lineEnds: LineEnds } {
  const lines: string[] = [];
  const ends: LineEnd[] = [];
  let begin = 0;
  let feed = text.indexOf("\n");
  let carriageReturn = text.indexOf("\r");
  while (feed >= 0 || carriageReturn >= 0) {
    const isFeed = carriageReturn < 0 || (feed >= 0 && feed < carriageReturn);
    const index = isFeed ? feed : carriageReturn;
    const end = isFeed ? "\n" : feed === index + 1 ? "\r\n" : "\r";
    lines.push(text.slice(begin, index));
    ends.push(end);
    begin = index + end.length;
    if (end !== "\r") {
      feed = text.indexOf("\n", begin);
    }
    if (end !== "\n") {
      carriageReturn = text.indexOf("\r", begin);
    }
  }
  lines.push(text.slice(begin));
  const usual = commonest(ends);
  const builder = new RangeSetBuilder<ExceptionalEnd>();
  let position = 0;
  for (const [index, end] of ends.entries()) {
    position += lines[index]!.length;
    if (end !== usual) {
      builder.add(position, position + 1, EXCEPTIONS.get(end)!);
    }
    ++position;
  }
  return { doc: Text.of(lines), lineEnds: { usual, exceptions: builder.finish() } };
}

function commonest(ends: LineEnd[]): LineEnd {
  const counts = LINE_ENDS.map((lineEnd) => ends.reduce((count, end) => count + (end === lineEnd ? 1 : 0), 0));
  return LINE_ENDS[counts.indexOf(Math.max(...counts))]!;
}

/** The text with its line ends, in pieces of at most some 64 thousand units or else a line. */
export function* piecesOf(doc: Text, { usual, exceptions }: LineEnds): Generator<string> {
  const exception = exceptions.iter();
  let collected: string[] = [];
  let size = 0;
  let position = 0;
  let isBehindReturn = false;
  for (const part of doc.iter()) {
    let piece = part;
    if (part === "\n") {
      piece = usual;
      if (exception.value && exception.from === position) {
        piece = exception.value.lineEnd;
        exception.next();
      }
      if (isBehindReturn && piece === "\n") {
        piece = "\n\n"; // or else the two would be read as one
      }
    }
    isBehindReturn = piece === "\r";
    position += part.length;
    collected.push(piece);
    size += piece.length;
    if (size > 0x10000) {
      yield collected.join("");
      collected = [];
      size = 0;
    }
  }
  yield collected.join("");
}

/** The line ends behind an edit: what was deleted is gone, what is new ends as usual. */
export function mapLineEnds({ usual, exceptions }: LineEnds, changes: ChangeDesc): LineEnds {
  return { usual, exceptions: exceptions.map(changes) };
}

/** The exceptions as pairs of a position and the index of a line end; for a store. */
export function storable({ exceptions }: LineEnds): number[] {
  const stored: number[] = [];
  for (const cursor = exceptions.iter(); cursor.value; cursor.next()) {
    stored.push(cursor.from, LINE_ENDS.indexOf(cursor.value.lineEnd));
  }
  return stored;
}

export function fromStored(usual: LineEnd, stored: readonly number[]): LineEnds {
  const builder = new RangeSetBuilder<ExceptionalEnd>();
  for (let index = 0; index < stored.length; index += 2) {
    builder.add(stored[index]!, stored[index]! + 1, EXCEPTIONS.get(LINE_ENDS[stored[index + 1]!]!)!);
  }
  return { usual, exceptions: builder.finish() };
}
