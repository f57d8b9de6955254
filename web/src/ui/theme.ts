// SPDX-License-Identifier: Apache-2.0
// Dark and light: the system's, unless the person has chosen.
import { lastingStore } from "../storage.js";

export const THEMES = ["system", "light", "dark"] as const;
export type Theme = (typeof THEMES)[number];

const KEY = "theme";

export function chosenTheme(): Theme {
  const chosen = lastingStore.getItem(KEY);
  return THEMES.find((theme) => theme === chosen) ?? "system";
}

/** Sets data-theme of the document to "light" or "dark", now and whenever the system's theme changes. */
export function useTheme(theme: Theme): void {
  lastingStore.setItem(KEY, theme);
  const isDark = theme === "system" ? darkSystem.matches : theme === "dark";
  document.documentElement.dataset.theme = isDark ? "dark" : "light";
}

const darkSystem = matchMedia("(prefers-color-scheme: dark)");
darkSystem.addEventListener("change", () => useTheme(chosenTheme()));
