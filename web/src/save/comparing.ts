// SPDX-License-Identifier: Apache-2.0
// A question that is answered while looking at a comparison.
import type { Comparison, DocumentView, LoadedDocument } from "../document_view.js";
import { type Question, ask } from "../ui/dialog.js";
import { reasonText, text } from "../ui/text.js";

/**
 * Asks `question` beside a comparison of what `view` holds with `theirs`. When the answer is "apply", the view takes
 * over the comparison's result; with another one, or none, what was put together is given up only after asking. Where
 * the two cannot be compared that is told, and the answer is nothing.
 */
export async function askComparing(
  view: DocumentView,
  theirs: LoadedDocument,
  question: Question,
): Promise<string | undefined> {
  let comparison: Comparison | undefined;
  const warn = (event: Event) => {
    if (comparison?.isEdited) {
      event.preventDefault();
    }
  };
  addEventListener("beforeunload", warn); // no draft has what is put together
  try {
    comparison = await view.compare(theirs);
    for (;;) {
      const choice = await ask({ ...question, body: comparison.element });
      if (choice === "apply") {
        comparison.apply();
      }
      if (choice === "apply" || !comparison.isEdited || (await mayBeLeft(question.title))) {
        return choice;
      }
    }
  } catch (error) {
    const { title } = question;
    await ask({ title, message: reasonText(error), choices: [{ value: "", label: text("action.back"), isDefault: true }] });
    return undefined;
  } finally {
    removeEventListener("beforeunload", warn);
    comparison?.close();
  }
}

async function mayBeLeft(title: string): Promise<boolean> {
  const choices = [
    { value: "", label: text("comparison.stay"), isDefault: true },
    { value: "leave", label: text("comparison.leave") },
  ];
  return (await ask({ title, message: text("comparison.leave.message"), choices })) === "leave";
}
