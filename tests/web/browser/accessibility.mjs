// SPDX-License-Identifier: Apache-2.0
// Whether everybody can use the page.
import { readFileSync } from "node:fs";
import { createRequire } from "node:module";
import { join } from "node:path";

import { ROOT } from "../../serve/processes.mjs";

const AXE = readFileSync(createRequire(join(ROOT, "web/package.json")).resolve("axe-core/axe.min.js"), "utf8");

/** What axe finds fault with on the page as it is. */
export async function faults(page) {
  await page.evaluate(AXE);
  const { violations } = await page.evaluate(() => window.axe.run());
  return violations.map(({ id, nodes }) => `${id}: ${nodes.map((node) => node.html).join(" ")}`);
}

/** The buttons, tabs and fields that can be seen and reach beyond the window's sides. */
export function outOfReach(page) {
  return page.evaluate(() => {
    const isBeyond = (one) => {
      const { left, right, width } = one.getBoundingClientRect();
      return width > 0 && getComputedStyle(one).visibility === "visible" && (left < 0 || right > innerWidth);
    };
    const controls = [...document.querySelectorAll("button, input, select, textarea, [role=tab]")].filter(isBeyond);
    return controls.map((one) => one.getAttribute("aria-label") ?? one.textContent);
  });
}
