// SPDX-License-Identifier: Apache-2.0
// What the editor of a text is made of, in its tab and in a comparison.
import { defaultKeymap, history, historyKeymap, insertTab } from "@codemirror/commands";
import { search, searchKeymap } from "@codemirror/search";
import { EditorState, type Extension } from "@codemirror/state";
import {
  EditorView,
  drawSelection,
  highlightActiveLine,
  highlightSpecialChars,
  keymap,
  lineNumbers,
} from "@codemirror/view";
import type { Page } from "../document_view.js";
import { type FileForm, fileForm } from "./file_form.js";
import { lackingCharacters } from "./lacking_characters.js";
import { lineDirections } from "./line_directions.js";
import { PHRASES } from "./phrases.js";

/** An editor called `label`, of a text whose file has `form`. */
export function textEditor(form: FileForm, page: Page, label: string): Extension {
  return [
    fileForm(form),
    lineNumbers(),
    highlightActiveLine(),
    highlightSpecialChars(),
    drawSelection(),
    lineDirections,
    history(),
    search({ top: true }),
    lackingCharacters((charset) => page.text("text.lacks", { charset })),
    // Escape, and then Tab, leaves the editor.
    keymap.of([{ key: "Tab", run: insertTab }, ...searchKeymap, ...historyKeymap, ...defaultKeymap]),
    EditorState.phrases.of(PHRASES[document.documentElement.lang] ?? {}),
    // The browser gives it the focus without the index, but not every program that looks for what can have it knows.
    EditorView.contentAttributes.of({ "aria-label": label, tabindex: "0" }),
  ];
}
