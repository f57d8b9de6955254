// SPDX-License-Identifier: Apache-2.0
// The view of images, on elements that do just what it needs.
import assert from "node:assert/strict";
import { test } from "node:test";

import { room } from "./room.mjs";

class FakeElement extends EventTarget {
  children = [];
  parentNode = null;

  append(...children) {
    children.filter((child) => child instanceof FakeElement).forEach((child) => (child.parentNode = this));
    this.children.push(...children);
  }

  replaceChildren(...children) {
    this.children.forEach((child) => (child.parentNode = null));
    this.children = [];
    this.append(...children);
  }

  setAttribute() {}
}

globalThis.document = { createElement: (name) => Object.assign(new FakeElement(), { name }) };

const { images } = await room("images/index.ts");
const imageOf = (data) => ({ path: "/photo.png", version: "v", answer: { status: true, data } });
const shown = (view) => view.element.children.map(({ name }) => name);

test("an image that cannot be shown gives way to words, unless another one is there by then", () => {
  const view = images.open(imageOf("broken"), { text: (key) => key });
  const [broken] = view.element.children;
  view.replace(imageOf("whole"));
  const [whole] = view.element.children;
  broken.dispatchEvent(new Event("error"));
  assert.deepEqual([shown(view), view.element.children[0]], [["img"], whole]);
  whole.dispatchEvent(new Event("error"));
  assert.deepEqual(shown(view), ["p"]);
  view.close();
});
