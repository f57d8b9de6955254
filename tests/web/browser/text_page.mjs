// SPDX-License-Identifier: Apache-2.0
// What the tests of texts do on the page.

const panel = (page) => page.locator(".panel:not([hidden])");
export const editor = (page) => panel(page).locator(".text-view .cm-content");
export const charset = (page) => panel(page).getByLabel("Charset of the file");
export const lineEnds = (page) => panel(page).getByLabel("Line ends");
export const mark = (page) => panel(page).getByLabel("Byte-order mark");
export const shown = (select) => select.locator("option:checked").textContent();

/** Opens a file of the session, in the place of the one that is open, and waits for its text. */
export async function open({ page }, name) {
  for (const close of await page.locator(".tab button").all()) {
    await close.click();
  }
  await page.locator(".tree .row").getByText(name, { exact: true }).click();
  await page.getByRole("tab", { name }).waitFor();
  await editor(page).waitFor();
}

export async function typeAtTheEnd(page, text) {
  await editor(page).focus();
  await page.keyboard.press("Control+End");
  await page.keyboard.insertText(text);
  await page.locator(".tab.active .unsaved").waitFor();
}

/** Saves what is unsaved, and waits until that is done. */
export async function save(page) {
  await page.keyboard.press("Control+s");
  await page.locator(".tab.active .unsaved").waitFor({ state: "detached" });
}

/** Answers the question that is asked. */
export async function choose(page, label) {
  await page.getByRole("dialog").getByRole("button", { name: label, exact: true }).click();
  await page.getByRole("dialog").waitFor({ state: "detached" });
}

export async function readAs(page, name) {
  await charset(page).selectOption(name);
  await choose(page, `Read as ${name}`);
  await charset(page).locator(`option:checked[value="${name}"]`).waitFor({ state: "attached" });
}
