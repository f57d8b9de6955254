// SPDX-License-Identifier: Apache-2.0
// The parts of a package: the outline, and beside it the part that is selected.
import type { Part, Relationship } from "../../client/src/index.js";
import type { Page } from "../document_view.js";
import { button, element } from "../ui/dom.js";
import { bytesText } from "../ui/text.js";
import { imageType, mayReplace } from "./images.js";
import type { PackageModel } from "./package_model.js";
import type { Panel } from "./package_view.js";
import { kindOf, partBytes, sizeOf, textOf, withImage } from "./part_kinds.js";
import { decodePart, encodePart, type PartText } from "./part_text.js";
import { PACKAGE, PartTree } from "./part_tree.js";
import { PartEditor } from "./xml_editor.js";

let editors = 0;

export class PartsPanel implements Panel {
  readonly element = element("div", { className: "package-parts" });

  #tree: PartTree;
  #pane = element("section", { className: "package-pane" });
  #shown = PACKAGE;
  #isFilled = false; // only once it is looked at: a long part takes its time
  #editor: { view: PartEditor; decoded: PartText; key: string; isDirty: boolean } | undefined;
  #imageUrl: string | undefined;
  #problem = element("p", { role: "status", className: "package-problem", hidden: true });
  #timer: ReturnType<typeof setTimeout> | undefined;
  #stopListening: () => void;

