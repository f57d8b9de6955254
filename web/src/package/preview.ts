// SPDX-License-Identifier: Apache-2.0
// How a Word document will look, beside what is edited, following it.
//
// The document is a stranger's. It is laid out into nodes of a document that runs and loads nothing, and these
// are shown in a frame whose sandbox runs no scripts and whose policy loads nothing but data. The frame has
// this page's origin only so that the page can put nodes into it and keep its place; without scripts there is
// nobody in it who could make use of that.
import type { Part } from "../../client/src/index.js";
import type { Page } from "../document_view.js";
import { element } from "../ui/dom.js";
import type { PackageModel } from "./package_model.js";

const FRAME = `<!doctype html><meta charset="utf-8">
<meta http-equiv="Content-Security-Policy" content="default-src 'none'; img-src data: blob:; style-src 'unsafe-inline'">
<style>body { margin: 0; background: #8a8f98; } .docx-wrapper { background: none !important; padding: 16px !important; }</style>`;
const MARGIN = 16; // pixels beside the pages, as above
const PAUSE = 400; // milliseconds without an edit, before it is followed

export class Preview {
  readonly element: HTMLElement;

  #frame: HTMLIFrameElement;
  #state = element("p", { role: "status", className: "package-preview-state" });
  #timer: ReturnType<typeof setTimeout> | undefined;
  #lastTook = 0; // milliseconds
  #rendering = 0; // which one is the latest
  #urls: string[] = []; // of the images that are shown
  #blobs = new WeakMap<Part, Blob>(); // what they are
  #stopListening: () => void;

  constructor(
    private model: PackageModel,
    private page: Page,
  ) {
    this.#frame = element("iframe", { title: page.text("package.preview"), srcdoc: FRAME });
    this.#frame.setAttribute("sandbox", "allow-same-origin");
    this.#frame.addEventListener("load", () => {
      this.#frame.contentWindow?.addEventListener("resize", () => this.#fit());
      void this.#render();
    });
    this.#state.textContent = page.text("package.preview.reading");
    this.element = element("section", { className: "package-preview", "aria-label": page.text("package.preview") });
    this.element.append(this.#state, this.#frame);
    this.#stopListening = model.listen(() => this.#follow());
  }

  close(): void {
    this.#stopListening();
    ++this.#rendering;
    clearTimeout(this.#timer);
    this.#letGo();
  }

  // What takes long is done less often, so that typing does not wait for it all the time.
  #follow(): void {
    clearTimeout(this.#timer);
    this.#timer = setTimeout(() => void this.#render(), Math.max(PAUSE, 3 * this.#lastTook));
  }

  async #render(): Promise<void> {
    const rendering = ++this.#rendering;
    const start = performance.now();
    try {
      const { renderDocument } = await import("./word_rendering.js");
      const { nodes, urls } = await renderDocument(this.model.document(), this.#blobs);
      const shown = this.#frame.contentDocument;
      if (rendering !== this.#rendering || !shown) {
        urls.forEach((url) => URL.revokeObjectURL(url));
        return;
      }
      const root = shown.documentElement;
      const { scrollTop, scrollLeft } = root;
      shown.body.replaceChildren(...nodes.map((node) => shown.adoptNode(node)));
      this.#fit();
      root.scrollTo(scrollLeft, scrollTop);
      this.#letGo();
      this.#urls = urls;
      this.#state.hidden = true;
    } catch {
      // What stands there is shown on; an edit may be halfway, such as a tag that is not closed yet.
      if (rendering === this.#rendering) {
        this.#state.hidden = false;
        this.#state.textContent = this.page.text("package.preview.problem");
      }
    }
    this.#lastTook = performance.now() - start;
  }

  // Pages that are wider than the frame are shown smaller: in the middle of it, their left would be out of reach.
  #fit(): void {
    const body = this.#frame.contentDocument?.body;
    if (body) {
      body.style.zoom = "1";
      const pages = [...body.querySelectorAll<HTMLElement>(".docx-wrapper > section")];
      const widest = Math.max(0, ...pages.map((shown) => shown.offsetWidth)) + 2 * MARGIN;
      body.style.zoom = String(Math.min(1, body.clientWidth / widest));
    }
  }

  #letGo(): void {
    this.#urls.forEach((url) => URL.revokeObjectURL(url));
    this.#urls = [];
  }
}
