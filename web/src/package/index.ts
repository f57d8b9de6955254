// SPDX-License-Identifier: Apache-2.0
// The view in which a document package is edited.
import type { DocumentView, LoadedDocument, Page } from "../document_view.js";
import type { PackageDraft } from "./package_model.js";
import { PackageView } from "./package_view.js";

export function openPackage(loaded: LoadedDocument, page: Page, draft?: unknown): DocumentView {
  return new PackageView(loaded, page, isDraft(draft) ? draft : undefined);
}

function isDraft(draft: unknown): draft is PackageDraft {
  return (draft as PackageDraft | undefined)?.kind === "package";
}
