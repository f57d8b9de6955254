// SPDX-License-Identifier: Apache-2.0
// The tree of files. Only the rows in sight are elements, so that folders of many thousand files do not slow it
// down; the focus stays on the tree, which says which row is the active one (WAI-ARIA tree pattern).
import { type Client, type FolderEntry } from "../../client/src/index.js";
import { button, element } from "../ui/dom.js";
import { reasonText, text } from "../ui/text.js";
import { TreeModel, type TreeNode } from "./tree_model.js";

const ROW = 26; // pixels, as in files.css
const BEYOND = 10; // rows that are made above and below those in sight
const MOST_SEARCHED = 1000; // folders that a search looks into
const REFRESH_DELAY = 300; // ms in which changes of a folder are gathered

export interface TreeOptions {
  client(): Client;
  open(path: string): void;
  tell(message: string, kind?: "information" | "problem"): void;
}

export class FileTree {
  readonly element: HTMLElement;
  #model = new TreeModel();
  #active: TreeNode | undefined;
  #shownPath = "";
  #rows = element("div", { role: "presentation", className: "rows" });
  #tree = element("div", { role: "tree", className: "tree", tabIndex: 0, "aria-label": text("files.title") }, this.#rows);
  #filter = element("input", { type: "search", placeholder: text("files.filter"), "aria-label": text("files.filter") });
  #found = element("p", { role: "status", className: "found" });
  #reading = new Map<TreeNode, Promise<void>>();
  #toRefresh = new Map<TreeNode, ReturnType<typeof setTimeout>>();
  #search = 0;
  #isRenderWaiting = false;
  #isPressed = false; // A row that is drawn again while the mouse is pressed on it gets no click.

  constructor(private options: TreeOptions) {
    const refresh = button("\u21bb", () => void this.refresh(), { title: text("files.refresh"), "aria-label": text("files.refresh") });
    const head = element("div", { className: "head" }, this.#filter, refresh);
    this.element = element("nav", { className: "files", "aria-label": text("files.title") }, head, this.#found, this.#tree);
    this.#filter.addEventListener("input", () => this.#filterChanged());
    this.#filter.addEventListener("keydown", (event) => this.#filterKey(event));
    this.#tree.addEventListener("keydown", (event) => this.#key(event));
    this.#tree.addEventListener("scroll", () => this.#render(), { passive: true });
    this.#rows.addEventListener("click", (event) => this.#click(event));
    this.#rows.addEventListener("pointerdown", ({ button, ctrlKey }) => (this.#isPressed = button === 0 && !ctrlKey));
    // Where a menu or a dialog comes up, the button is let go unseen.
    for (const end of ["pointerup", "pointercancel", "contextmenu", "blur", "keydown"]) {
      addEventListener(end, () => {
        if (this.#isPressed) {
          this.#isPressed = false;
          this.#render();
        }
      });
    }
    new ResizeObserver(() => this.#render()).observe(this.#tree);
  }

  /** Reads the roots, and opens them where there are few. */
  async start(): Promise<void> {
    const roots = await this.options.client().roots();
    this.#model.setRoots(roots);
    this.#active = this.#model.roots[0];
    if (roots.length <= 3) {
      await Promise.all(this.#model.roots.map((root) => this.#open(root)));
    }
    this.#render();
  }

  /** Reads all folders again that are known. */
  async refresh(): Promise<void> {
    const known = [...this.#model.nodes()].filter((node) => node.kind === "folder" && node.state !== "unread");
    await Promise.all(known.map((node) => this.#readAgain(node)));
  }

  /** A file may have been written. */
  changed(path: string): void {
    const folder = this.#model.markChanged(path);
    const known = this.#model.find(path);
    if (known && path === this.#shownPath) {
      known.isChanged = false;
    }
    if (folder && folder.state !== "unread" && !this.#toRefresh.has(folder)) {
      const refresh = () => {
        this.#toRefresh.delete(folder);
        void this.#readAgain(folder).then(() => {
          // A file that is new has its node only now.
          const node = this.#model.find(path);
          if (node) {
            node.isChanged = path !== this.#shownPath;
            this.#render();
          }
        });
      };
      this.#toRefresh.set(folder, setTimeout(refresh, REFRESH_DELAY));
    }
    this.#render();
  }

  /** Shows which document is being looked at. */
  show(path: string): void {
    this.#shownPath = path;
    const node = this.#model.find(path);
    if (node) {
      node.isChanged = false;
      this.#active = node;
    }
    this.#render();
  }

  focus(): void {
    this.#tree.focus();
  }

  focusFilter(): void {
    this.#filter.focus();
    this.#filter.select();
  }

  async #open(folder: TreeNode): Promise<void> {
    this.#model.setOpen(folder, true);
    if (folder.state === "unread" || folder.state === "failed") {
      await this.#read(folder);
    }
    this.#render();
  }

  // What is under way may have missed what has changed since it began.
  async #readAgain(folder: TreeNode): Promise<void> {
    await this.#reading.get(folder);
    await this.#read(folder);
  }

  #read(folder: TreeNode): Promise<void> {
    const underWay = this.#reading.get(folder);
    if (underWay) {
      return underWay;
    }
    const reading = this.#readNow(folder).finally(() => this.#reading.delete(folder));
    this.#reading.set(folder, reading);
    return reading;
  }

  async #readNow(folder: TreeNode): Promise<void> {
    folder.state = "reading";
    this.#render();
    try {
      const entries: FolderEntry[] = [];
      for (let isLast = false; !isLast; ) {
        const page = await this.options.client().list(folder.path, entries.at(-1)?.name);
        entries.push(...page.entries);
        isLast = page.isLast || page.entries.length === 0;
        if (folder.children.length < entries.length) {
          this.#model.setChildren(folder, entries);
          this.#render();
        }
      }
      this.#model.setChildren(folder, entries);
      folder.state = "read";
    } catch (error) {
      folder.state = "failed";
      this.options.tell(text("files.failed", { path: folder.path, reason: reasonText(error) }), "problem");
    }
    this.#render();
  }

  #filterChanged(): void {
    this.#model.setFilter(this.#filter.value);
    this.#tree.scrollTop = 0;
    this.#active = this.#model.isFiltered ? this.#firstFile() : (this.#active ?? this.#model.roots[0]);
    this.#render();
    this.#tellFound(false);
    void this.#searchUnread(++this.#search);
  }

