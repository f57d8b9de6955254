// SPDX-License-Identifier: Apache-2.0
// Which parts refer to which, and how their references are put together with those of another edition.
import type { Part, Relationship } from "../../client/src/index.js";
import { isSame, type PackageModel } from "./package_model.js";

/** Under what two names of one part are the same. */
export function partKey(name: string): string {
  const resolved = name.replace(/%([0-9a-f]{2})/gi, (_, byte: string) => String.fromCharCode(parseInt(byte, 16)));
  return resolved.replace(/[A-Z]+/g, (letters) => letters.toLowerCase());
}

export function partsByKey(parts: Iterable<Part>): Map<string, Part> {
  return new Map([...parts].map((part) => [partKey(part.partUri), part]));
}

/** The key of the part to which a relationship leads from `source`, whether there is one or not. */
export function targetKey(source: string, { target }: Relationship): string | undefined {
  const path = target.replace(/[?#][^]*$/, "").replaceAll("\\", "/");
  if (/^[a-z][a-z0-9+.-]*:|^\/\//i.test(path)) {
    return undefined;
  }
  const segments: string[] = [];
  for (const segment of (path.startsWith("/") ? path : `${source.replace(/[^/]*$/, "")}${path}`).split("/").slice(1)) {
    if (segment === "..") {
      segments.pop();
    } else if (segment !== ".") {
      segments.push(segment);
    }
  }
  return partKey(`/${segments.join("/")}`);
}

/** Those of `parts` to which `relationships` of `source` lead, and to which the relationships of those lead. */
export function reachable(
  parts: ReadonlyMap<string, Part>,
  source: string,
  relationships: readonly Relationship[] | null,
): Set<Part> {
  const found = new Set<Part>();
  const sources: [string, readonly Relationship[] | null][] = [[source, relationships]];
  for (const [from, list] of sources) {
    for (const one of list ?? []) {
      const part = parts.get(targetKey(from, one) ?? "");
      if (part && !found.has(part)) {
        found.add(part);
        sources.push([part.partUri, part.relationship]);
      }
    }
  }
  return found;
}

// The ids of relationships in a text, each after what stands before it in its attribute.
function references(text: string): RegExp {
  const declarations = text.matchAll(/\sxmlns:([\w-]+)\s*=\s*["'][^"']*\/relationships["']/g);
  const prefixes = [...declarations].map(([, prefix]) => prefix);
  return new RegExp(`(\\s(?:(?:${prefixes.join("|")}):[\\w-]+|(?:[\\w-]+:)?relid)\\s*=\\s*["'])([^"'<]*)`, "gi");
}

function idsIn(text: string): Set<string> {
  return new Set([...text.matchAll(references(text))].map(([, , id]) => id!));
}

/** Their edition of a part's text, as it can be put together with mine. */
export interface FittingText {
  /** With ids that in mine lead to the same, or that mine does not have. */
  text: string;
  /** All that a text which is put together of both needs. */
  relationshipsOf(text: string): Relationship[];
  /** Parts that both have added by one name: theirs, by other names, in case they are needed. */
  copies: Part[];
}

export function fittingText(uri: string, text: string, mine: PackageModel, theirs: PackageModel): FittingText {
  const my = mine.part(uri)!.relationship ?? [];
  const its = theirs.part(uri)!.relationship ?? [];
  const [myParts, itsParts] = [partsByKey(mine.parts), partsByKey(theirs.parts)];
  const copies = new Map<string, Part>();

  const moved = (source: string, one: Relationship): Relationship => {
    const key = targetKey(source, one) ?? "";
    const [myPart, itsPart] = [myParts.get(key), itsParts.get(key)];
    if (!myPart || !itsPart || isSame(myPart, itsPart) || mine.originalPart(myPart.partUri)) {
      return one;
    }
    let copy = copies.get(key);
    if (!copy) {
      let partUri: string;
      let number = 1;
      do {
        partUri = itsPart.partUri.replace(/(\.[^./]*)?$/, `-${number++}$1`);
      } while (myParts.has(partKey(partUri)) || itsParts.has(partKey(partUri)));
      copy = { ...itsPart, partUri };
      copies.set(key, copy); // before its own, which may lead back to it
      copy.relationship = itsPart.relationship?.map((next) => moved(itsPart.partUri, next)) ?? null;
    }
    return { ...one, target: copy.partUri };
  };

  const meaning = (one: Relationship) => {
    const key = /[?#]/.test(one.target) ? undefined : targetKey(uri, one);
    return `${one.relationshipType}\n${key ?? one.target}`;
  };
  const used = idsIn(text);
  let number = 1; // of the next new id
  const ids = new Set([...my, ...its].map(({ relationshipId }) => relationshipId));
  const myById = new Map(my.map((one) => [one.relationshipId, one]));
  const myByMeaning = new Map(my.map((one) => [meaning(one), one]));
  // Theirs by their own ids, as they are beside mine.
  const fitting = new Map(
    its.map((original) => {
      const one = used.has(original.relationshipId) ? moved(uri, original) : original;
      const namesake = myById.get(one.relationshipId);
      let fit = namesake && meaning(namesake) === meaning(one) ? namesake : myByMeaning.get(meaning(one));
      if (!fit) {
        while (namesake && ids.has(`rId${number}`)) {
          ++number;
        }
        fit = namesake ? { ...one, relationshipId: `rId${number++}` } : one;
      }
      return [original.relationshipId, fit];
    }),
  );
  const types = new Set(my.map(({ relationshipType }) => relationshipType));
  const idOf = (id: string) => fitting.get(id)?.relationshipId ?? id;
  return {
    text: text.replace(references(text), (_, before: string, id: string) => before + idOf(id)),
    relationshipsOf: (together) => {
      const needed = idsIn(together);
      // Those without an id in the text are there for all of it: its styles, its comments.
      const isNeeded = ([id, { relationshipId, relationshipType }]: [string, Relationship]) =>
        used.has(id) ? needed.has(relationshipId) : !types.has(relationshipType);
      return [...new Set([...my, ...[...fitting].filter(isNeeded).map(([, one]) => one)])];
    },
    copies: [...copies.values()],
  };
}
