// SPDX-License-Identifier: Apache-2.0
// Text of another edition of a part that is taken over into mine, with what it refers to.
import type { Part, Relationship } from "../../client/src/index.js";
import { isSame, type PackageModel } from "./package_model.js";
import { partKey, partsByKey, targetKey } from "./relationships.js";

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
