// SPDX-License-Identifier: Apache-2.0
// The editor of one part's text: XML laid out for reading, or a text as it is.
import { defaultKeymap, history, historyKeymap, indentWithTab } from "@codemirror/commands";
import { xml } from "@codemirror/lang-xml";
import { bracketMatching, foldGutter, HighlightStyle, syntaxHighlighting } from "@codemirror/language";
import { highlightSelectionMatches, search, searchKeymap } from "@codemirror/search";
import { EditorState, type Extension } from "@codemirror/state";
import { drawSelection, EditorView, keymap, lineNumbers } from "@codemirror/view";
import { tags } from "@lezer/highlight";

import { formatXml, keepLayout, layout, lineEnd, withoutLayout } from "./xml_formatting.js";
import { findXmlError, XmlError } from "./xml_scanner.js";

const COLOURS = HighlightStyle.define([
  { tag: [tags.tagName, tags.angleBracket], color: "var(--accent)" },
  { tag: tags.attributeName, color: "var(--changed)" },
  { tag: [tags.comment, tags.processingInstruction, tags.documentMeta], color: "var(--soft-text)" },
]);

// Colours of syntax cost more in what is very long than they help.
const LONGEST_COLOURED = 20_000_000; // characters

/** What every editor of a part is made of. */
export function editorBasics(isXml: boolean, length: number): Extension[] {
  return [
    // Only these end lines; carriage returns, where not all lines have them, stay characters in a line.
    EditorState.lineSeparator.of("\n"),
    lineNumbers(),
    drawSelection(),
    bracketMatching(),
    ...(isXml && length < LONGEST_COLOURED ? [xml(), foldGutter(), syntaxHighlighting(COLOURS)] : []),
    EditorView.lineWrapping,
    // The browser gives it the focus without that, but not every program that looks for what can have it knows.
    EditorView.contentAttributes.of({ tabindex: "0" }),
  ];
}

/** What ends the lines of all `texts`: "\r\n" where nothing else does, or else "\n". */
export function lineEndOf(...texts: string[]): string {
  const hasOther = texts.some((text) => /(?<!\r)\n|\r(?!\n)/.test(text));
  return !hasOther && texts.some((text) => text.includes("\r\n")) ? "\r\n" : "\n";
}

interface LaidOut {
  doc: string;
  /** What keeps account of the layout and of the line ends. */
  extension: Extension;
  isLaidOut: boolean;
}

/** `text`, whose lines end in `end`, for an editor: laid out, where it is well-formed XML. */
export function laidOut(text: string, isXml: boolean, end = lineEndOf(text)): LaidOut {
  const lines = text.replaceAll(end, "\n");
  let formatted = { text: lines, gaps: [] as number[] };
  if (isXml) {
    try {
      formatted = formatXml(lines);
    } catch (error) {
      if (!(error instanceof XmlError)) {
        throw error;
      }
    }
  }
  const extension = [layout(formatted), lineEnd.of(end)];
  return { doc: formatted.text, extension, isLaidOut: formatted.gaps.length > 0 };
}

export class PartEditor {
  readonly view: EditorView;
  /** Whether line breaks and indentation were put in for reading. */
  readonly isLaidOut: boolean;
  #isXml: boolean;

  /** Calls `changed` on every edit by the person. `label` is what screen readers call the editor. */
  constructor(text: string, isXml: boolean, label: string, changed: () => void) {
    this.#isXml = isXml;
    const { doc, extension, isLaidOut } = laidOut(text, isXml);
    this.isLaidOut = isLaidOut;
    this.view = new EditorView({
      state: EditorState.create({
        doc,
        extensions: [
          editorBasics(isXml, doc.length),
          extension,
          history(),
          search({ top: true }),
          highlightSelectionMatches(),
          keymap.of([...searchKeymap, ...historyKeymap, ...defaultKeymap, indentWithTab]),
          EditorView.contentAttributes.of({ "aria-label": label }),
          EditorView.updateListener.of((update) => {
            if (
              update.docChanged ||
              update.transactions.some(({ effects }) => effects.some((one) => one.is(keepLayout)))
            ) {
              changed();
            }
          }),
        ],
      }),
    });
  }

  /** The text as it is to be saved. */
  get text(): string {
    return withoutLayout(this.view.state);
  }

  /** Makes line breaks and indentation that were put in for reading part of the text. */
  keepLayout(): void {
    this.view.dispatch({ effects: keepLayout.of(null) });
  }

  /** What is not well-formed, and in which line; nothing where all is well. */
  findProblem(): { reason: string; line: number; offset: number } | undefined {
    const { doc } = this.view.state;
    const error = this.#isXml ? findXmlError(doc.toString()) : undefined;
    return error && { reason: error.reason, line: doc.lineAt(error.offset).number, offset: error.offset };
  }

  goTo(offset: number): void {
    this.view.dispatch({ selection: { anchor: offset }, effects: EditorView.scrollIntoView(offset, { y: "center" }) });
    this.view.focus();
  }
}
