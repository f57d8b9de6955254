// SPDX-License-Identifier: Apache-2.0
// A document's title, creator and so on: the core properties, a part of every package of the Open Packaging
// Conventions. Each is an element of its own; those that are not edited stay as they are.
import type { Part } from "../../client/src/index.js";
import type { Edit, PackageModel } from "./package_model.js";
import { decodePart, encodePart } from "./part_text.js";
import { decodeReferences, encodeText, XmlScanner } from "./xml_scanner.js";

const CORE = "http://schemas.openxmlformats.org/package/2006/metadata/core-properties";
const DUBLIN_CORE = "http://purl.org/dc/elements/1.1/";
const CONTENT_TYPE = "application/vnd.openxmlformats-package.core-properties+xml";
const RELATIONSHIP_TYPE = "http://schemas.openxmlformats.org/package/2006/relationships/metadata/core-properties";
const STRICT_RELATIONSHIP_TYPE = "http://purl.oclc.org/ooxml/officeDocument/relationships/metadata/core-properties";

/** The properties that can be edited: local names, and the namespaces they are in. */
export const PROPERTIES = {
  title: DUBLIN_CORE,
  creator: DUBLIN_CORE,
  subject: DUBLIN_CORE,
  description: DUBLIN_CORE,
  keywords: CORE,
  category: CORE,
} as const;

export type PropertyName = keyof typeof PROPERTIES;
export type Properties = Partial<Record<PropertyName, string>>;

/** What the model's document says of itself. Nothing when that is not readable. */
export function readProperties(model: PackageModel): Properties | undefined {
  const part = corePart(model);
  if (!part) {
    return {};
  }
  try {
    const { elements } = parse(decodePart(part.content)!.text);
    return Object.fromEntries([...elements].map(([name, { value }]) => [name, value]));
  } catch {
    return undefined;
  }
}

/** The edit that sets one property, in a part that is made where there is none. */
export function propertyEdit(model: PackageModel, name: PropertyName, value: string): Edit {
  const part = corePart(model) ?? {
    partUri: freeName(model),
    contentType: CONTENT_TYPE,
    content: `<?xml version="1.0" encoding="UTF-8" standalone="yes"?>\n<cp:coreProperties xmlns:cp="${CORE}"/>`,
    relationship: null,
  };
  const decoded = decodePart(part.content)!;
  const content = encodePart({ ...decoded, text: withProperty(decoded.text, name, value) });
  const edit: Edit = { parts: new Map([[part.partUri, { ...part, content }]]), joins: `property ${name}` };
  if (!corePart(model)) {
    edit.relationships = [
      ...model.relationships,
      {
        relationshipId: freeId(model),
        relationshipType: RELATIONSHIP_TYPE,
        target: part.partUri.slice(1),
        targetMode: "",
      },
    ];
  }
  return edit;
}

function corePart(model: PackageModel): Part | undefined {
  return model.relatedPart((type) => [RELATIONSHIP_TYPE, STRICT_RELATIONSHIP_TYPE].includes(type));
}

function freeName(model: PackageModel): string {
  let name = "/docProps/core.xml";
  for (let number = 1; model.part(name); ++number) {
    name = `/docProps/core${number}.xml`;
  }
  return name;
}

function freeId(model: PackageModel): string {
  const ids = new Set(model.relationships.map(({ relationshipId }) => relationshipId));
  let number = 1;
  while (ids.has(`rId${number}`)) {
    ++number;
  }
  return `rId${number}`;
}

interface Place {
  from: number;
  to: number;
}

interface Parsed {
  elements: Map<PropertyName, Place & { value: string; tag: string }>;
  /** The root's start tag, and where its end tag begins, which an empty root has not. */
  root: Place & { name: string; end?: number };
}

// Throws XmlError.
function parse(xml: string): Parsed {
  const scanner = new XmlScanner(xml);
  const elements: Parsed["elements"] = new Map();
  let root: Parsed["root"] | undefined;
  let scope = new Map<string, string>();
  let current: (Place & { name: PropertyName; value: string; tag: string }) | undefined;
  while (scanner.next()) {
    const { kind, from, to } = scanner;
    const depth = scanner.open.length;
    if (kind === "start" || kind === "empty") {
      if (!root) {
        root = { from, to, name: scanner.name };
        scope = namespaces(scanner, scope);
      } else if (depth === (kind === "start" ? 2 : 1)) {
        const name = propertyOf(scanner.name, namespaces(scanner, scope));
        if (name && kind === "empty") {
          elements.set(name, { from, to, value: "", tag: scanner.source });
        }
        current = name && kind === "start" ? { name, from, to, value: "", tag: scanner.source } : undefined;
      }
    } else if (kind === "end" && depth === 1 && current) {
      elements.set(current.name, { from: current.from, to, value: current.value, tag: current.tag });
      current = undefined;
    } else if (kind === "end" && depth === 0 && root) {
      root.end = from;
    } else if (current && kind === "text") {
      current.value += decodeReferences(scanner.source);
    } else if (current && kind === "cdata") {
      current.value += scanner.source.slice(9, -3);
    }
  }
  return { elements, root: root! };
}

function namespaces(scanner: XmlScanner, outer: Map<string, string>): Map<string, string> {
  const scope = new Map(outer);
  for (const [name, value] of scanner.mentions("xmlns") ? scanner.attributes() : []) {
    if (name === "xmlns" || name.startsWith("xmlns:")) {
      scope.set(name.slice(6), value);
    }
  }
  return scope;
}

function propertyOf(name: string, scope: Map<string, string>): PropertyName | undefined {
  const [local, prefix = ""] = name.split(":").reverse();
  return local! in PROPERTIES && PROPERTIES[local as PropertyName] === scope.get(prefix)
    ? (local as PropertyName)
    : undefined;
}

function withProperty(xml: string, name: PropertyName, value: string): string {
  const { elements, root } = parse(xml);
  const element = elements.get(name);
  if (element) {
    const tag = element.tag.replace(/[ \t\r\n]*\/?>$/, "");
    const [, qualified] = /^<([^ \t\r\n]+)/.exec(tag)!;
    return `${xml.slice(0, element.from)}${tag}>${encodeText(value)}</${qualified}>${xml.slice(element.to)}`;
  }
  // With a declaration of its own, whatever the root declares.
  const added = `<p:${name} xmlns:p="${PROPERTIES[name]}">${encodeText(value)}</p:${name}>`;
  if (root.end !== undefined) {
    return xml.slice(0, root.end) + added + xml.slice(root.end);
  }
  const tag = xml.slice(root.from, root.to).replace(/[ \t\r\n]*\/>$/, "");
  return `${xml.slice(0, root.from)}${tag}>${added}</${root.name}>${xml.slice(root.to)}`;
}
