// SPDX-License-Identifier: Apache-2.0
// A package in its tab: its text, its parts and its properties, one at a time, and a preview beside them.
import type { Document } from "../../client/src/index.js";
import type { Comparison, DocumentContent, DocumentView, LoadedDocument, Page } from "../document_view.js";
import { nameOf } from "../files/paths.js";
import { button, element, shortcutKey } from "../ui/dom.js";
import { PackageComparison } from "./comparison.js";
import { PackageModel, type PackageDraft, documentOf } from "./package_model.js";
import { kindOf, textOf } from "./part_kinds.js";
import { decodePart, isAsDeclared } from "./part_text.js";
import { PartsPanel } from "./parts_panel.js";
import { Preview } from "./preview.js";
import { PropertiesPanel } from "./properties_panel.js";
import { TextPanel } from "./text_panel.js";
import { findXmlError } from "./xml_scanner.js";

/** What one of the package's tabs shows. */
export interface Panel {
  readonly element: HTMLElement;
  /** Takes into the model what is being typed. */
  commit(): void;
  /** It is shown from now on, and follows the model. */
  show(): void;
  hide(): void;
  focus(): void;
  close(): void;
}

interface Panels {
  text: TextPanel;
  parts: PartsPanel;
  properties: PropertiesPanel;
}

type PanelName = keyof Panels;
const PANELS: PanelName[] = ["text", "parts", "properties"];
let views = 0;

export class PackageView implements DocumentView {
  readonly element = element("div", { className: "package" });

  #id = ++views;
  #model!: PackageModel;
  #panels!: Panels;
  #shown!: PanelName;
  #preview: Preview | undefined;
  #isClosed = false;
  // A draft without its original holds changed parts only. What to ask for that reason before a save.
  #lacking: "package.incomplete" | "package.mixed" | undefined;

  #tabs = new Map<PanelName, HTMLButtonElement>();
  #stage = element("div", { className: "package-stage" });
  #undo: HTMLButtonElement;
  #redo: HTMLButtonElement;
  #previewSwitch: HTMLButtonElement;

