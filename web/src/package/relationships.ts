// SPDX-License-Identifier: Apache-2.0
// Which parts refer to which.
import type { Part, Relationship } from "../../client/src/index.js";

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