  // Folders that have not been opened are looked into as well, the nearest first.
  async #searchUnread(search: number): Promise<void> {
    for (let count = 0; count < MOST_SEARCHED && this.#model.isFiltered && search === this.#search; ++count) {
      const unread = [...this.#model.nodes()]
        .filter(({ kind, name, state }) => kind === "folder" && isToSearch[state] && !name.startsWith("."))
        .sort((one, other) => one.level - other.level)[0];
      if (!unread) {
        break;
      }
      this.#tellFound(true);
      await this.#read(unread);
      this.#active ??= this.#firstFile();
    }
    if (search === this.#search) {
      this.#tellFound(false);
    }
  }

  #tellFound(isSearching: boolean): void {
    const count = this.#model.rows().filter((node) => node.kind !== "folder").length;
    const found = count === 0 ? text("files.none") : text("files.found", { count });
    this.#found.textContent = !this.#model.isFiltered ? "" : isSearching ? text("files.searching") : found;
  }

  #firstFile(): TreeNode | undefined {
    return this.#model.rows().find((node) => node.kind === "file");
  }

  #filterKey(event: KeyboardEvent): void {
    if (event.key === "Escape" && this.#filter.value !== "") {
      this.#filter.value = "";
      this.#filterChanged();
    } else if (event.key === "ArrowDown") {
      this.focus();
    } else if (event.key === "Enter" && this.#active && !event.isComposing) {
      this.#act(this.#active);
    } else {
      return;
    }
    event.preventDefault();
  }

  #key(event: KeyboardEvent): void {
    if (event.ctrlKey || event.altKey || event.metaKey) {
      return;
    }
    const rows = this.#model.rows();
    const index = this.#active ? rows.indexOf(this.#active) : -1;
    const page = Math.max(1, Math.floor(this.#tree.clientHeight / ROW) - 1);
    const targets: Record<string, number> = {
      ArrowDown: index + 1,
      ArrowUp: index - 1,
      PageDown: Math.min(index + page, rows.length - 1),
      PageUp: Math.max(index - page, 0),
      Home: 0,
      End: rows.length - 1,
    };
    const target = targets[event.key];
    const node = rows[index];
    if (target !== undefined) {
      this.#activate(rows[target]);
    } else if (node && event.key === "ArrowRight") {
      this.#goIn(node);
    } else if (node && event.key === "ArrowLeft") {
      this.#goOut(node);
    } else if (node && (event.key === "Enter" || event.key === " ")) {
      this.#act(node);
    } else if (event.key.length === 1) {
      this.#activate(startingWith(event.key, rows, index));
    } else {
      return;
    }
    event.preventDefault();
  }

  #goIn(node: TreeNode): void {
    if (node.kind === "folder" && !this.#isExpanded(node)) {
      void this.#open(node);
    } else if (node.kind === "folder") {
      const rows = this.#model.rows();
      const next = rows[rows.indexOf(node) + 1];
      this.#activate(next?.parent === node ? next : node);
    }
  }

  #goOut(node: TreeNode): void {
    if (node.isOpen && !this.#model.isFiltered) {
      this.#model.setOpen(node, false);
      this.#render();
    } else {
      this.#activate(node.parent);
    }
  }

  #act(node: TreeNode): void {
    this.#active = node;
    if (node.kind === "folder") {
      void (node.isOpen ? (this.#model.setOpen(node, false), this.#render()) : this.#open(node));
    } else if (node.kind === "file") {
      this.options.open(node.path);
    }
  }

  #activate(node: TreeNode | undefined): void {
    if (node) {
      this.#active = node;
      const top = this.#model.rows().indexOf(node) * ROW;
      const { scrollTop, clientHeight } = this.#tree;
      this.#tree.scrollTop = Math.max(Math.min(scrollTop, top), top + ROW - clientHeight);
      this.#renderNow(); // so that the row is there when a screen reader looks for it
    }
  }

  #click(event: MouseEvent): void {
    const row = (event.target as Element).closest<HTMLElement>("[data-index]");
    const node = this.#model.rows()[Number(row?.dataset.index ?? -1)];
    if (node) {
      this.#act(node);
      this.#render();
    }
  }

  #isExpanded(node: TreeNode): boolean {
    return node.isOpen || this.#model.isFiltered;
  }

  #render(): void {
    if (!this.#isRenderWaiting) {
      this.#isRenderWaiting = true;
      requestAnimationFrame(() => this.#renderNow());
    }
  }

  #renderNow(): void {
    this.#isRenderWaiting = false;
    if (this.#isPressed) {
      return; // until the button is let go
    }
    const rows = this.#model.rows();
    const { scrollTop, clientHeight } = this.#tree;
    const begin = Math.max(0, Math.floor(scrollTop / ROW) - BEYOND);
    const end = Math.min(rows.length, Math.ceil((scrollTop + clientHeight) / ROW) + BEYOND);
    this.#rows.style.height = `${rows.length * ROW}px`;
    this.#rows.replaceChildren(...rows.slice(begin, end).map((node, index) => this.#row(node, begin + index)));
    this.#tree.setAttribute("aria-busy", String(rows.length === 0));
    const active = this.#rows.querySelector(".active");
    if (active) {
      this.#tree.setAttribute("aria-activedescendant", active.id);
    } else {
      this.#tree.removeAttribute("aria-activedescendant");
    }
  }

  #row(node: TreeNode, index: number): HTMLElement {
    const siblings = node.parent?.children ?? this.#model.roots;
    const row = element(
      "div",
      {
        role: "treeitem",
        id: `row-${index}`,
        className: `row ${node.kind}${node === this.#active ? " active" : ""}`,
        title: node.path,
        "aria-level": node.level,
        "aria-setsize": siblings.length,
        "aria-posinset": siblings.indexOf(node) + 1,
        "aria-selected": node.path === this.#shownPath,
        "data-index": index,
      },
      element("span", { className: "name" }, node.name),
    );
    row.style.top = `${index * ROW}px`;
    row.style.paddingLeft = `${8 + (node.level - 1) * 14}px`;
    if (node.kind === "folder") {
      row.setAttribute("aria-expanded", String(this.#isExpanded(node)));
      if (node.state === "reading") {
        row.append(element("small", {}, text("files.loading")));
      }
    }
    if (node.isChanged) {
      row.append(element("small", { className: "changed" }, text("files.changed")));
    }
    return row;
  }
}

// An earlier search may still be reading a folder, whose folders have to be looked into after that.
const isToSearch = { unread: true, reading: true, read: false, failed: false };

function startingWith(letter: string, rows: readonly TreeNode[], index: number): TreeNode | undefined {
  const isWanted = (node: TreeNode) => node.name.toLowerCase().startsWith(letter.toLowerCase());
  return rows.slice(index + 1).find(isWanted) ?? rows.find(isWanted);
}