  constructor(
    private model: PackageModel,
    private page: Page,
  ) {
    this.#tree = new PartTree(model, page, (uri) => this.#show(uri));
    this.#pane.setAttribute("aria-label", page.text("package.part"));
    this.element.append(this.#tree.element, this.#pane);
    this.#stopListening = model.listen((parts, editor) => this.#follow(parts, editor));
    this.#shown = model.mainPart?.partUri ?? PACKAGE;
    this.#tree.select(this.#shown);
  }

  commit(): void {
    clearTimeout(this.#timer);
    const part = this.model.part(this.#shown);
    if (this.#editor?.isDirty && part) {
      const { view, decoded, key } = this.#editor;
      this.#editor.isDirty = false;
      const content = encodePart({ ...decoded, text: view.text });
      this.model.edit({ parts: new Map([[part.partUri, { ...part, content }]]), joins: key }, this);
      this.#showProblem();
    }
  }

  show(): void {
    if (!this.#isFilled) {
      this.#fillPane();
    }
  }

  hide(): void {}

  focus(): void {
    this.#tree.focus();
  }

  close(): void {
    this.#letGo();
    this.#stopListening();
  }

  /** Shows anew in the outline what is said of `parts`. */
  refresh(parts: Iterable<string>): void {
    for (const uri of parts) {
      this.#tree.refresh(uri);
    }
  }

  #follow(parts: ReadonlySet<string>, editor: unknown): void {
    this.refresh(parts);
    if ([...parts].some((uri) => !this.model.part(uri))) {
      this.#tree.fill();
    }
    if (this.#isFilled && editor !== this && (parts.has(this.#shown) || this.#shown === PACKAGE)) {
      this.#fillPane();
    }
  }

  #show(uri: string): void {
    this.commit();
    this.#shown = uri;
    this.#tree.select(uri);
    this.#fillPane();
    if (this.element.scrollHeight > this.element.clientHeight) {
      this.#pane.scrollIntoView(); // in a small window, below the outline
    }
  }

  #letGo(): void {
    clearTimeout(this.#timer);
    this.#editor?.view.view.destroy();
    this.#editor = undefined;
    if (this.#imageUrl !== undefined) {
      URL.revokeObjectURL(this.#imageUrl);
      this.#imageUrl = undefined;
    }
  }

  #fillPane(): void {
    this.#letGo();
    this.#isFilled = true;
    const { page } = this;
    const part = this.model.part(this.#shown);
    this.#problem.hidden = true;
    this.#pane.ondragover = null;
    this.#pane.ondrop = null;
    if (!part) {
      this.#pane.replaceChildren(
        element("h2", {}, page.text("package.parts.package")),
        this.#relationships([...this.model.relationships], true),
      );
      return;
    }
    const commands = element(
      "div",
      { className: "package-commands" },
      button(page.text("package.export"), () => this.#export()),
    );
    const head = element(
      "header",
      {},
      element("h2", {}, textOf(part.partUri)),
      element("p", {}, `${textOf(part.contentType)}, ${bytesText(sizeOf(part))}`),
      commands,
    );
    this.#pane.replaceChildren(head, this.#relationships(part.relationship ?? [], false), this.#problem);
    this.#pane.append(this.#body(part, commands));
    this.#showProblem();
  }

  #body(part: Part, commands: HTMLElement): HTMLElement {
    const kind = kindOf(part);
    if (kind === "image") {
      return this.#image(part, commands);
    }
    const decoded = kind === "binary" ? undefined : decodePart(part.content);
    if (!decoded) {
      return element("p", { className: "package-nothing" }, this.page.text("package.binary"));
    }
    return this.#text(part, decoded, kind === "xml", commands);
  }

  #text(part: Part, decoded: PartText, isXml: boolean, commands: HTMLElement): HTMLElement {
    const view = new PartEditor(decoded.text, isXml, textOf(part.partUri), () => this.#edited());
    // A new key each time: what is typed now is undone apart from what was typed before.
    this.#editor = { view, decoded, key: `editor ${++editors}`, isDirty: false };
    if (view.isLaidOut) {
      commands.append(
        button(this.page.text("package.layout.keep"), () => view.keepLayout(), {
          title: this.page.text("package.layout.hint"),
        }),
      );
    }
    view.view.dom.addEventListener("focusout", () => this.commit());
    return view.view.dom;
  }

  #edited(): void {
    const editor = this.#editor;
    if (editor) {
      editor.isDirty = true;
      this.page.changed();
      clearTimeout(this.#timer);
      // Encoding the whole part anew at every key would be felt in a long one.
      this.#timer = setTimeout(() => this.commit(), editor.view.view.state.doc.length > 2_000_000 ? 2000 : 300);
    }
  }

  #showProblem(): void {
    const problem = this.#editor?.view.findProblem();
    this.#problem.hidden = problem === undefined;
    if (problem) {
      const { reason, line, offset } = problem;
      const message = this.page.text("package.xml.problem", { line, reason: this.page.text(`package.xml.${reason}`) });
      const goTo = button(this.page.text("package.xml.goto"), () => this.#editor?.view.goTo(offset));
      this.#problem.replaceChildren(message, " ", goTo);
    }
  }

  #image(part: Part, commands: HTMLElement): HTMLElement {
    const { page } = this;
    const bytes = partBytes(part) as Uint8Array<ArrayBuffer>;
    // An image only, whatever it holds: scripts in an SVG do not run there, and nothing is loaded.
    this.#imageUrl = URL.createObjectURL(new Blob([bytes], { type: part.contentType }));
    const image = element("img", { alt: textOf(part.partUri), src: this.#imageUrl });
    const hint = element("p", { className: "package-nothing" }, page.text("package.image.drop"));
    image.addEventListener("error", () => image.replaceWith(element("p", {}, page.text("package.image.unknown"))));
    const picker = element("input", { type: "file", accept: "image/*", hidden: true });
    picker.setAttribute("aria-label", page.text("package.image.replace"));
    picker.addEventListener("change", () => void this.#replaceImage(part.partUri, picker.files?.[0]));
    commands.append(
      button(page.text("package.image.replace"), () => picker.click()),
      picker,
    );
    this.#pane.ondragover = (event) => event.preventDefault();
    this.#pane.ondrop = (event) => {
      event.preventDefault();
      void this.#replaceImage(part.partUri, event.dataTransfer?.files[0]);
    };
    return element("div", { className: "package-image" }, image, hint);
  }

  async #replaceImage(uri: string, file: File | undefined): Promise<void> {
    const bytes = file && new Uint8Array(await file.arrayBuffer());
    const part = this.model.part(uri);
    if (!bytes || !part) {
      return;
    }
    const type = imageType(bytes);
    if (type === undefined || !mayReplace(part.contentType, type)) {
      this.page.tell(this.page.text("package.image.refused", { name: file.name, type: part.contentType }), "problem");
      return;
    }
    this.model.edit({ parts: new Map([[uri, withImage(part, bytes, type)]]) });
    this.page.tell(this.page.text("package.image.replaced", { name: file.name }));
  }

  #export(): void {
    const part = this.model.part(this.#shown)!;
    this.commit();
    // Not under its own type, as which a browser might open it.
    const blob = new Blob([partBytes(part) as Uint8Array<ArrayBuffer>], { type: "application/octet-stream" });
    const url = URL.createObjectURL(blob);
    element("a", { href: url, download: textOf(part.partUri).replace(/^.*\//, "") }).click();
    setTimeout(() => URL.revokeObjectURL(url), 60_000);
  }

  #relationships(relationships: Relationship[], isOpen: boolean): HTMLElement {
    const { page } = this;
    const folder = this.#shown.slice(0, this.#shown.lastIndexOf("/") + 1);
    const rows = relationships.map(({ relationshipId, relationshipType, target }) => {
      const uri = resolve(folder, target);
      const name = textOf(target);
      return element(
        "tr",
        {},
        element("td", {}, textOf(relationshipId)),
        element("td", { title: textOf(relationshipType) }, textOf(relationshipType).replace(/^.*\//, "")),
        element(
          "td",
          {},
          this.model.part(uri) ? button(name, () => this.#show(uri), { className: "package-link" }) : name,
        ),
      );
    });
    const head = ["id", "type", "target"].map((key) =>
      element("th", { scope: "col" }, page.text(`package.relationships.${key}`)),
    );
    const count = page.text("package.relationships", { count: relationships.length });
    const details = element(
      "details",
      { open: isOpen, hidden: relationships.length === 0 },
      element("summary", {}, count),
    );
    details.append(
      element("table", {}, element("thead", {}, element("tr", {}, ...head)), element("tbody", {}, ...rows)),
    );
    return details;
  }
}

function resolve(folder: string, target: string): string {
  try {
    return new URL(target, `package:${folder}`).pathname;
  } catch {
    return "";
  }
}
