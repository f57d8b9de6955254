// SPDX-License-Identifier: Apache-2.0
// What this room says to people, by language.
export const texts: Record<"en" | "de", Record<string, string>> = { en: {}, de: {} };
