// SPDX-License-Identifier: Apache-2.0
// The tree of files: what is known of it, and which rows of it are to be seen.
import type { FolderEntry } from "../../client/src/index.js";
import { folderOf, join, nameOf } from "./paths.js";

export interface TreeNode {
  readonly path: string;
  readonly name: string;
  readonly kind: FolderEntry["kind"];
  readonly level: number; // 1 for a root
  readonly parent: TreeNode | undefined;
  /** Its path below the root in small letters, which searches look into. */
  readonly below: string;
  size: number;
  isOpen: boolean;
  /** Its file has been written, and not been opened since. */
  isChanged: boolean;
  /** What is in a folder, as far as it has been read. */
  children: TreeNode[];
  state: "unread" | "reading" | "read" | "failed";
}

const collator = new Intl.Collator(undefined, { numeric: true });

export class TreeModel {
  roots: TreeNode[] = [];
  #nodes = new Map<string, TreeNode>();
  #words: string[] = [];
  #rows: TreeNode[] | undefined;

  setRoots(paths: string[]): void {
    this.#nodes.clear();
    this.roots = paths.map((path) => this.#make(undefined, path, { name: path, kind: "folder", size: 0, time: 0 }));
    this.#rows = undefined;
  }

  find(path: string): TreeNode | undefined {
    return this.#nodes.get(path);
  }

  /** All nodes that are known. */
  nodes(): Iterable<TreeNode> {
    return this.#nodes.values();
  }

  /** What is in `folder`, from now on. Nodes that stay keep what is known of them. */
  setChildren(folder: TreeNode, entries: FolderEntry[]): void {
    const before = new Map(folder.children.map((child) => [child.name, child]));
    folder.children = entries.map((entry) => {
      const known = before.get(entry.name);
      if (!known || known.kind !== entry.kind) {
        return this.#make(folder, join(folder.path, entry.name), entry);
      }
      before.delete(entry.name);
      known.size = entry.size;
      return known;
    });
    before.forEach((gone) => this.#forget(gone));
    folder.children.sort(inOrder);
    this.#rows = undefined;
  }

  setOpen(folder: TreeNode, isOpen: boolean): void {
    folder.isOpen = isOpen;
    this.#rows = undefined;
  }

  /** Shows only files whose path, below its root, holds every word of `filter`. */
  setFilter(filter: string): void {
    this.#words = filter.toLowerCase().split(/\s+/).filter(Boolean);
    this.#rows = undefined;
  }

  get isFiltered(): boolean {
    return this.#words.length > 0;
  }

  /** What is to be seen, from top to bottom. */
  rows(): readonly TreeNode[] {
    if (!this.#rows) {
      this.#rows = [];
      for (const root of this.roots) {
        this.#add(root, this.#rows);
      }
    }
    return this.#rows;
  }

  /** Marks the file at `path`. The folder that it is in, where that is known. */
  markChanged(path: string): TreeNode | undefined {
    const node = this.find(path);
    if (node) {
      node.isChanged = true;
    }
    return node?.parent ?? this.find(folderOf(path));
  }

  #make(parent: TreeNode | undefined, path: string, { name, kind, size }: FolderEntry): TreeNode {
    const node: TreeNode = {
      ...{ path, kind, parent, size, isOpen: false, isChanged: false, children: [], state: "unread" },
      name: parent ? name : nameOf(path),
      below: parent ? `${parent.below}/${name.toLowerCase()}` : "",
      level: (parent?.level ?? 0) + 1,
    };
    this.#nodes.set(path, node);
    return node;
  }

  #forget(node: TreeNode): void {
    this.#nodes.delete(node.path);
    node.children.forEach((child) => this.#forget(child));
  }

  // Adds what is to be seen of `node`. Its row comes off again where nothing in it matches.
  #add(node: TreeNode, rows: TreeNode[]): boolean {
    if (!this.isFiltered) {
      rows.push(node);
      if (node.isOpen) {
        node.children.forEach((child) => this.#add(child, rows));
      }
      return true;
    }
    if (node.kind !== "folder") {
      const isMatch = this.#matches(node);
      if (isMatch) {
        rows.push(node);
      }
      return isMatch;
    }
    rows.push(node);
    const length = rows.length;
    node.children.forEach((child) => this.#add(child, rows));
    if (rows.length === length) {
      rows.pop();
    }
    return rows.length >= length;
  }

  #matches(node: TreeNode): boolean {
    return this.#words.every((word) => node.below.includes(word));
  }
}

function inOrder(one: TreeNode, other: TreeNode): number {
  const folders = Number(other.kind === "folder") - Number(one.kind === "folder");
  return folders || collator.compare(one.name, other.name);
}
