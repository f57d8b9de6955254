// SPDX-License-Identifier: Apache-2.0
// How the language models see each character.
//
// The costs of signs are round figures, not counted ones: what matters is that quotation marks and
// dashes are common, that a paragraph mark is not, and that text in the wrong charset is full of
// characters that nobody writes, or not in such places.
#include "platform/i18n/detection/character_traits.h"

#include <unicode/uchar.h>

#include <string_view>
#include <vector>

namespace platform::i18n::detail {

namespace {

// Bits of a character that is not text at all. One of them outweighs two or three odd letters.
constexpr int unassignedBits = 30;
constexpr int controlBits = 24;
constexpr int privateUseBits = 24;
// Bits of signs: the cost of signs that are not listed below, and what is added when a sign is out
// of place.
constexpr int rareSignBits = 13;
constexpr int misplacedBits = 6;
// Bits of a dash or bullet between blanks, and of an ornament after another of its kind.
constexpr int standingAloneBits = 4;
constexpr int repeatedBits = 2;
// Bits of a box drawing character by itself; half of that next to another one.
constexpr int boxDrawingBits = 11;
// The currency sign, which nobody uses: many charsets have it where others have a letter or the
// euro.
constexpr int currencySignBits = 16;

// Where a sign is out of place.
enum Rule : std::uint16_t {
    afterLetter = 1,
    beforeLetter = 2,
    betweenLetters = 4,
    beforeBlank = 8,
    betweenBlanks = 16,
    atWordStart = 32,
    // Not about places: what else is special.
    dash = 64,       // cheap between blanks
    ornament = 128,  // cheap when repeated
    boxDrawing = 256,
};

struct CommonSigns {
    int bits;
    std::u16string_view signs;
};
constexpr CommonSigns commonSigns[] = {
    {6, u"\u00A0\u2019\u2013\u2014\u3000\u3001\u3002"},
    {7,
     u"\u00AB\u00BB\u201C\u201D\u201E\u2018\u2026\u00B0\u300C\u300D\uFF0C\uFF1A\uFF08\uFF09\u060C"
     u"\u061F\u200C"},
    {8,
     u"\u00A9\u00AE\u2122\u00A7\u20AC\u00A3\u00BF\u00A1\u2022\u00B7\u2116\u00AD\u061B\u2010\u2011"
     u"\u300E\u300F\u30FB\uFF01\uFF1F\uFF1B\u3010\u3011\u0387\u037E\u05BE\u05F3\u05F4"},
    {10,
     u"\u00B4\u00BD\u00BC\u00BE\u00B2\u00B3\u00B9\u00D7\u00F7\u00B1\u00AA\u00BA\u201A\u2039\u203A"
     u"\u2020\u00B5\u200E\u200F\u2030\u2192\u2190\u2605\u25CF\u25A0\u25CB\u25C6\u203B"},
    {currencySignBits, u"\u00A4"},
};

// Signs are out of place between two letters, except for those listed here.
struct SignRules {
    std::uint16_t rules;
    std::u16string_view signs;
};
constexpr SignRules signRules[] = {
    {0, u"\u00AD\u00B7\u00A0\u2010\u2011\u200C\u200D\u05BE\u05F3\u05F4\u30FB"},
    {dash, u"\u2013\u2014"},
    {dash | betweenLetters, u"\u2022"},
    {betweenBlanks, u"\u2026"},
    {beforeBlank | betweenLetters, u"\u201E\u201A"},
    {beforeBlank | afterLetter, u"\u00BF\u00A1"},
    {atWordStart, u"\u2019\u00B4"},
    {afterLetter, u"\u00A9\u00A7\u2116\u00B0\u00B5"},
    {afterLetter | beforeLetter, u"\u00B1\u00BC\u00BD\u00BE\u00D7\u00F7"},
    {beforeLetter, u"\u00B9\u00B2\u00B3\u00AA\u00BA\u2122\u00AE"},
};

// Signs that fill lines.
constexpr std::u16string_view ornaments =
    u"\u2014\u2013\u2015\u2026\u2022\u00B7\u3000\u2605\u2606\u203B\u00A0\uFF1D";

constexpr std::size_t characters = 0x10000;

int bitsOfKind(char16_t c) {
    switch (u_charType(c)) {
        case U_UNASSIGNED:
            return unassignedBits;
        case U_CONTROL_CHAR:
            return controlBits;
        case U_PRIVATE_USE_CHAR:
            return privateUseBits;
        default:
            return c == 0xFFFD ? unassignedBits : rareSignBits;
    }
}

CharacterTraits findTraits(char16_t c) {
    CharacterTraits traits{};
    traits.lower = static_cast<char16_t>(u_tolower(c));
    // The ordinal indicators and the micro sign are letters by Unicode only.
    traits.isLetter = (U_GET_GC_MASK(c) & (U_GC_L_MASK | U_GC_M_MASK)) != 0 && c != 0x00AA &&
                      c != 0x00BA && c != 0x00B5;
    traits.letterCase = u_isULowercase(c)   ? LetterCase::small
                        : u_isUUppercase(c) ? LetterCase::capital
                                            : LetterCase::none;
    traits.signBits = static_cast<std::uint8_t>(bitsOfKind(c));
    traits.signRules = betweenLetters;
    return traits;
}

std::vector<CharacterTraits> makeTable() {
    std::vector<CharacterTraits> table(characters);
    for (std::size_t c = 0; c < characters; ++c) {
        table[c] = findTraits(static_cast<char16_t>(c));
    }
    for (const CommonSigns& common : commonSigns) {
        for (const char16_t sign : common.signs) {
            table[sign].signBits = static_cast<std::uint8_t>(common.bits);
        }
    }
    for (const SignRules& known : signRules) {
        for (const char16_t sign : known.signs) {
            table[sign].signRules = known.rules;
        }
    }
    for (char16_t c = 0x2500; c <= 0x25FF; ++c) {
        table[c].signRules |= c <= 0x259F ? boxDrawing | ornament : ornament;
    }
    for (char16_t c = 0xFF01; c <= 0xFF0F; ++c) {
        table[c].signRules |= ornament;
    }
    for (const char16_t c : ornaments) {
        table[c].signRules |= ornament;
    }
    return table;
}

bool isBlank(char16_t c) {
    return c <= u' ';
}

}  // namespace

const CharacterTraits* allTraits() {
    static const std::vector<CharacterTraits> table = makeTable();
    return table.data();
}

Cost signCost(const CharacterTraits* all, char16_t before, char16_t sign, char16_t after) {
    const CharacterTraits& traits = all[sign];
    const unsigned rules = traits.signRules;
    if (traits.signBits >= controlBits) {
        return bits(traits.signBits);
    }
    if (sign == before && (rules & ornament) != 0) {
        return bits(repeatedBits);
    }
    if (isBlank(before) && isBlank(after) && (rules & dash) != 0) {
        return bits(standingAloneBits);
    }
    const CharacterTraits& left = all[before];
    const CharacterTraits& right = all[after];
    if ((rules & boxDrawing) != 0) {
        if ((left.signRules & boxDrawing) != 0) {
            return bits(boxDrawingBits) / 2;
        }
        return bits(boxDrawingBits + (left.isLetter || right.isLetter ? misplacedBits : 0));
    }
    const bool isMisplaced = ((rules & afterLetter) != 0 && left.isLetter) ||
                             ((rules & beforeLetter) != 0 && right.isLetter) ||
                             ((rules & betweenLetters) != 0 && left.isLetter && right.isLetter) ||
                             ((rules & beforeBlank) != 0 && isBlank(after)) ||
                             ((rules & betweenBlanks) != 0 && isBlank(before) && isBlank(after)) ||
                             ((rules & atWordStart) != 0 && !left.isLetter && right.isLetter);
    return bits(traits.signBits + (isMisplaced ? misplacedBits : 0));
}

}  // namespace platform::i18n::detail
