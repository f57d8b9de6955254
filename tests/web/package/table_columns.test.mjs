// SPDX-License-Identifier: Apache-2.0
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "../room.mjs";

const { columnNames, comparable } = await room("package/table_columns.ts");
const SHEET = "http://schemas.openxmlformats.org/spreadsheetml/2006/main";

const table = (attributes, columns) =>
  `<x:table xmlns:x="${SHEET}" id="1" name="T" ref="A1:B3"${attributes}><x:tableColumns>${columns}</x:tableColumns></x:table>`;

test("a table's columns are named as the cells above them", () => {
  const columns = '<x:tableColumn id="1" name="R&amp;D"/><x:tableColumn id="2" name="Two_x000a_lines "><x:extLst/></x:tableColumn>';
  assert.deepEqual(columnNames(table("", columns)), ["R&D", "Two\nlines"].map(comparable));
  assert.deepEqual(columnNames(table(' headerRowCount="1"', columns)).length, 2);
});

test("a table without a row of headings names no cells", () => {
  assert.deepEqual(columnNames(table(' headerRowCount="0"', '<x:tableColumn id="1" name="Column1"/>')), []);
});
