// SPDX-License-Identifier: Apache-2.0
// The page's texts in the person's language. A room brings its own in its texts.ts; another language is
// added by a column in each of them and its name in LANGUAGES.
import * as packageTexts from "../package/texts.js";
import * as textTexts from "../text/texts.js";
import { de } from "./languages/de.js";
import { en } from "./languages/en.js";

export const LANGUAGES = { en: "English", de: "Deutsch" } as const;
export type Language = keyof typeof LANGUAGES;

/** All texts, by language and key. */
export const TEXTS: Record<Language, Record<string, string>> = {
  en: { ...en, ...textTexts.texts.en, ...packageTexts.texts.en },
  de: { ...de, ...textTexts.texts.de, ...packageTexts.texts.de },
};

let language: Language = "en";

/** The language that was chosen, or else the first one of the browser's that there are texts in. */
export function preferredLanguage(chosen: string | null, browsers: readonly string[]): Language {
  const wanted = [chosen ?? "", ...browsers.map((one) => one.split("-")[0]!.toLowerCase())];
  return (wanted.find((one) => one in LANGUAGES) as Language | undefined) ?? "en";
}

export function useLanguage(chosen: Language): void {
  language = chosen;
}

export function currentLanguage(): Language {
  return language;
}

/** The text of `key` in the language in use, with {name} replaced by values.name. */
export function text(key: string, values: Record<string, string | number> = {}): string {
  const found = TEXTS[language][key] ?? TEXTS.en[key] ?? key;
  return found.replace(/\{(\w+)\}/g, (whole, name: string) => {
    const value = values[name];
    return typeof value === "number" ? value.toLocaleString(language) : (value ?? whole);
  });
}

/** What an exception says, of whatever kind it is. */
export function reasonText(error: unknown): string {
  return error instanceof Error ? error.message : String(error);
}

/** A number of bytes, for people. */
export function bytesText(bytes: number): string {
  const units = ["B", "KB", "MB", "GB"];
  let amount = bytes;
  let unit = 0;
  for (; amount >= 1000 && unit < units.length - 1; ++unit) {
    amount /= 1000;
  }
  return `${amount.toLocaleString(language, { maximumFractionDigits: amount < 10 && unit > 0 ? 1 : 0 })} ${units[unit]}`;
}
