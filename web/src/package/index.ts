// SPDX-License-Identifier: Apache-2.0
// The view in which a document package is edited.
import type { Room } from "../document_view.js";
import { type PackageDraft, documentOf, documentSent } from "./package_model.js";
import { PackageView } from "./package_view.js";

export const packages: Room = {
  open: (loaded, page, draft) => new PackageView(loaded, page, isDraft(draft) ? draft : undefined),
  contentOf: async (draft, later, loaded) => {
    const content = isDraft(draft) && isDraft(later) && documentSent(documentOf(loaded), draft, later);
    return content ? { kind: "package", content } : undefined;
  },
};

function isDraft(draft: unknown): draft is PackageDraft {
  return (draft as PackageDraft | undefined)?.kind === "package";
}
