// SPDX-License-Identifier: Apache-2.0
// A package in memory: what was read, what was changed since, and the way back. Parts are values; an edit puts
// another one in the place of a part, so what is not edited is sent back as it came.
import type { Document, Part, Relationship } from "../../client/src/index.js";
import type { LoadedDocument } from "../document_view.js";
import { partsByKey, targetKey } from "./relationships.js";

/** What is unsaved, as IndexedDB stores it. */
export interface PackageDraft {
  kind: "package";
  /** The whole document before the changes; not in drafts of an earlier release, nor where it could not be stored. */
  original?: Blob;
  /** Changed parts by name, and what they were before; null for what is, or was, not there. */
  parts: Record<string, { part: Part | null; base: Part | null }>;
  relationships?: Relationship[];
  baseRelationships?: Relationship[];
}

/** Contents after an edit. What is left out stays; null takes a part away. */
export interface Edit {
  parts?: Map<string, Part | null>;
  relationships?: Relationship[];
  /** Edits with the same key in a row are undone as one: what is typed into one editor. */
  joins?: string;
}

// The first line of an original: all but the contents.
interface StoredHead {
  relationships: Relationship[];
  parts: (Omit<Part, "content"> & { size: number })[];
}

interface Step {
  before: Edit;
  after: Edit;
}

type Listener = (changedParts: ReadonlySet<string>, editor: unknown) => void;

export class PackageModel {
  #parts = new Map<string, Part>();
  #original = new Map<string, Part>();
  #relationships: Relationship[];
  #originalRelationships: Relationship[];
  #isWhole: boolean; // and not what a draft has, among the parts of what may be another edition
  #storable: Blob | undefined; // the original, made when a draft first needs it
  #undone: Step[] = [];
  #done: Step[] = [];
  #listeners = new Set<Listener>();

