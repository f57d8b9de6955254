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

/** A button that calls `pressed`. */
export function button(label: string, pressed: () => void, properties: { [key: string]: unknown } = {}) {
  const made = element("button", { type: "button", ...properties }, label);
  made.addEventListener("click", pressed);
  return made;
}
