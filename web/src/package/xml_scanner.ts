// SPDX-License-Identifier: Apache-2.0
// XML as the text that it is: tokens with their places, so that what is not edited stays as it was. It
// holds a document to what parts of packages have to be: well-formed, without a document type.

export type TokenKind = "start" | "empty" | "end" | "text" | "cdata" | "comment" | "instruction";

export class XmlError extends Error {
  constructor(
    readonly reason: "syntax" | "mismatch" | "unclosed" | "outside" | "reference" | "character" | "doctype",
    readonly offset: number,
  ) {
    super(`${reason} at ${offset}`);
  }
}

const NAME = "[^\\s/>\"'=<&!?][^\\s/>\"'=<&]*";
const ATTRIBUTE = `[ \\t\\r\\n]+${NAME}[ \\t\\r\\n]*=[ \\t\\r\\n]*(?:"[^"<]*"|'[^'<]*')`;
const START_TAG = new RegExp(`<(${NAME})((?:${ATTRIBUTE})*)[ \\t\\r\\n]*(/?)>`, "y");
const END_TAG = new RegExp(`</(${NAME})[ \\t\\r\\n]*>`, "y");
const ATTRIBUTES = new RegExp(`(${NAME})[ \\t\\r\\n]*=[ \\t\\r\\n]*(?:"([^"]*)"|'([^']*)')`, "g");
const STRAY_AMPERSAND = /&(?!(?:[^\s&;<#]+|#[0-9]+|#x[0-9A-Fa-f]+);)/;
const NO_CHARACTER = /[\u0000-\u0008\u000b\u000c\u000e-\u001f\ufffe\uffff]/;
const BLANK = /^[ \t\r\n\ufeff]*$/;

/** Goes through the tokens of a document. What they hold is read from the text only when asked for. */
export class XmlScanner {
  kind: TokenKind = "text";
  /** Where the token begins and ends. */
  from = 0;
  to = 0;
  /** Of a tag, its name with the prefix. */
  name = "";
  /** The names of the elements that are open, the token's own included when it is a start tag. */
  readonly open: string[] = [];

  #attributes = "";
  #hasRoot = false;

  /** Throws XmlError when the text has characters that XML has not. */
  constructor(readonly text: string) {
    const match = NO_CHARACTER.exec(text);
    if (match) {
      throw new XmlError("character", match.index);
    }
  }

  /** The next token; false at the end. Throws XmlError where the document is not well-formed. */
  next(): boolean {
    const { text } = this;
    this.from = this.to;
    if (this.from === text.length) {
      if (this.open.length > 0 || !this.#hasRoot) {
        throw new XmlError("unclosed", this.from);
      }
      return false;
    }
    if (text[this.from] !== "<") {
      this.#readText();
    } else if (text.startsWith("<!--", this.from)) {
      this.#readUntil("comment", 4, "-->");
    } else if (text.startsWith("<?", this.from)) {
      this.#readUntil("instruction", 2, "?>");
    } else if (text.startsWith("<![CDATA[", this.from)) {
      this.#readUntil("cdata", 9, "]]>");
      this.#requireElement();
    } else if (text.startsWith("<!", this.from)) {
      throw new XmlError("doctype", this.from);
    } else if (text[this.from + 1] === "/") {
      this.#readEndTag();
    } else {
      this.#readStartTag();
    }
    return true;
  }

  /** The token as it stands in the text. */
  get source(): string {
    return this.text.slice(this.from, this.to);
  }

  /** The attributes of a start tag, with their references resolved, by name. */
  attributes(): Map<string, string> {
    const result = new Map<string, string>();
    for (const [, name, quoted, alsoQuoted] of this.#attributes.matchAll(ATTRIBUTES)) {
      result.set(name!, decodeReferences(quoted ?? alsoQuoted ?? ""));
    }
    return result;
  }

  /** Whether the start tag's attributes hold `text`: cheap, before they are read. */
  mentions(text: string): boolean {
    return this.#attributes.includes(text);
  }

  #readText(): void {
    const end = this.text.indexOf("<", this.from);
    this.kind = "text";
    this.to = end < 0 ? this.text.length : end;
    const { source } = this;
    if (this.open.length === 0) {
      if (!BLANK.test(source)) {
        throw new XmlError("outside", this.from);
      }
    } else {
      this.#checkReferences(source);
    }
  }

  #readUntil(kind: TokenKind, skipped: number, ending: string): void {
    const end = this.text.indexOf(ending, this.from + skipped);
    if (end < 0) {
      throw new XmlError("syntax", this.from);
    }
    this.kind = kind;
    this.to = end + ending.length;
  }

  #readStartTag(): void {
    START_TAG.lastIndex = this.from;
    const match = START_TAG.exec(this.text);
    if (!match) {
      throw new XmlError("syntax", this.from);
    }
    if (this.open.length === 0) {
      if (this.#hasRoot) {
        throw new XmlError("outside", this.from);
      }
      this.#hasRoot = true;
    }
    this.name = match[1]!;
    this.#attributes = match[2]!;
    this.kind = match[3] ? "empty" : "start";
    this.to = START_TAG.lastIndex;
    this.#checkReferences(this.#attributes);
    if (this.kind === "start") {
      this.open.push(this.name);
    }
  }

  #readEndTag(): void {
    END_TAG.lastIndex = this.from;
    const match = END_TAG.exec(this.text);
    if (!match) {
      throw new XmlError("syntax", this.from);
    }
    if (this.open.pop() !== match[1]) {
      throw new XmlError("mismatch", this.from);
    }
    this.name = match[1]!;
    this.kind = "end";
    this.to = END_TAG.lastIndex;
  }

  #requireElement(): void {
    if (this.open.length === 0) {
      throw new XmlError("outside", this.from);
    }
  }

  #checkReferences(source: string): void {
    if (source.includes("&") && STRAY_AMPERSAND.test(source)) {
      throw new XmlError("reference", this.from);
    }
  }
}

/** What is not well-formed in a document, if anything. */
export function findXmlError(text: string): XmlError | undefined {
  try {
    const scanner = new XmlScanner(text);
    while (scanner.next());
    return undefined;
  } catch (error) {
    if (error instanceof XmlError) {
      return error;
    }
    throw error;
  }
}

const ENTITIES: Record<string, string> = { lt: "<", gt: ">", amp: "&", quot: '"', apos: "'" };

/** `source` with its character references and the five entities of XML resolved; others stay as they are. */
export function decodeReferences(source: string): string {
  if (!source.includes("&")) {
    return source;
  }
  return source.replace(/&(?:#x([0-9A-Fa-f]+)|#([0-9]+)|(\w+));/g, (whole, hexadecimal, decimal, name) => {
    if (name !== undefined) {
      return ENTITIES[name] ?? whole;
    }
    const code = hexadecimal ? parseInt(hexadecimal, 16) : parseInt(decimal, 10);
    return code <= 0x10ffff ? String.fromCodePoint(code) : whole;
  });
}

/** `text` as the content of an element. Characters that XML has not are left out. */
export function encodeText(text: string): string {
  return text
    .replace(new RegExp(NO_CHARACTER, "g"), "")
    .replace(/&/g, "&amp;")
    .replace(/</g, "&lt;")
    .replace(/>/g, "&gt;")
    .replace(/\r/g, "&#xD;");
}