  /** The document as it was read; with a draft that has an original, that original. */
  constructor({ parts, relationships }: Document, draft?: PackageDraft) {
    this.#isWhole = !draft || draft.original !== undefined;
    this.#storable = draft?.original;
    for (const part of parts) {
      this.#parts.set(part.partUri, part);
      this.#original.set(part.partUri, part);
    }
    this.#relationships = this.#originalRelationships = relationships;
    if (draft) {
      for (const [uri, { part, base }] of Object.entries(draft.parts)) {
        putInto(this.#original, uri, base);
        putInto(this.#parts, uri, part);
      }
      this.#relationships = draft.relationships ?? relationships;
      this.#originalRelationships = draft.baseRelationships ?? relationships;
    }
  }

  /** In the order of the package; new ones at the end. */
  get parts(): IterableIterator<Part> {
    return this.#parts.values();
  }

  get relationships(): readonly Relationship[] {
    return this.#relationships;
  }

  /** Whether the relationships of the package are others than those that were read or saved last. */
  get areRelationshipsChanged(): boolean {
    return !areSame(this.#relationships, this.#originalRelationships);
  }

  part(uri: string): Part | undefined {
    return this.#parts.get(uri);
  }

  /** The part that the first relationship of the package whose type `matches` leads to. */
  relatedPart(matches: (type: string) => boolean): Part | undefined {
    const relationship = this.#relationships.find(({ relationshipType }) => matches(relationshipType));
    const key = relationship && targetKey("/", relationship);
    return key === undefined ? undefined : partsByKey(this.parts).get(key);
  }

  /** The part by which a reader begins: the text of a Word document, the workbook of a spreadsheet. */
  get mainPart(): Part | undefined {
    return this.relatedPart((type) => type.endsWith("/officeDocument"));
  }

  /** The part as it was read or saved last. */
  originalPart(uri: string): Part | undefined {
    return this.#original.get(uri);
  }

  isChanged(uri: string): boolean {
    return this.#parts.get(uri) !== this.#original.get(uri);
  }

  /** The whole, for a save. */
  document(): Document {
    return { parts: [...this.#parts.values()], relationships: this.#relationships };
  }

  /** The names of the parts that are unsaved. */
  changedParts(): string[] {
    const uris = [...new Set([...this.#parts.keys(), ...this.#original.keys()])];
    return uris.filter((uri) => this.isChanged(uri));
  }

  /** `document` is on disk now: what differs from it is unsaved. */
  saved({ parts, relationships }: Document): void {
    this.#isWhole = true;
    this.#storable = undefined;
    this.#original = new Map(parts.map((part) => [part.partUri, part]));
    this.#originalRelationships = relationships;
    for (const part of parts) {
      if (isSame(this.#parts.get(part.partUri), part)) {
        this.#parts.set(part.partUri, part);
      }
    }
  }

  /**
   * What is unsaved. What was changed in `sent`, a draft that was sent to be saved, is listed also where it is as it was
   * before: the file may hold it as it was sent.
   */
  draft(sent?: PackageDraft): PackageDraft {
    const uris = new Set([...Object.keys(sent?.parts ?? {}), ...this.changedParts()]);
    const hasRelationships = sent?.relationships || this.areRelationshipsChanged;
    if (this.#isWhole) {
      this.#storable ??= blobOf({ parts: [...this.#original.values()], relationships: this.#originalRelationships });
    }
    return {
      kind: "package",
      ...(this.#storable && { original: this.#storable }),
      parts: Object.fromEntries(
        [...uris].map((uri) => [uri, { part: this.#parts.get(uri) ?? null, base: this.#original.get(uri) ?? null }]),
      ),
      ...(hasRelationships && { relationships: this.#relationships, baseRelationships: this.#originalRelationships }),
    };
  }

  /** Calls `changed` after every edit, with `editor` as it was given to it. What is returned ends that. */
  listen(changed: Listener): () => void {
    this.#listeners.add(changed);
    return () => this.#listeners.delete(changed);
  }

  /** Changes what `edit` holds, so that it can be undone. */
  edit(edit: Edit, editor?: unknown): void {
    const last = this.#done[this.#done.length - 1];
    if (edit.joins !== undefined && last?.after.joins === edit.joins && this.#undone.length === 0) {
      last.after = { ...last.after, ...edit };
      this.#put(edit);
    } else {
      this.#done.push({ before: this.#put(edit), after: edit });
    }
    this.#undone = [];
    this.#tell(edit, editor);
  }

  /**
   * `chosen`, put together with `theirs`, which is saved now, takes the place of what is here. That is no step to undo;
   * and of what it changes, what was done before is not undone any more, since theirs would be undone with it. Parts in
   * `joint` go together in that.
   */
  adopt(theirs: Document, chosen: Edit, joint: ReadonlySet<string>): void {
    const changes = this.#changesIn(chosen);
    const uris = new Set(changes.parts!.keys());
    if ([...uris].some((uri) => joint.has(uri))) {
      joint.forEach((uri) => uris.add(uri));
    }
    const without = ({ parts, relationships }: Edit): Edit => ({
      parts: new Map([...(parts ?? [])].filter(([uri]) => !uris.has(uri))),
      ...(relationships && !changes.relationships && { relationships }),
    });
    const isLeft = ({ after }: Step) => after.parts!.size > 0 || after.relationships !== undefined;
    const left = (steps: Step[]) =>
      steps.map(({ before, after }) => ({ before: without(before), after: without(after) })).filter(isLeft);
    [this.#done, this.#undone] = [left(this.#done), left(this.#undone)];
    this.saved(theirs);
    this.#put(changes);
    this.#tell(changes);
  }

  /** As edit(), but what changes nothing is left out, and is no step to undo. */
  choose(chosen: Edit): void {
    const changes = this.#changesIn(chosen);
    if (changes.parts!.size > 0 || changes.relationships) {
      this.edit(changes);
    }
  }

  #changesIn({ parts, relationships }: Edit): Edit {
    const changed = [...(parts ?? [])].filter(([uri, part]) => !isSame(this.#parts.get(uri), part ?? undefined));
    const isOther = relationships && !areSame(relationships, this.#relationships);
    return { parts: new Map(changed), ...(isOther && { relationships }) };
  }

  get canUndo(): boolean {
    return this.#done.length > 0;
  }

  get canRedo(): boolean {
    return this.#undone.length > 0;
  }

  undo(): void {
    const step = this.#done.pop();
    if (step) {
      this.#undone.push(step);
      this.#put(step.before);
      this.#tell(step.before);
    }
  }

  redo(): void {
    const step = this.#undone.pop();
    if (step) {
      this.#done.push(step);
      this.#put(step.after);
      this.#tell(step.after);
    }
  }

  // What undoes it is returned. A part that was read, and is itself again, is no longer changed.
  #put({ parts, relationships }: Edit): Edit {
    const before: Edit = { parts: new Map(), ...(relationships && { relationships: this.#relationships }) };
    for (const [uri, part] of parts ?? []) {
      before.parts!.set(uri, this.#parts.get(uri) ?? null);
      const original = this.#original.get(uri);
      putInto(this.#parts, uri, part && original && isSame(part, original) ? original : part);
    }
    this.#relationships = relationships ?? this.#relationships;
    return before;
  }

  #tell({ parts }: Edit, editor?: unknown): void {
    const changed = new Set(parts?.keys());
    for (const listener of this.#listeners) {
      listener(changed, editor);
    }
  }
}

export function documentOf({ answer }: LoadedDocument): Document {
  return { parts: answer.parts ?? [], relationships: answer.relationships ?? [] };
}

const blobs = new WeakMap<Part, Blob>(); // so that after a save only what was changed is made again

/** A document as browsers store it without copying it through the page: a line of JSON, then all contents, in UTF-8. */
function blobOf({ parts, relationships }: Document): Blob {
  const contents = parts.map((part) => {
    const blob = blobs.get(part) ?? new Blob([part.content]);
    blobs.set(part, blob);
    return blob;
  });
  const head: StoredHead = {
    relationships,
    parts: parts.map(({ content, ...rest }, index) => ({ ...rest, size: contents[index]!.size })),
  };
  return new Blob([`${JSON.stringify(head)}\n`, ...contents]);
}

/** What `draft` was made from. Parts that are as in `present` are the same objects. Nothing where it is not stored. */
export async function originalOf({ original }: PackageDraft, present: Document): Promise<Document | undefined> {
  const bytes = new Uint8Array((await original?.arrayBuffer().catch(() => undefined)) ?? []);
  if (bytes.length === 0) {
    return undefined;
  }
  let begin = bytes.indexOf("\n".charCodeAt(0)) + 1;
  const decode = (from: number, to: number) => new TextDecoder("utf-8", { ignoreBOM: true }).decode(bytes.subarray(from, to));
  const { relationships, parts } = JSON.parse(decode(0, begin)) as StoredHead;
  const there = new Map(present.parts.map((part) => [part.partUri, part]));
  return {
    relationships,
    parts: parts.map(({ size, ...rest }) => {
      const part = { ...rest, content: decode(begin, (begin += size)) };
      const same = there.get(part.partUri);
      return isSame(same, part) ? same! : part;
    }),
  };
}

/**
 * The document that was sent to be saved when a view held `sent`; `later` is the view's draft by now. What neither
 * changes is taken from `document`, what is saved now. Nothing where the drafts do not tell.
 */
export function documentSent(document: Document, sent: PackageDraft, later: PackageDraft): Document | undefined {
  const { baseRelationships } = later; // which drafts of an earlier release do not have
  if (!baseRelationships && (later.relationships || sent.relationships)) {
    return undefined;
  }
  const parts = new Map(document.parts.map((part) => [part.partUri, part]));
  Object.entries(later.parts).forEach(([uri, { base }]) => putInto(parts, uri, base));
  Object.entries(sent.parts).forEach(([uri, { part }]) => putInto(parts, uri, part));
  return { parts: [...parts.values()], relationships: sent.relationships ?? baseRelationships ?? document.relationships };
}

function putInto(parts: Map<string, Part>, uri: string, part: Part | null): void {
  if (part) {
    parts.set(uri, part);
  } else {
    parts.delete(uri);
  }
}

/** Whether two parts are the same, bytes, type and relationships. */
export function isSame(one: Part | undefined, other: Part | undefined): boolean {
  return (
    one === other ||
    (one !== undefined &&
      other !== undefined &&
      one.content === other.content &&
      one.contentType === other.contentType &&
      areSame(one.relationship, other.relationship))
  );
}

/** Whether two lists have the same relationships in the same order. */
export function areSame(one: readonly Relationship[] | null, other: readonly Relationship[] | null): boolean {
  return one === other || JSON.stringify(one ?? []) === JSON.stringify(other ?? []);
}
