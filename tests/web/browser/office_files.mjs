// SPDX-License-Identifier: Apache-2.0
// Office documents for tests, with what real ones have: text cut into runs, images, parts that are no text.
import { randomFillSync } from "node:crypto";
import { createRequire } from "node:module";
import { join } from "node:path";
import { deflateSync } from "node:zlib";

import { ROOT } from "../../serve/processes.mjs";

const { unzipSync, zipSync } = createRequire(join(ROOT, "web/package.json"))("fflate");

const OFFICE = "http://schemas.openxmlformats.org/officeDocument/2006/relationships";
const TYPES = "application/vnd.openxmlformats-officedocument";
const DECLARATION = '<?xml version="1.0" encoding="UTF-8" standalone="yes"?>\r\n';

/** A PNG of one colour. */
export function png(width, height, [red, green, blue]) {
  const row = [0, ...Array.from({ length: width }, () => [red, green, blue]).flat()];
  return pngOf(width, height, deflateSync(Buffer.from(Array.from({ length: height }, () => row).flat())));
}

/** A PNG that cannot be compressed, as photographs: 3 bytes for each pixel. */
export function photograph(width, height) {
  const rows = randomFillSync(Buffer.alloc(height * (3 * width + 1)));
  for (let row = 0; row < height; ++row) {
    rows[row * (3 * width + 1)] = 0; // which says that it is not stored as a difference
  }
  return pngOf(width, height, deflateSync(rows, { level: 0 }));
}

function pngOf(width, height, pixels) {
  const chunk = (name, data) => {
    const body = Buffer.concat([Buffer.from(name), data]);
    const result = Buffer.alloc(body.length + 8);
    result.writeUInt32BE(data.length);
    body.copy(result, 4);
    result.writeUInt32BE(crc32(body), body.length + 4);
    return result;
  };
  const header = Buffer.alloc(13);
  header.writeUInt32BE(width, 0);
  header.writeUInt32BE(height, 4);
  header.set([8, 2, 0, 0, 0], 8);
  const signature = Buffer.from("\x89PNG\r\n\x1a\n", "latin1");
  return Buffer.concat([signature, chunk("IHDR", header), chunk("IDAT", pixels), chunk("IEND", Buffer.alloc(0))]);
}

const CRC_TABLE = Uint32Array.from({ length: 256 }, (_, byte) => {
  for (let bit = 0; bit < 8; ++bit) {
    byte = (byte >>> 1) ^ (byte & 1 ? 0xedb88320 : 0);
  }
  return byte;
});

function crc32(bytes) {
  let crc = ~0;
  for (const byte of bytes) {
    crc = (crc >>> 8) ^ CRC_TABLE[(crc ^ byte) & 0xff];
  }
  return ~crc >>> 0;
}

/** Bytes of which no charset makes a text, as in printer settings and macros. */
export const BINARY = Uint8Array.from({ length: 600 }, (_, index) => (index * 37) % 256);

/** The zip archive of files: names, and contents as texts or bytes. Images are stored as they are. */
export function archive(files) {
  const entries = Object.entries(files).map(([name, content]) => [
    name,
    [
      typeof content === "string" ? new TextEncoder().encode(content) : new Uint8Array(content),
      { level: name.endsWith(".png") ? 0 : 6 },
    ],
  ]);
  return zipSync(Object.fromEntries(entries));
}

/** The files in an archive: bytes by name. */
export function unpack(bytes) {
  return unzipSync(new Uint8Array(bytes));
}

/** The text of a file in an archive. */
export function textIn(bytes, name) {
  return new TextDecoder().decode(unpack(bytes)[name]);
}

function contentTypes(defaults, overrides) {
  const types = [
    ...Object.entries(defaults).map(([extension, type]) => `<Default Extension="${extension}" ContentType="${type}"/>`),
    ...Object.entries(overrides).map(([name, type]) => `<Override PartName="${name}" ContentType="${type}"/>`),
  ];
  return `${DECLARATION}<Types xmlns="http://schemas.openxmlformats.org/package/2006/content-types">${types.join("")}</Types>`;
}

/** A relationships file. Each is [id, type, target] and, when it is external, true. */
export function relationships(...list) {
  const made = list.map(
    ([id, type, target, isExternal]) =>
      `<Relationship Id="${id}" Type="${type.includes(":") ? type : `${OFFICE}/${type}`}" Target="${target}"${isExternal ? ' TargetMode="External"' : ""}/>`,
  );
  return `${DECLARATION}<Relationships xmlns="http://schemas.openxmlformats.org/package/2006/relationships">${made.join("")}</Relationships>`;
}

