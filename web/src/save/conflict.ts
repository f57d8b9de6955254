// SPDX-License-Identifier: Apache-2.0
// Somebody else has saved: what becomes of both.
import type { DocumentView, LoadedDocument } from "../document_view.js";
import { ask } from "../ui/dialog.js";
import { text } from "../ui/text.js";
import { askComparing } from "./comparing.js";

/**
 * Asks whose version stays. "mine": what the view holds, in which both may have been put together; it is to be
 * saved on the base of `theirs`. Nothing: the person wants to decide later. `theirs` is nothing where the
 * document was removed. What cannot be read can be saved over, too, or be looked at "again", since that may pass.
 */
export async function resolveConflict(
  name: string,
  view: DocumentView,
  theirs: LoadedDocument | undefined,
): Promise<"mine" | "theirs" | "again" | undefined> {
  if (!theirs) {
    return (await ask({
      title: text("conflict.removed.title", { name }),
      message: text("conflict.removed.message"),
      choices: [later(), { value: "mine", label: text("conflict.removed.save"), isDefault: true }],
    })) as "mine" | undefined;
  }
  if (theirs.unreadable !== undefined) {
    return (await ask({
      title: text("conflict.unreadable.title", { name }),
      message: text("conflict.unreadable.message", { reason: theirs.unreadable }),
      choices: [
        later(),
        { value: "mine", label: text("conflict.unreadable.save") },
        { value: "again", label: text("action.retry"), isDefault: true },
      ],
    })) as "mine" | "again" | undefined;
  }
  for (;;) {
    const choice = await ask({
      title: text("conflict.title", { name }),
      message: text("conflict.message"),
      choices: [later(), theirsChoice(), mineChoice(), { value: "compare", label: text("conflict.compare"), isDefault: true }],
    });
    const decision = choice === "compare" ? await compare(name, view, theirs) : choice;
    if (decision !== "back") {
      return decision as "mine" | "theirs" | undefined;
    }
  }
}

async function compare(name: string, view: DocumentView, theirs: LoadedDocument): Promise<"mine" | "theirs" | "back"> {
  const choice = await askComparing(view, theirs, {
    title: text("conflict.title", { name }),
    message: text("conflict.compare.message"),
    choices: [
      { value: "", label: text("action.back") },
      theirsChoice(),
      { value: "apply", label: text("conflict.together"), isDefault: true },
    ],
  });
  return choice === "apply" ? "mine" : choice === "theirs" ? "theirs" : "back";
}

const later = () => ({ value: "", label: text("conflict.later") });
const mineChoice = () => ({ value: "mine", label: text("conflict.mine") });
const theirsChoice = () => ({ value: "theirs", label: text("conflict.theirs") });
