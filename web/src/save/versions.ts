// SPDX-License-Identifier: Apache-2.0
// The earlier versions of a document: what there is, how it differs, and making it the present one.
import type { Client, EarlierVersion } from "../../client/src/index.js";
import type { DocumentView, LoadedDocument } from "../document_view.js";
import { loadEarlier } from "../files/loading.js";
import { nameOf } from "../files/paths.js";
import { ask } from "../ui/dialog.js";
import { element } from "../ui/dom.js";
import { bytesText, currentLanguage, text } from "../ui/text.js";
import { askComparing } from "./comparing.js";

/**
 * Lets a person look through the earlier versions of `present`, which `view` shows, and take one over into the
 * view. True when one was restored, so that what is saved now has to be shown.
 */
export async function browseVersions(client: Client, present: LoadedDocument, view: DocumentView): Promise<boolean> {
  const name = nameOf(present.path);
  const versions = await client.versions(present.path);
  if (versions.length === 0) {
    const choices = [{ value: "", label: text("action.close"), isDefault: true }];
    await ask({ title: text("versions.title", { name }), message: text("versions.none"), choices });
    return false;
  }
  let chosen = versions[0]!;
  for (;;) {
    const choice = await ask({
      title: text("versions.title", { name }),
      message: text("versions.message"),
      body: list(versions, chosen, (one) => (chosen = one)),
      choices: [
        { value: "", label: text("action.close") },
        { value: "restore", label: text("versions.restore") },
        { value: "compare", label: text("versions.compare"), isDefault: true },
      ],
    });
    if (choice === "restore") {
      await client.restore(present.path, chosen.time);
      return true;
    }
    if (choice !== "compare" || (await compare(client, present, view, chosen))) {
      return false;
    }
  }
}

// True when the person took something over.
async function compare(
  client: Client,
  present: LoadedDocument,
  view: DocumentView,
  version: EarlierVersion,
): Promise<boolean> {
  const choice = await askComparing(view, await loadEarlier(client, present, version.time), {
    title: text("versions.compare.title", { name: nameOf(present.path), time: timeText(version.time) }),
    message: text("versions.compare.message"),
    choices: [
      { value: "", label: text("action.back"), isDefault: true },
      { value: "apply", label: text("versions.apply") },
    ],
  });
  return choice === "apply";
}

function list(versions: EarlierVersion[], chosen: EarlierVersion, choose: (one: EarlierVersion) => void): HTMLElement {
  const rows = versions.map((version) => {
    const radio = element("input", { type: "radio", name: "version", checked: version === chosen });
    radio.addEventListener("change", () => choose(version));
    return element("label", {}, radio, element("span", {}, timeText(version.time)), element("small", {}, bytesText(version.size)));
  });
  return element("div", { className: "versions", role: "radiogroup", "aria-label": text("versions.list") }, ...rows);
}

function timeText(time: number): string {
  return new Date(time).toLocaleString(currentLanguage(), { dateStyle: "medium", timeStyle: "medium" });
}
