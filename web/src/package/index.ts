// SPDX-License-Identifier: Apache-2.0
// The view in which a document package is edited.
import type { Room } from "../document_view.js";
import { type PackageDraft, documentOf, documentSent, originalOf } from "./package_model.js";
import { PackageView } from "./package_view.js";

export const packages: Room = {
  open: async (loaded, page, draft) => {
    const original = isDraft(draft) ? await originalOf(draft, documentOf(loaded)) : undefined;
    return new PackageView(loaded, page, isDraft(draft) ? draft : undefined, original);
  },
  contentOf: async (draft, later, loaded) => {
    if (!isDraft(draft) || !isDraft(later)) {
      return undefined;
    }
    const present = documentOf(loaded);
    const content = documentSent((await originalOf(later, present)) ?? present, draft, later);
    return content && { kind: "package", content };
  },
};

function isDraft(draft: unknown): draft is PackageDraft {
  return (draft as PackageDraft | undefined)?.kind === "package";
}
