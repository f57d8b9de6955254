// SPDX-License-Identifier: Apache-2.0
// The outline of a package: its parts by folder, as a tree that is used with the keyboard as trees are.
import type { Page } from "../document_view.js";
import { element } from "../ui/dom.js";
import { bytesText } from "../ui/text.js";
import type { PackageModel } from "./package_model.js";
import { byName, sizeOf, textOf } from "./part_kinds.js";

/** Stands in the tree for the package itself. */
export const PACKAGE = "/";

let folders = 0;

export class PartTree {
  readonly element = element("ul", { role: "tree", className: "package-tree" });

  #items = new Map<string, HTMLElement>();
  #selected = PACKAGE;

  /** Calls `selected` when the person selects a part, or PACKAGE. */
  constructor(
    private model: PackageModel,
    private page: Page,
    private selected: (uri: string) => void,
  ) {
    this.element.setAttribute("aria-label", page.text("package.parts"));
    this.element.addEventListener("click", (event) => this.#click(event));
    this.element.addEventListener("keydown", (event) => this.#moveByKey(event));
    this.fill();
  }

  /** Shows which parts there are now. */
  fill(): void {
    const hadFocus = this.element.contains(document.activeElement);
    const folders = new Map<string, string[]>();
    for (const { partUri } of this.model.parts) {
      const folder = partUri.slice(0, partUri.lastIndexOf("/") + 1);
      const uris = folders.get(folder) ?? [];
      uris.push(partUri);
      folders.set(folder, uris);
    }
    this.#items.clear();
    const root = this.#item(PACKAGE, this.page.text("package.parts.package"), 1);
    const groups = [...folders]
      .sort(([one], [other]) => byName(one, other))
      .map(([name, uris]) => this.#folder(name, uris));
    this.element.replaceChildren(root, ...groups);
    this.select(this.#items.has(this.#selected) ? this.#selected : PACKAGE);
    if (hadFocus) {
      this.focus();
    }
  }

  /** Marks an item as the one that is shown. */
  select(uri: string): void {
    this.#selected = uri;
    for (const [name, item] of this.#items) {
      item.setAttribute("aria-selected", String(name === uri));
      item.tabIndex = name === uri ? 0 : -1;
    }
  }

  /** Shows anew what is said of a part. */
  refresh(uri: string): void {
    const item = this.#items.get(uri);
    if (item) {
      item.replaceChildren(...this.#contents(uri));
    } else {
      this.fill();
    }
  }

  focus(): void {
    this.#items.get(this.#selected)?.focus();
  }

  #folder(name: string, uris: string[]): HTMLElement {
    const level = name === "/" ? 1 : 2;
    const items = uris.sort(byName).map((uri) => this.#item(uri, "", level));
    if (name === "/") {
      const group = element("li", { role: "none" });
      group.append(element("ul", { role: "none" }, ...items));
      return group;
    }
    const group = element("ul", { role: "group", id: `package-folder-${++folders}` }, ...items);
    const label = element("span", {
      role: "treeitem",
      className: "package-folder",
      "aria-expanded": "true",
      "aria-level": 1,
      "aria-owns": group.id,
      tabIndex: -1,
    });
    label.textContent = textOf(name);
    return element("li", { role: "none" }, label, group);
  }

  #item(uri: string, label: string, level: number): HTMLElement {
    const item = element("li", { role: "treeitem", "aria-level": level, className: "package-part" });
    item.dataset.uri = uri;
    item.append(...(label ? [label] : this.#contents(uri)));
    this.#items.set(uri, item);
    return item;
  }

  #contents(uri: string): (Node | string)[] {
    const part = this.model.part(uri);
    const name = element("span", { className: "package-name" }, textOf(uri.slice(uri.lastIndexOf("/") + 1)));
    const contents: Node[] = [name];
    if (part) {
      contents.push(element("small", { title: textOf(part.contentType) }, bytesText(sizeOf(part))));
    }
    if (this.model.isChanged(uri)) {
      contents.push(element("span", { className: "package-changed" }, this.page.text("package.parts.changed")));
    }
    return contents;
  }

  #click(event: MouseEvent): void {
    const item = (event.target as Element).closest<HTMLElement>("[role=treeitem]");
    if (item?.dataset.uri !== undefined) {
      this.#choose(item);
    } else if (item) {
      this.#expand(item, item.getAttribute("aria-expanded") !== "true");
    }
  }

  #choose(item: HTMLElement): void {
    item.focus();
    if (item.dataset.uri !== undefined) {
      this.select(item.dataset.uri);
      this.selected(item.dataset.uri);
    }
  }

  #expand(folder: HTMLElement, isExpanded: boolean): void {
    folder.setAttribute("aria-expanded", String(isExpanded));
    (folder.nextElementSibling as HTMLElement).hidden = !isExpanded;
  }

  #moveByKey(event: KeyboardEvent): void {
    const items = [...this.element.querySelectorAll<HTMLElement>("[role=treeitem]")].filter(
      (item) => !item.closest("ul[hidden]"),
    );
    const current = document.activeElement as HTMLElement;
    const index = items.indexOf(current);
    if (index < 0 || event.ctrlKey || event.metaKey || event.altKey) {
      return;
    }
    const isFolder = current.dataset.uri === undefined;
    const isExpanded = current.getAttribute("aria-expanded") === "true";
    let next: HTMLElement | undefined;
    if (event.key === "ArrowDown") {
      next = items[index + 1];
    } else if (event.key === "ArrowUp") {
      next = items[index - 1];
    } else if (event.key === "Home") {
      next = items[0];
    } else if (event.key === "End") {
      next = items[items.length - 1];
    } else if (event.key === "ArrowRight" && isFolder) {
      next = isExpanded ? items[index + 1] : undefined;
      this.#expand(current, true);
    } else if (event.key === "ArrowLeft") {
      next = isFolder ? undefined : folderOf(current);
      if (isFolder) {
        this.#expand(current, false);
      }
    } else if (event.key === "Enter" || event.key === " ") {
      this.#click({ target: current } as unknown as MouseEvent);
    } else if (event.key.length === 1) {
      const wanted = event.key.toLowerCase();
      next = [...items.slice(index + 1), ...items].find((item) => itemName(item).startsWith(wanted));
    } else {
      return;
    }
    event.preventDefault();
    next?.focus();
  }
}

function folderOf(part: HTMLElement): HTMLElement | undefined {
  const label = part.parentElement?.previousElementSibling;
  return label instanceof HTMLElement && label.role === "treeitem" ? label : undefined;
}

function itemName(item: HTMLElement): string {
  return (item.querySelector(".package-name") ?? item).textContent!.toLowerCase();
}
