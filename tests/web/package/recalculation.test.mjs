// SPDX-License-Identifier: Apache-2.0
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "../room.mjs";

const { hasFormulas, withRecalculation } = await room("package/recalculation.ts");

const SHEET = 'xmlns="http://schemas.openxmlformats.org/spreadsheetml/2006/main"';
const workbook = (content) => `<workbook ${SHEET}><sheets><sheet name="calcPr"/></sheets>${content}</workbook>`;

test("a workbook's settings of calculation get the request to calculate all that is opened with it", () => {
  for (const [before, after] of [
    ["<calcPr/>", '<calcPr fullCalcOnLoad="1"/>'],
    ['<calcPr calcId="1" />', '<calcPr calcId="1" fullCalcOnLoad="1" />'],
    ['<calcPr fullCalcOnLoad="0" calcId="1"></calcPr>', '<calcPr calcId="1" fullCalcOnLoad="1"></calcPr>'],
    ["<calcPr fullCalcOnLoad = '1'/>", '<calcPr fullCalcOnLoad="1"/>'],
  ]) {
    assert.equal(withRecalculation(workbook(before)), workbook(after));
  }
});

test("settings of calculation that a workbook lacks are put where they belong", () => {
  const made = '<calcPr fullCalcOnLoad="1"/>';
  assert.equal(withRecalculation(workbook("")), workbook(made));
  assert.equal(withRecalculation(workbook("<extLst/>")), workbook(`${made}<extLst/>`));
  const names = "<externalReferences/><definedNames><definedName name=\"a\">1</definedName></definedNames>";
  assert.equal(withRecalculation(workbook(`${names}<oleSize/>`)), workbook(`${names}${made}<oleSize/>`));
  const prefixed = (content) => `<x:workbook ${SHEET.replace("xmlns", "xmlns:x")}><x:sheets/>${content}</x:workbook>`;
  assert.equal(withRecalculation(prefixed("")), prefixed(made.replace("<", "<x:")));
});

test("formulas are found under any prefix, and other elements are none", () => {
  for (const formula of ["<f>A1</f>", '<f t="shared" si="0"/>', "<x:f>A1</x:f>", "<f/>"]) {
    assert.equal(hasFormulas(`<c>${formula}<v/></c>`), true, formula);
  }
  assert.equal(hasFormulas("<c><is><t>f</t></is></c><font/><x:fill></x:fill>"), false);
});
