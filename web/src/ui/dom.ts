// SPDX-License-Identifier: Apache-2.0
// Making elements.

/** An element with the properties (or, where the name has a dash, attributes) and children given. */
export function element<Name extends keyof HTMLElementTagNameMap>(
  name: Name,
  properties: { [key: string]: unknown } = {},
  ...children: (Node | string)[]
): HTMLElementTagNameMap[Name] {
  const made = document.createElement(name);
  for (const [key, value] of Object.entries(properties)) {
    if (key === "role" || key.includes("-")) {
      made.setAttribute(key, String(value));
    } else {
      (made as unknown as Record<string, unknown>)[key] = value;
    }
  }
  made.append(...children);
  return made;
}

/** The arrow that brings a change over in a MergeView, which hears of the mouse only: keys do the same. */
export function mergeArrow(label: string): HTMLElement {
  const arrow = element("button", { type: "button", title: label, "aria-label": label }, "\u2192");
  arrow.addEventListener("click", ({ detail }) => {
    if (detail === 0) {
      arrow.dispatchEvent(new MouseEvent("mousedown", { bubbles: true }));
    }
  });
  return arrow;
}

/** The key of a shortcut, in lower case: of a letter that is not Latin, the Latin one that its key has elsewhere. */
export function shortcutKey({ key, code }: KeyboardEvent): string {
  return (/^[^\x00-\x7f]$/.test(key) ? code.replace(/^Key/, "") : key).toLowerCase();
}

/** A button that calls `pressed`. */
export function button(label: string, pressed: () => void, properties: { [key: string]: unknown } = {}) {
  const made = element("button", { type: "button", ...properties }, label);
  made.addEventListener("click", pressed);
  return made;
}