  constructor(
    loaded: LoadedDocument,
    private page: Page,
    draft?: PackageDraft,
    original?: Document,
  ) {
    this.#undo = this.#command("package.undo", () => this.#model.undo());
    this.#redo = this.#command("package.redo", () => this.#model.redo());
    this.#previewSwitch = button(page.text("package.preview"), () => this.#togglePreview(), {
      "aria-pressed": "false",
    });
    this.element.append(this.#bar(), this.#stage);
    this.element.addEventListener("keydown", (event) => this.#undoByKey(event));
    const isStored = draft && { ...draft, original: original && draft.original };
    this.#use(new PackageModel(original ?? documentOf(loaded), isStored));
    if (draft && !original) {
      this.#lacking = loaded.version === "" || loaded.unreadable !== undefined ? "package.incomplete" : "package.mixed";
      page.tell(page.text(this.#lacking, { name: nameOf(loaded.path) }), "problem");
    }
  }

  get isRemnant(): boolean {
    return this.#lacking === "package.incomplete";
  }

  async content(): Promise<DocumentContent | undefined> {
    this.#commit();
    if (this.#lacking && !(await this.#mayBeSaved(this.#lacking))) {
      return undefined;
    }
    this.#lacking = undefined;
    const broken = this.#brokenParts();
    if (broken.length > 0 && !(await this.#mayBeSaved("package.broken", broken))) {
      return undefined;
    }
    return { kind: "package", content: this.#model.document() };
  }

  saved(content: DocumentContent): void {
    if (content.kind === "package") {
      const changed = this.#model.changedParts();
      this.#model.saved(content.content);
      this.#isSaved(changed);
    }
  }

  draft(sent?: PackageDraft): PackageDraft {
    this.#commit();
    return this.#model.draft(sent);
  }

  replace(loaded: LoadedDocument): void {
    const hadFocus = this.element.contains(document.activeElement);
    this.#lacking = undefined;
    this.#use(new PackageModel(documentOf(loaded)));
    if (hadFocus) {
      this.focus();
    }
  }

  async compare(theirs: LoadedDocument): Promise<Comparison> {
    this.#commit();
    const mine = this.#model;
    const document = documentOf(theirs);
    return new PackageComparison(mine, document, this.page, (chosen, joint) => {
      if (this.#model !== mine) {
        throw new Error(this.page.text("package.differences.meanwhile"));
      }
      if (theirs.isEarlier) {
        mine.choose(chosen);
        return;
      }
      const changed = mine.changedParts();
      mine.adopt(document, chosen, joint);
      this.#isSaved(changed);
    });
  }

  focus(): void {
    this.#panels[this.#shown].focus();
  }

  close(): void {
    this.#isClosed = true;
    this.#closePanels();
  }

  #use(model: PackageModel): void {
    const { page } = this;
    const shown = this.#shown ?? "text";
    if (this.#model) {
      this.#closePanels();
    }
    this.#model = model;
    this.#panels = {
      text: new TextPanel(model, page, this.#panels?.text),
      parts: new PartsPanel(model, page),
      properties: new PropertiesPanel(model, page),
    };
    for (const name of PANELS) {
      const panel = this.#panels[name].element;
      panel.id = this.#idOf("panel", name);
      panel.setAttribute("role", "tabpanel");
      panel.setAttribute("aria-labelledby", this.#idOf("tab", name));
    }
    model.listen(() => {
      this.#showCommands();
      page.changed();
    });
    this.#showCommands();
    this.#previewSwitch.hidden = !isWordDocument(model);
    this.#stage.replaceChildren();
    this.#show(shown);
    // Beside what is edited only where there is room for both.
    if (isWordDocument(model) && matchMedia("(min-width: 1100px)").matches) {
      this.#togglePreview();
    }
  }

  // Or put together with what somebody else has saved. `changed` are the parts that were unsaved before.
  #isSaved(changed: string[]): void {
    this.#lacking = undefined;
    this.#panels.parts.refresh([...changed, ...this.#model.changedParts()]);
  }

  #closePanels(): void {
    for (const panel of Object.values(this.#panels) as Panel[]) {
      panel.close();
    }
    this.#preview?.close();
    this.#preview = undefined;
    this.#previewSwitch.setAttribute("aria-pressed", "false");
  }

  #commit(): void {
    this.#panels[this.#shown].commit();
  }

  #show(name: PanelName): void {
    if (this.#shown && this.#shown !== name) {
      this.#commit();
      this.#panels[this.#shown].hide();
    }
    this.#shown = name;
    for (const [tab, control] of this.#tabs) {
      control.setAttribute("aria-selected", String(tab === name));
      control.tabIndex = tab === name ? 0 : -1;
    }
    this.#stage.replaceChildren(this.#panels[name].element, ...(this.#preview ? [this.#preview.element] : []));
    this.#panels[name].show();
  }

  #togglePreview(): void {
    if (this.#preview) {
      this.#preview.close();
      this.#preview.element.remove();
      this.#preview = undefined;
    } else {
      this.#commit();
      this.#preview = new Preview(this.#model, this.page);
      this.#stage.append(this.#preview.element);
    }
    this.#previewSwitch.setAttribute("aria-pressed", String(this.#preview !== undefined));
  }

  #bar(): HTMLElement {
    const { page } = this;
    const tabs = element("div", {
      role: "tablist",
      "aria-label": page.text("package.views"),
      className: "package-tabs",
    });
    for (const name of PANELS) {
      const tab = button(page.text(`package.${name}`), () => this.#show(name), {
        role: "tab",
        id: this.#idOf("tab", name),
        "aria-controls": this.#idOf("panel", name),
      });
      this.#tabs.set(name, tab);
      tabs.append(tab);
    }
    tabs.addEventListener("keydown", (event) => this.#moveBetweenTabs(event));
    return element("div", { className: "package-bar" }, tabs, this.#undo, this.#redo, this.#previewSwitch);
  }

  #moveBetweenTabs(event: KeyboardEvent): void {
    const step = { ArrowRight: 1, ArrowLeft: PANELS.length - 1 }[event.key];
    if (step !== undefined) {
      const next = PANELS[(PANELS.indexOf(this.#shown) + step) % PANELS.length]!;
      this.#show(next);
      this.#tabs.get(next)!.focus();
      event.preventDefault();
    }
  }

  #idOf(kind: string, name: PanelName): string {
    return `package-${this.#id}-${kind}-${name}`;
  }

  #command(key: string, run: () => void): HTMLButtonElement {
    return button(this.page.text(key), () => {
      this.#commit();
      run();
    });
  }

  #showCommands(): void {
    this.#undo.disabled = !this.#model.canUndo;
    this.#redo.disabled = !this.#model.canRedo;
  }

  // Fields and the editor undo by themselves.
  #undoByKey(event: KeyboardEvent): void {
    const isOwn = !(event.target as Element).closest("input, textarea, .cm-editor");
    const key = shortcutKey(event);
    if (!isOwn || !(event.ctrlKey || event.metaKey) || (key !== "z" && key !== "y")) {
      return;
    }
    const control = key === "y" || event.shiftKey ? this.#redo : this.#undo;
    control.click();
    event.preventDefault();
  }

  #brokenParts(): string[] {
    const changed = [...this.#model.parts].filter(
      (part) => kindOf(part) === "xml" && this.#model.isChanged(part.partUri),
    );
    const isBroken = (content: string) => {
      const decoded = decodePart(content);
      return !decoded || !isAsDeclared(decoded) || findXmlError(decoded.text) !== undefined;
    };
    return changed.filter(({ content }) => isBroken(content)).map(({ partUri }) => textOf(partUri));
  }

  // Asks with the texts of `key` whether to save all the same a document that office programs will not open.
  async #mayBeSaved(key: string, parts: string[] = this.#model.changedParts().map(textOf)): Promise<boolean> {
    const { page } = this;
    const answer = await page.ask({
      title: page.text(`${key}.title`),
      message: page.text(`${key}.message`, { parts: parts.join(", ") }),
      choices: [
        { value: "save", label: page.text(`${key}.save`) },
        { value: "", label: page.text(`${key}.cancel`), isDefault: true },
      ],
    });
    return answer === "save" && !this.#isClosed;
  }
}

function isWordDocument({ mainPart }: PackageModel): boolean {
  return mainPart !== undefined && /wordprocessingml|ms-word/i.test(mainPart.contentType);
}
