// SPDX-License-Identifier: Apache-2.0
// The columns of a workbook's tables. Each is named in the table's part as in the cell above it, and formulas use
// that name: where only the cell is changed, spreadsheet programs want to repair the file.
import { XmlScanner } from "./xml_scanner.js";

/** Whether a part of that type describes a table. */
export function isTable(contentType: string): boolean {
  return /spreadsheetml\.table\+xml/i.test(contentType);
}

/**
 * The names of the columns of which the table in `xml` shows headings, as comparable() has them. Throws XmlError when it
 * is not well-formed.
 */
export function columnNames(xml: string): string[] {
  const names: string[] = [];
  for (const scanner = new XmlScanner(xml); scanner.next(); ) {
    const isTag = scanner.kind === "start" || scanner.kind === "empty";
    const name = isTag ? scanner.name.replace(/^.*:/, "") : "";
    if (name === "table" && scanner.attributes().get("headerRowCount") === "0") {
      return [];
    }
    if (name === "tableColumn") {
      names.push(comparable(scanner.attributes().get("name") ?? ""));
    }
  }
  return names;
}

/** A cell's text or a column's name, the same for both: without escapes such as _x000a_ and white space at the ends. */
export function comparable(text: string): string {
  return text.replace(/_x([0-9a-f]{4})_/gi, (_, code: string) => String.fromCharCode(parseInt(code, 16))).trim();
}