const CORE_TYPE = "http://schemas.openxmlformats.org/package/2006/relationships/metadata/core-properties";
const CORE = `${DECLARATION}<cp:coreProperties xmlns:cp="http://schemas.openxmlformats.org/package/2006/metadata/core-properties" xmlns:dc="http://purl.org/dc/elements/1.1/"><dc:title>Old title</dc:title><dc:creator>Zo\u00eb</dc:creator></cp:coreProperties>`;
const COMMON = {
  rels: "application/vnd.openxmlformats-package.relationships+xml",
  xml: "application/xml",
  png: "image/png",
};
const CORE_OVERRIDE = { "/docProps/core.xml": "application/vnd.openxmlformats-package.core-properties+xml" };

const run = (text, format = "") => `<w:r>${format}<w:t xml:space="preserve">${text}</w:t></w:r>`;

/** A paragraph with the image of a relationship. */
export function wordPicture(id) {
  return (
    '<w:p><w:r><w:drawing><wp:inline><wp:extent cx="952500" cy="952500"/><wp:docPr id="1" name="P"/>' +
    '<a:graphic><a:graphicData uri="http://schemas.openxmlformats.org/drawingml/2006/picture"><pic:pic>' +
    `<pic:nvPicPr><pic:cNvPr id="1" name="P"/><pic:cNvPicPr/></pic:nvPicPr><pic:blipFill><a:blip r:embed="${id}"/></pic:blipFill>` +
    '<pic:spPr><a:xfrm><a:off x="0" y="0"/><a:ext cx="952500" cy="952500"/></a:xfrm></pic:spPr>' +
    "</pic:pic></a:graphicData></a:graphic></wp:inline></w:drawing></w:r></w:p>"
  );
}

/** The files of a Word document; `body` is XML in front of its last paragraph. */
export function wordFiles(body = "", more = {}) {
  const document =
    `${DECLARATION}<w:document xmlns:w="http://schemas.openxmlformats.org/wordprocessingml/2006/main" xmlns:r="${OFFICE}"` +
    ' xmlns:wp="http://schemas.openxmlformats.org/drawingml/2006/wordprocessingDrawing"' +
    ' xmlns:a="http://schemas.openxmlformats.org/drawingml/2006/main"' +
    ' xmlns:pic="http://schemas.openxmlformats.org/drawingml/2006/picture"><w:body>' +
    `<w:p>${run("The Ann")}${run("ual re", "<w:rPr><w:b/></w:rPr>")}${run("port of 2026")}</w:p>${wordPicture("rId1")}` +
    `<w:p><w:hyperlink r:id="rId2">${run("A link")}</w:hyperlink></w:p>${body}` +
    `<w:p>${run("Cr\u00e8me br\u00fbl\u00e9e \u6e2f")}</w:p></w:body></w:document>`;
  return {
    "[Content_Types].xml": contentTypes(
      { ...COMMON, bin: "application/vnd.ms-office.vbaProject" },
      {
        ...CORE_OVERRIDE,
        "/word/document.xml": `${TYPES}.wordprocessingml.document.main+xml`,
        "/word/header1.xml": `${TYPES}.wordprocessingml.header+xml`,
      },
    ),
    "_rels/.rels": relationships(
      ["rId1", "officeDocument", "word/document.xml"],
      ["rId2", CORE_TYPE, "docProps/core.xml"],
    ),
    "docProps/core.xml": CORE,
    "word/document.xml": document,
    "word/_rels/document.xml.rels": relationships(
      ["rId1", "image", "media/image1.png"],
      ["rId2", "hyperlink", "https://example.org/a?b=c&amp;d", true],
      ["rId3", "header", "header1.xml"],
      ["rId4", "http://schemas.microsoft.com/office/2006/relationships/vbaProject", "vbaProject.bin"],
    ),
    "word/header1.xml": `<w:hdr xmlns:w="http://schemas.openxmlformats.org/wordprocessingml/2006/main"><w:p>${run("Annual report, page")}</w:p></w:hdr>`,
    "word/media/image1.png": png(20, 20, [200, 0, 0]),
    "word/vbaProject.bin": BINARY,
    ...more,
  };
}

