// SPDX-License-Identifier: Apache-2.0
// A document's properties as a form.
import type { Page } from "../document_view.js";
import { element } from "../ui/dom.js";
import type { PackageModel } from "./package_model.js";
import type { Panel } from "./package_view.js";
import { PROPERTIES, propertyEdit, readProperties, type PropertyName } from "./properties.js";

export class PropertiesPanel implements Panel {
  readonly element = element("div", { className: "package-properties" });

  #fields = new Map<PropertyName, HTMLInputElement | HTMLTextAreaElement>();
  #problem: HTMLElement;
  #stopListening: () => void;

  constructor(
    private model: PackageModel,
    page: Page,
  ) {
    this.#problem = element("p", { className: "problem", hidden: true }, page.text("package.properties.problem"));
    this.element.append(this.#problem);
    for (const name of Object.keys(PROPERTIES) as PropertyName[]) {
      const field = name === "description" ? element("textarea", { rows: 4 }) : element("input", { type: "text" });
      field.dir = "auto";
      field.addEventListener("input", () => this.model.edit(propertyEdit(this.model, name, field.value), this));
      this.#fields.set(name, field);
      this.element.append(element("label", {}, page.text(`package.properties.${name}`), field));
    }
    this.#stopListening = model.listen((_parts, editor) => editor === this || this.show());
  }

  commit(): void {}

  show(): void {
    const properties = readProperties(this.model);
    this.#problem.hidden = properties !== undefined;
    for (const [name, field] of this.#fields) {
      field.disabled = properties === undefined;
      field.value = properties?.[name] ?? "";
    }
  }

  hide(): void {}

  focus(): void {
    this.#fields.get("title")!.focus();
  }

  close(): void {
    this.#stopListening();
  }
}
