// SPDX-License-Identifier: Apache-2.0
// The charsets by the writing that people know them for; what stands in no group is "other".
export const CHARSET_GROUPS: Record<string, readonly string[]> = {
  unicode: ["UTF-8", "UTF-16LE", "UTF-16BE", "UTF-32LE", "UTF-32BE", "UTF-7"],
  western: ["windows-1252", "ISO-8859-1", "ISO-8859-15", "IBM850", "IBM00858", "IBM437", "macintosh", "US-ASCII"],
  centralEuropean: ["windows-1250", "ISO-8859-2", "ISO-8859-16", "IBM852", "x-mac-centraleurroman"],
  cyrillic: ["windows-1251", "KOI8-R", "KOI8-U", "ISO-8859-5", "IBM866", "IBM855", "x-mac-cyrillic", "KZ-1048", "PTCP154"],
  greek: ["windows-1253", "ISO-8859-7", "IBM737", "IBM869", "x-mac-greek"],
  turkish: ["windows-1254", "ISO-8859-9", "ISO-8859-3", "IBM857", "x-mac-turkish"],
  baltic: ["windows-1257", "ISO-8859-13", "ISO-8859-4", "IBM775"],
  nordic: ["ISO-8859-10", "IBM861", "IBM865"],
  hebrew: ["windows-1255", "ISO-8859-8", "IBM862"],
  arabic: ["windows-1256", "ISO-8859-6"],
  vietnamese: ["windows-1258", "VISCII"],
  thai: ["windows-874"],
  japanese: [
    ...["Shift_JIS", "x-Shift_JIS-nec", "x-Shift_JIS-ibm", "EUC-JP", "x-EUC-JP-nec"],
    ...["ISO-2022-JP", "ISO-2022-JP-1", "ISO-2022-JP-2"],
  ],
  chinese: [
    ...["GB18030", "GBK", "Big5", "x-Big5-eten", "Big5-HKSCS", "EUC-TW"],
    ...["HZ-GB-2312", "ISO-2022-CN", "ISO-2022-CN-EXT"],
  ],
  korean: ["EUC-KR", "Johab", "ISO-2022-KR"],
};

/** Each group with those of `names` that are in it, and "other" with the rest. */
export function grouped(names: readonly string[]): [string, string[]][] {
  const groups = Object.entries(CHARSET_GROUPS).map(([group, members]): [string, string[]] => [
    group,
    members.filter((name) => names.includes(name)),
  ]);
  const known = new Set(groups.flatMap(([, members]) => members));
  groups.push(["other", names.filter((name) => !known.has(name)).sort()]);
  return groups.filter(([, members]) => members.length > 0);
}
