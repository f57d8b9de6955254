// SPDX-License-Identifier: Apache-2.0
// A package in memory as docx-preview reads one: as it would read an archive with JSZip, in whose place the
// build puts this file. Nothing is compressed or copied; what is not shown is not touched.
import type { Document, Part, Relationship } from "../../client/src/index.js";
import { partBytes, textOf } from "./part_kinds.js";
import { decodePart } from "./part_text.js";

interface ArchiveFile {
  async(type: "string" | "blob" | "uint8array"): Promise<string | Blob | Uint8Array>;
}

interface Archive {
  files: Record<string, ArchiveFile>;
}

/** The archive that a package would be in. Blobs of parts are taken from `blobs`, and put there. */
export function openParts({ parts, relationships }: Document, blobs: WeakMap<Part, Blob>): Archive {
  const files = Object.create(null) as Archive["files"];
  files["[Content_Types].xml"] = generated(() => contentTypes(parts));
  files["_rels/.rels"] = generated(() => relationshipsXml(relationships));
  for (const part of parts) {
    const name = textOf(part.partUri).slice(1);
    files[name] = partFile(part, blobs);
    files[name.replace(/([^/]*)$/, "_rels/$1.rels")] = generated(() => relationshipsXml(part.relationship ?? []));
  }
  return { files };
}

/** What docx-preview calls to open what it was given. */
export default { loadAsync: async (archive: Archive): Promise<Archive> => archive };

function generated(make: () => string): ArchiveFile {
  return { async: async () => make() };
}

function partFile(part: Part, blobs: WeakMap<Part, Blob>): ArchiveFile {
  return {
    async: async (type) => {
      if (type === "string") {
        return decodePart(part.content)?.text ?? textOf(part.content);
      }
      if (type !== "blob") {
        return partBytes(part);
      }
      const blob = blobs.get(part) ?? new Blob([partBytes(part) as Uint8Array<ArrayBuffer>]);
      blobs.set(part, blob);
      return blob;
    },
  };
}

function contentTypes(parts: Part[]): string {
  // docx-preview compares names without the slash that begins them.
  const types = parts.map(
    (part) => `<Override${attributes({ PartName: part.partUri.slice(1), ContentType: part.contentType })}/>`,
  );
  return `<Types xmlns="http://schemas.openxmlformats.org/package/2006/content-types">${types.join("")}</Types>`;
}

function relationshipsXml(relationships: Relationship[]): string {
  const made = relationships.map(({ relationshipId, relationshipType, target, targetMode }) => {
    const isExternal = targetMode?.startsWith("External") || /^[A-Za-z][A-Za-z0-9+.-]*:/.test(target);
    const mode = isExternal ? "External" : "Internal";
    return `<Relationship${attributes({ Id: relationshipId, Type: relationshipType, Target: target, TargetMode: mode })}/>`;
  });
  return `<Relationships xmlns="http://schemas.openxmlformats.org/package/2006/relationships">${made.join("")}</Relationships>`;
}

function attributes(values: Record<string, string>): string {
  const escaped = (value: string) => textOf(value).replace(/&/g, "&amp;").replace(/</g, "&lt;").replace(/"/g, "&quot;");
  return Object.entries(values)
    .map(([name, value]) => ` ${name}="${escaped(value)}"`)
    .join("");
}
