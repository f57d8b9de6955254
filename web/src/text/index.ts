// SPDX-License-Identifier: Apache-2.0
// The view in which a text is edited.
import { type DocumentContent, type DocumentView, type LoadedDocument, type Page } from "../document_view.js";
import { element } from "../ui/dom.js";

/** Shows a text in UTF-8 as it is; it cannot be changed yet. */
export function openText(loaded: LoadedDocument, _page: Page, _draft?: unknown): DocumentView {
  const area = element("pre", { tabIndex: 0 }, loaded.answer.data ?? "");
  return {
    element: area,
    content: async (): Promise<DocumentContent | undefined> => undefined,
    draft: () => undefined,
    replace: (other) => (area.textContent = other.answer.data ?? ""),
    compare: () => ({ element: element("div"), apply: () => {} }),
    focus: () => area.focus(),
    close: () => {},
  };
}
