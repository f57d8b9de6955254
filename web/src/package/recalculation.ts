// SPDX-License-Identifier: Apache-2.0
// The results of a workbook's formulas are stored beside them. Where the cells that they use are changed, the workbook
// has to ask the program that opens it to calculate them anew.
import { XmlScanner } from "./xml_scanner.js";

// What comes before the settings of calculation, of what may be next to them.
const BEFORE = new Set(["sheets", "functionGroups", "externalReferences", "definedNames"]);

/** Whether a worksheet has formulas. */
export function hasFormulas(worksheet: string): boolean {
  return /<(?:[^\s<>/:]+:)?f[\s/>]/.test(worksheet);
}

/** The XML of a workbook that asks for that. Throws XmlError when it is not well-formed. */
export function withRecalculation(workbook: string): string {
  let at = 0; // where the settings belong
  let prefix = "";
  for (const scanner = new XmlScanner(workbook); scanner.next(); ) {
    const { kind, from, to, source, open } = scanner;
    const [, itsPrefix = "", name = ""] = /^(.*:)?(.*)$/.exec(scanner.name)!;
    if (name === "calcPr" && (kind === "empty" || kind === "start")) {
      const bare = source.replace(/\s+fullCalcOnLoad\s*=\s*(?:"[^"]*"|'[^']*')/, "");
      return workbook.slice(0, from) + bare.replace(/\s*\/?>$/, ' fullCalcOnLoad="1"$&') + workbook.slice(to);
    }
    if (BEFORE.has(name) && open.length === 1 && (kind === "empty" || kind === "end")) {
      at = to;
      prefix = itsPrefix;
    }
  }
  return at === 0 ? workbook : `${workbook.slice(0, at)}<${prefix}calcPr fullCalcOnLoad="1"/>${workbook.slice(at)}`;
}
