// SPDX-License-Identifier: Apache-2.0
// Nodes as docx-preview asks for them, made so that nothing that a document says runs or is loaded.

interface Wanted {
  ns?: string;
  tagName: string;
  className?: string;
  style?: Record<string, string> | string;
  children?: (Wanted | Node | string)[];
  [property: string]: unknown;
}

// What has contents of its own to load or run.
const REFUSED = /^(script|iframe|frame|object|embed|link|meta|base|form|portal|audio|video|source)$/i;
// Links lead nowhere here; the frame would follow them.
const REFUSED_PROPERTIES = /^(on.*|href|srcdoc|innerHTML|outerHTML|action|formAction|srcset|target|ping)$/i;

// The frame's policy refuses what styles would load; like this it is not even asked for.
function harmless(style: string): string {
  return style.replace(/@import[^;]*(;|$)/gi, "").replace(/url\s*\(\s*(?!["']?(blob|data):)[^)]*\)?/gi, "none");
}

/** What makes the nodes, in an inert document, and the object URLs that it has given to them. */
export function inertNodes(): { make: (wanted: Wanted | Node | string) => Node; urls: string[] } {
  const owner = document.implementation.createHTMLDocument("");
  const urls: string[] = [];

  function make(wanted: Wanted | Node | string): Node {
    if (typeof wanted === "string") {
      return owner.createTextNode(wanted);
    }
    if (wanted instanceof Node) {
      return wanted;
    }
    const { ns, tagName, className, style, children = [], ...properties } = wanted;
    if (tagName === "#comment") {
      return owner.createComment("");
    }
    if (tagName === "#fragment") {
      const fragment = owner.createDocumentFragment();
      fragment.append(...children.map(make));
      return fragment;
    }
    const name = REFUSED.test(tagName) ? "span" : tagName;
    const contents =
      name === "style" ? children.map((child) => (typeof child === "string" ? harmless(child) : child)) : children;
    const made = (ns ? owner.createElementNS(ns, name) : owner.createElement(name)) as HTMLElement;
    if (className) {
      made.setAttribute("class", className);
    }
    if (typeof style === "string") {
      made.setAttribute("style", harmless(style));
    } else if (style) {
      for (const [property, value] of Object.entries(style)) {
        setProperty(made.style, property, typeof value === "string" ? harmless(value) : value);
      }
    }
    for (const [key, value] of Object.entries(properties)) {
      setProperty(made, key, value);
    }
    made.append(...contents.map(make));
    return made;
  }

  function setProperty(made: HTMLElement | CSSStyleDeclaration, key: string, value: unknown): void {
    if (value === undefined || REFUSED_PROPERTIES.test(key)) {
      return;
    }
    if (key === "src") {
      if (typeof value !== "string" || !/^(blob:|data:image\/)/.test(value)) {
        return;
      }
      urls.push(value);
    }
    (made as unknown as Record<string, unknown>)[key] = value;
  }

  return { make, urls };
}
