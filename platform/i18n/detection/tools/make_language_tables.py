#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Makes platform/i18n/detection/language_tables.cpp: how often letters follow each other in each language.

Usage: make_language_tables.py FOLDER > language_tables.cpp

FOLDER holds the unpacked contents of the Debian 12 packages below (dpkg-deb -x PACKAGE FOLDER/PACKAGE),
whose message catalogues and translated help pages serve as samples of each language. Only counts of
letters and pairs of letters are kept.

    apt coreutils dpkg freeciv-data gettext gimp-data gnome-user-docs gnucash-common iso-codes
    libglib2.0-data libgtk-3-common mediawiki stellarium-data vlc-l10n

Of mediawiki, only languages/i18n/*.json serves, and only for languages of which the others hold little.
"""
import collections
import html
import json
import math
import os
import re
import struct
import sys
import unicodedata

# The languages with an alphabet, and the locales whose texts are samples of each.
ALPHABETIC = {
    'en': ['en_GB', 'en_CA', 'en_AU'], 'fr': ['fr'], 'de': ['de'], 'es': ['es', 'es_MX'],
    'pt': ['pt', 'pt_BR'], 'it': ['it'], 'nl': ['nl'], 'sv': ['sv'], 'da': ['da'],
    'nb': ['nb', 'nn'], 'fi': ['fi'], 'is': ['is'], 'ga': ['ga', 'gd'], 'cy': ['cy', 'wiki-cy'],
    'ca': ['ca'],
    'gl': ['gl'], 'eu': ['eu'], 'br': ['br', 'wiki-br'], 'af': ['af', 'wiki-af'],
    'pl': ['pl'], 'cs': ['cs'], 'sk': ['sk'],
    'hu': ['hu'], 'sl': ['sl'], 'hr': ['hr', 'bs', 'sr@latin'], 'ro': ['ro'], 'sq': ['sq', 'wiki-sq'],
    'tr': ['tr'], 'et': ['et'], 'lv': ['lv'], 'lt': ['lt'], 'eo': ['eo'], 'vi': ['vi'],
    'mt': ['mt', 'wiki-mt'],
    'ru': ['ru'], 'uk': ['uk'], 'be': ['be'], 'bg': ['bg'], 'mk': ['mk', 'wiki-mk'],
    'sr': ['sr', 'sr@ije'], 'kk': ['kk', 'wiki-kk-cyrl'],
    'el': ['el'], 'he': ['he'], 'ar': ['ar'], 'fa': ['fa'], 'ur': ['ur', 'wiki-ur'], 'th': ['th'],
}
# One page in many languages: about as much of each.
WESTERN = ['en', 'fr', 'de', 'es', 'pt', 'it', 'nl', 'sv', 'da', 'nb', 'fi', 'is', 'ga', 'ca', 'gl', 'eu',
           'br', 'af', 'sq']
WESTERN_SHARE = 100000
# The languages written with thousands of characters, and how many of them are kept.
IDEOGRAPHIC = {
    'zh-Hans': (['zh_CN'], 3000), 'zh-Hant': (['zh_TW', 'zh_HK'], 3000), 'ja': (['ja'], 2200),
    'ko': (['ko'], 1500),
}

# The letters that languages written with Latin letters use beyond a to z, common loans included. The
# samples are full of foreign names, which would pass other letters off as the language's own.
LETTERS = {
    'en': '\u00e9\u00e8\u00ea\u00e7\u00ef\u00f6\u00fc\u00f1\u00e0\u00e1\u00f3\u00f4\u00e2',
    'fr': '\u00e0\u00e2\u00e6\u00e7\u00e9\u00e8\u00ea\u00eb\u00ee\u00ef\u00f4\u0153\u00f9\u00fb\u00fc\u00ff',
    'de': '\u00e4\u00f6\u00fc\u00df\u00e9\u00e8\u00e0',
    'es': '\u00e1\u00e9\u00ed\u00f3\u00fa\u00fc\u00f1',
    'pt': '\u00e0\u00e1\u00e2\u00e3\u00e7\u00e9\u00ea\u00ed\u00f3\u00f4\u00f5\u00fa\u00fc',
    'it': '\u00e0\u00e8\u00e9\u00ec\u00ed\u00ee\u00f2\u00f3\u00f9\u00fa',
    'nl': '\u00e1\u00e0\u00e4\u00e9\u00e8\u00eb\u00ea\u00ed\u00ef\u00f3\u00f6\u00f4\u00fa\u00fc\u00fb\u00e7',
    'sv': '\u00e5\u00e4\u00f6\u00e9\u00e0\u00fc',
    'da': '\u00e6\u00f8\u00e5\u00e9\u00fc\u00f6\u00e4',
    'nb': '\u00e6\u00f8\u00e5\u00e9\u00f2\u00f4\u00ea\u00f6\u00e4\u00fc',
    'fi': '\u00e4\u00f6\u00e5\u0161\u017e\u00e9\u00fc',
    'is': '\u00e1\u00e9\u00ed\u00f3\u00fa\u00fd\u00fe\u00e6\u00f0\u00f6',
    'ga': '\u00e1\u00e9\u00ed\u00f3\u00fa\u00e0\u00e8\u00ec\u00f2\u00f9',
    'cy': '\u00e2\u00ea\u00ee\u00f4\u00fb\u0175\u0177\u00e1\u00e9\u00ed\u00f3\u00fa\u00e0\u00e8\u00eb\u00ef\u00f6',
    'ca': '\u00e0\u00e9\u00e8\u00ed\u00ef\u00f3\u00f2\u00fa\u00fc\u00e7',
    'gl': '\u00e1\u00e9\u00ed\u00f3\u00fa\u00f1\u00fc\u00ef\u00e7',
    'eu': '\u00f1\u00fc\u00e7\u00e1\u00e9\u00ed\u00f3\u00fa',
    'br': '\u00f1\u00f9\u00fc\u00e2\u00ea\u00ee\u00f4\u00fb\u00e9\u00e8\u00e0',
    'af': '\u00ea\u00eb\u00e9\u00e8\u00f4\u00f6\u00fb\u00ef\u00ee\u00e1\u00e4\u00fc\u00f3\u00ed',
    'pl': '\u0105\u0107\u0119\u0142\u0144\u00f3\u015b\u017a\u017c\u00e9',
    'cs': '\u00e1\u010d\u010f\u00e9\u011b\u00ed\u0148\u00f3\u0159\u0161\u0165\u00fa\u016f\u00fd\u017e\u00f6\u00fc',
    'sk': '\u00e1\u00e4\u010d\u010f\u00e9\u00ed\u013a\u013e\u0148\u00f3\u00f4\u0155\u0161\u0165\u00fa\u00fd\u017e\u00f6\u00fc',
    'hu': '\u00e1\u00e9\u00ed\u00f3\u00f6\u0151\u00fa\u00fc\u0171',
    'sl': '\u010d\u0161\u017e\u0107\u0111',
    'hr': '\u010d\u0107\u0111\u0161\u017e',
    'ro': '\u0103\u00e2\u00ee\u015f\u0163\u0219\u021b',
    'sq': '\u00eb\u00e7',
    'tr': '\u00e2\u00e7\u011f\u0131\u00ee\u00f6\u015f\u00fc\u00fb',
    'et': '\u00e4\u00f6\u00f5\u00fc\u0161\u017e',
    'lv': '\u0101\u010d\u0113\u0123\u012b\u0137\u013c\u0146\u0161\u016b\u017e\u014d\u0157',
    'lt': '\u0105\u010d\u0119\u0117\u012f\u0161\u0173\u016b\u017e',
    'eo': '\u0109\u011d\u0125\u0135\u015d\u016d',
    'mt': '\u0121\u0127\u010b\u017c\u00e0\u00e8\u00ec\u00f2\u00f9\u00e9',
}
LETTERS['western'] = ''.join(sorted(set(''.join(LETTERS[language] for language in WESTERN)) -
                                    set('\u0161\u017e')))

SCRIPTS = {
    'ru': 'CYRILLIC', 'uk': 'CYRILLIC', 'be': 'CYRILLIC', 'bg': 'CYRILLIC', 'mk': 'CYRILLIC',
    'sr': 'CYRILLIC', 'kk': 'CYRILLIC', 'el': 'GREEK', 'he': 'HEBREW', 'ar': 'ARABIC', 'fa': 'ARABIC', 'ur': 'ARABIC',
    'th': 'THAI',
}

PLACEHOLDER = re.compile(r'%[-+0-9.$*]*[a-zA-Z]+|%\d|\{[^}]*\}|\$\w+|\\[a-z]|https?:\S+')


def catalogue_messages(path):
    """The translations in a GNU message catalogue."""
    with open(path, 'rb') as file:
        data = file.read()
    count, originals, translations = struct.unpack('<3I', data[8:20])
    for i in range(count):
        original = entry(data, originals + 8 * i)
        translation = entry(data, translations + 8 * i)
        if original and translation and original != translation:
            yield translation.replace('\0', '\n').replace('_', '').replace('&', '')


def entry(data, at):
    length, offset = struct.unpack('<2I', data[at:at + 8])
    return data[offset:offset + length].decode('utf-8', 'replace')


def plain(text):
    """The text without markup and placeholders."""
    text = re.sub(r'<(?:media|credit|license|style|script)[\s\S]*?>', '', text)
    text = html.unescape(re.sub(r'<[^>]{0,300}>', '', text))
    return PLACEHOLDER.sub(' ', text)


def read_texts(folder):
    """All sample text by locale."""
    texts = collections.defaultdict(list)
    for where, _, names in sorted(os.walk(folder)):
        for name in sorted(names):
            path = os.path.join(where, name)
            locale = re.search(r'/(?:locale|translations|help)/([A-Za-z@_]+)/', path)
            suffix = re.search(r'\.([A-Za-z_@]+)\.utf8$', name)
            if os.path.islink(path) or not os.path.isfile(path):
                continue
            if name.endswith('.mo') and locale:
                texts[locale.group(1)] += map(plain, catalogue_messages(path))
            elif name.endswith('.page') and locale:
                texts[locale.group(1)].append(plain(open(path, encoding='utf-8').read()))
            elif name.endswith('.json') and where.endswith('/languages/i18n'):
                with open(path, encoding='utf-8') as file:
                    messages = json.load(file).values()
                texts['wiki-' + name[:-5]] += [plain(m) for m in messages if isinstance(m, str)]
            elif suffix:
                texts[suffix.group(1)].append(plain(open(path, encoding='utf-8').read()))
    return {locale: '\n'.join(parts) for locale, parts in texts.items()}


def fold(text):
    """Lower case, one character for one."""
    return ''.join(c.lower() if len(c.lower()) == 1 else c.lower()[0] for c in text)


def is_letter_of(c, language):
    """Whether the character is a letter or a mark of the language's script."""
    if unicodedata.category(c)[0] not in 'LM':
        return False
    if language in LETTERS:
        return 'a' <= c <= 'z' or c in LETTERS[language]
    script = SCRIPTS.get(language, 'LATIN')
    name = unicodedata.name(c, '')
    return name.startswith(script) or (script == 'LATIN' and '\u0300' <= c <= '\u0323')


def with_tone_marks(text):
    """Vietnamese as windows-1258 spells it, where the tone is a mark of its own."""
    tones = '\u0300\u0301\u0303\u0309\u0323'
    marked = []
    for c in text:
        parts = unicodedata.normalize('NFD', c)
        tone = [p for p in parts if p in tones]
        rest = [p for p in parts if p not in tones]
        marked.append(unicodedata.normalize('NFC', ''.join(rest)) + ''.join(tone))
    return ''.join(marked)


def spellings(text, language):
    """The text in each of the ways in which legacy charsets spell the language."""
    if language == 'vi':
        return [text, with_tone_marks(text)]
    if language == 'ro':  # Most charsets have s and t with a cedilla only.
        return [text.translate(str.maketrans('\u0219\u021b', '\u015f\u0163')),
                text.translate(str.maketrans('\u015f\u0163', '\u0219\u021b'))]
    return [text]


def bigram_table(text, language):
    """The alphabet, the costs of its letters, and rows of their costs behind one another."""
    counts = collections.Counter(text)
    letters = {c: n for c, n in counts.items() if is_letter_of(c, language)}
    total = sum(letters.values())
    if language not in SCRIPTS:
        for c in 'abcdefghijklmnopqrstuvwxyz':
            letters.setdefault(c, 1)
    alphabet = sorted(c for c, n in letters.items() if n > total * 2e-5 or 'a' <= c <= 'z')
    index = {c: i + 1 for i, c in enumerate(alphabet)}
    size = len(alphabet) + 1
    pairs = [[0] * size for _ in range(size)]
    previous = 0
    for c in text:
        current = index.get(c, 0)
        if previous or current:
            pairs[previous][current] += 1
        previous = current
    column = [sum(row[j] for row in pairs) + 0.5 for j in range(size)]
    everything = sum(column)
    rows = []
    for row in pairs:
        weight = 20.0
        seen = sum(row)
        rows.append(''.join(
            quantized(-math.log2((n + weight * column[j] / everything) / (seen + weight)))
            for j, n in enumerate(row)))
    frequencies = ''.join(quantized(-math.log2(letters[c] / total)) for c in alphabet)
    return alphabet, frequencies, rows


def quantized(bits):
    return chr(ord('0') + min(63, max(0, round(bits * 4))))


def character_groups(text, kept):
    """Characters by their cost in half bits, cheapest first."""
    counts = collections.Counter(
        c for c in text if ord(c) > 0x7F and ord(c) < 0x10000 and
        (unicodedata.category(c)[0] in 'LNP' or c == '\u3000'))
    total = sum(counts.values())
    groups = collections.defaultdict(list)
    for c, n in counts.most_common(kept):
        if n > 1:
            groups[round(-2 * math.log2(n / total))].append(c)
    return sorted(groups.items())


def literal(text):
    return 'u"' + ''.join('\\u%04x' % ord(c) if ord(c) > 0x7E else c for c in text) + '"'


def wrapped(text, per_line):
    return '\n        '.join(literal(text[i:i + per_line]) for i in range(0, len(text), per_line))


def main():
    texts = read_texts(sys.argv[1])
    print('// SPDX-License-Identifier: Apache-2.0\n'
          '// How often letters follow each other in each language. Made by\n'
          '// tools/make_language_tables.py, which says from what; not to be edited.\n'
          '#include "platform/i18n/detection/language_tables.h"\n\n'
          '#include <array>\n\n'
          'namespace platform::i18n::detail {\n\nnamespace {\n\n// clang-format off\n')
    tables = []
    samples = {language: fold('\n'.join(texts.get(l, '') for l in locales))
               for language, locales in ALPHABETIC.items()}
    samples['western'] = '\n'.join(samples[l][:WESTERN_SHARE] for l in WESTERN)
    for language, sample in samples.items():
        print(language, len(sample), file=sys.stderr)
        for spelling in spellings(sample, language):
            tables.append((language,) + bigram_table(spelling, language))
    print('constexpr std::array<LetterTable, %d> letterTableList{{' % len(tables))
    for language, alphabet, frequencies, rows in tables:
        print('    {"%s",\n        %s,' % (language, wrapped(alphabet, 14)))
        print('        R"(%s)",' % frequencies)
        print('\n'.join('        R"(%s)"' % row for row in rows) + '},')
    print('}};\n')
    for language, (locales, kept) in IDEOGRAPHIC.items():
        groups = character_groups('\n'.join(texts.get(l, '') for l in locales), kept)
        print('constexpr std::array<CharacterGroup, %d> groups_%s{{' %
              (len(groups), language.replace('-', '_')))
        for cost, characters in groups:
            print('    {%d,\n        %s},' % (cost, wrapped(characters, 14)))
        print('}};\n')
    print('constexpr std::array<CharacterTable, %d> characterTableList{{' % len(IDEOGRAPHIC))
    for language in IDEOGRAPHIC:
        print('    {"%s", groups_%s},' % (language, language.replace('-', '_')))
    print('}};\n// clang-format on\n\n}  // namespace\n')
    print('std::span<const LetterTable> letterTables() {\n    return letterTableList;\n}\n')
    print('std::span<const CharacterTable> characterTables() {\n    return characterTableList;\n}\n')
    print('}  // namespace platform::i18n::detail')


main()