/** The files of a workbook, whose cells have shared strings and strings of their own. */
export function workbookFiles() {
  const sheet = "http://schemas.openxmlformats.org/spreadsheetml/2006/main";
  return {
    "[Content_Types].xml": contentTypes(
      { ...COMMON, bin: `${TYPES}.spreadsheetml.printerSettings` },
      {
        ...CORE_OVERRIDE,
        "/xl/workbook.xml": `${TYPES}.spreadsheetml.sheet.main+xml`,
        "/xl/worksheets/sheet1.xml": `${TYPES}.spreadsheetml.worksheet+xml`,
        "/xl/sharedStrings.xml": `${TYPES}.spreadsheetml.sharedStrings+xml`,
      },
    ),
    "_rels/.rels": relationships(
      ["rId1", "officeDocument", "xl/workbook.xml"],
      ["rId2", CORE_TYPE, "docProps/core.xml"],
    ),
    "docProps/core.xml": CORE,
    "xl/workbook.xml": `${DECLARATION}<workbook xmlns="${sheet}" xmlns:r="${OFFICE}"><sheets><sheet name="One" sheetId="1" r:id="rId1"/></sheets></workbook>`,
    "xl/_rels/workbook.xml.rels": relationships(
      ["rId1", "worksheet", "worksheets/sheet1.xml"],
      ["rId2", "sharedStrings", "sharedStrings.xml"],
    ),
    "xl/worksheets/sheet1.xml": `${DECLARATION}<worksheet xmlns="${sheet}"><sheetData><row r="1"><c r="A1" t="s"><v>0</v></c><c r="B1" t="s"><v>1</v></c><c r="C1" t="inlineStr"><is><t>Annual report</t></is></c></row></sheetData></worksheet>`,
    "xl/worksheets/_rels/sheet1.xml.rels": relationships([
      "rId1",
      "printerSettings",
      "../printerSettings/printerSettings1.bin",
    ]),
    "xl/sharedStrings.xml": `${DECLARATION}<sst xmlns="${sheet}" count="2" uniqueCount="2"><si><t>Other</t></si><si><r><t>Ann</t></r><r><rPr><b/></rPr><t xml:space="preserve">ual report </t></r></si></sst>`,
    "xl/printerSettings/printerSettings1.bin": BINARY,
  };
}

/** The files of a presentation. */
export function presentationFiles() {
  const namespaces = `xmlns:a="http://schemas.openxmlformats.org/drawingml/2006/main" xmlns:r="${OFFICE}" xmlns:p="http://schemas.openxmlformats.org/presentationml/2006/main"`;
  const text = '<a:p><a:r><a:t>Annual </a:t></a:r><a:r><a:rPr b="1"/><a:t>report</a:t></a:r></a:p>';
  return {
    "[Content_Types].xml": contentTypes(
      { ...COMMON, bin: `${TYPES}.oleObject` },
      {
        ...CORE_OVERRIDE,
        "/ppt/presentation.xml": `${TYPES}.presentationml.presentation.main+xml`,
        "/ppt/slides/slide1.xml": `${TYPES}.presentationml.slide+xml`,
      },
    ),
    "_rels/.rels": relationships(
      ["rId1", "officeDocument", "ppt/presentation.xml"],
      ["rId2", CORE_TYPE, "docProps/core.xml"],
    ),
    "docProps/core.xml": CORE,
    "ppt/presentation.xml": `${DECLARATION}<p:presentation ${namespaces}><p:sldIdLst><p:sldId id="256" r:id="rId1"/></p:sldIdLst></p:presentation>`,
    "ppt/_rels/presentation.xml.rels": relationships(["rId1", "slide", "slides/slide1.xml"]),
    "ppt/slides/slide1.xml": `${DECLARATION}<p:sld ${namespaces}><p:cSld><p:spTree><p:sp><p:txBody>${text}</p:txBody></p:sp></p:spTree></p:cSld></p:sld>`,
    "ppt/slides/_rels/slide1.xml.rels": relationships(
      ["rId1", "oleObject", "../embeddings/oleObject1.bin"],
      ["rId2", "image", "../media/image1.png"],
    ),
    "ppt/embeddings/oleObject1.bin": BINARY,
    "ppt/media/image1.png": png(4, 4, [0, 0, 200]),
  };
}
