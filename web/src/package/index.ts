// SPDX-License-Identifier: Apache-2.0
// The view in which a document package is edited.
import { type DocumentContent, type DocumentView, type LoadedDocument, type Page } from "../document_view.js";
import { element } from "../ui/dom.js";

/** Shows the names of the parts; they cannot be changed yet. */
export function openPackage(loaded: LoadedDocument, _page: Page, _draft?: unknown): DocumentView {
  const namesOf = (one: LoadedDocument) => (one.answer.parts ?? []).map((part) => element("li", {}, part.partUri));
  const list = element("ul", { tabIndex: 0 }, ...namesOf(loaded));
  return {
    element: list,
    content: async (): Promise<DocumentContent | undefined> => undefined,
    draft: () => undefined,
    replace: (other) => list.replaceChildren(...namesOf(other)),
    compare: () => ({ element: element("div"), apply: () => {} }),
    focus: () => list.focus(),
    close: () => {},
  };
}
