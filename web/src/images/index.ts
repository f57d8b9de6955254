// SPDX-License-Identifier: Apache-2.0
// The view of images, which are looked at and not edited. The browser finds out which kind each is.
import { bytesOf } from "../../client/src/index.js";
import type { Comparison, DocumentView, LoadedDocument, Page, Room } from "../document_view.js";
import { nameOf } from "../files/paths.js";
import { element } from "../ui/dom.js";

class ImageView implements DocumentView {
  readonly element = element("div", { className: "image-view", tabIndex: -1 });
  #url = "";

  constructor(
    loaded: LoadedDocument,
    private page: Page,
  ) {
    this.replace(loaded);
  }

  async content(): Promise<undefined> {}

  draft(): unknown {
    return undefined;
  }

  replace({ path, answer }: LoadedDocument): void {
    URL.revokeObjectURL(this.#url);
    const bytes = bytesOf(answer.data ?? "") as Uint8Array<ArrayBuffer>;
    this.#url = URL.createObjectURL(new Blob([bytes]));
    const image = element("img", { src: this.#url, alt: nameOf(path) });
    image.addEventListener("error", () => {
      if (image.parentNode !== this.element) {
        return; // another one is shown by now
      }
      const problem = this.page.text("image.problem", { name: nameOf(path) });
      this.element.replaceChildren(element("p", { className: "problem", role: "alert" }, problem));
    });
    this.element.replaceChildren(image);
  }

  async compare(): Promise<Comparison> {
    throw new Error(this.page.text("image.compare"));
  }

  focus(): void {
    this.element.focus();
  }

  close(): void {
    URL.revokeObjectURL(this.#url);
  }
}

export const images: Room = {
  open: (loaded, page) => new ImageView(loaded, page),
  contentOf: async () => undefined,
};
