// SPDX-License-Identifier: Apache-2.0
// Questions in modal dialogs.
import type { Choice } from "../document_view.js";
import { element } from "./dom.js";

export interface Question {
  title: string;
  message: string;
  choices: Choice[];
  /** Something to look at while choosing; the dialog is large then. */
  body?: HTMLElement;
}

let asked = 0;

/** The value of the choice that is taken; nothing when the dialog is closed without one. */
export function ask({ title, message, choices, body }: Question): Promise<string | undefined> {
  const id = `dialog-${++asked}`; // one dialog may be asked on top of another
  const heading = element("h2", { id: `${id}-title` }, title);
  const explanation = element("p", { id: `${id}-message` }, message);
  const buttons = choices.map(({ value, label, isDefault }) =>
    element("button", { value, autofocus: Boolean(isDefault), className: isDefault ? "main" : "" }, label),
  );
  const form = element(
    "form",
    { method: "dialog" },
    heading,
    explanation,
    ...(body ? [body] : []),
    element("div", { className: "choices" }, ...buttons),
  );
  const dialog = element(
    "dialog",
    {
      className: body ? "large" : "",
      "aria-labelledby": heading.id,
      "aria-describedby": explanation.id,
    },
    form,
  );
  // An editor has uses of its own for Escape: it ends a search, and lets the Tab key leave. What was typed stays.
  body?.addEventListener("keydown", (event) => {
    if (event.key === "Escape" && (event.target as Element).closest(".cm-editor")) {
      event.preventDefault();
    }
  });
  document.body.append(dialog);
  return new Promise((resolve) => {
    const end = () => {
      dialog.remove();
      resolve(dialog.returnValue === "" ? undefined : dialog.returnValue);
    };
    dialog.addEventListener("close", end);
    // The policy of the page lets no form be sent, not even to a dialog.
    form.addEventListener("submit", (event) => {
      event.preventDefault();
      dialog.close((event.submitter as HTMLButtonElement | null)?.value ?? "");
      end(); // the event comes later, and a key that is pressed before it would meet a question that is over
    });
    dialog.showModal();
  });
}
