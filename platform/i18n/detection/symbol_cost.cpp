// SPDX-License-Identifier: Apache-2.0
// How unexpected signs that are no letters are in running text. The figures are round ones: what
// matters is that quotation marks and dashes are common, signs like the paragraph mark are not, and
// that text in the wrong charset is full of characters that no one writes.
#include "platform/i18n/detection/symbol_cost.h"

#include <unicode/uchar.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

namespace platform::i18n::detail {

namespace {

constexpr int unassignedCost = 30;
constexpr int controlCost = 24;
constexpr int privateUseCost = 24;
constexpr int boxDrawingCost = 11;
constexpr int repeatedCost = 2;
constexpr int rareCost = 13;
constexpr int currencySignCost = 16;
constexpr int misplacedCost = 6;
constexpr int standingAloneCost = 4;

bool contains(std::u16string_view set, char16_t character) {
    return set.find(character) != std::u16string_view::npos;
}

// Signs in the order of how common they are.
constexpr std::u16string_view veryCommon = u"\u00A0\u2019\u2013\u2014\u3000\u3001\u3002";
constexpr std::u16string_view common =
    u"\u00AB\u00BB\u201C\u201D\u201E\u2018\u2026\u00B0\u300C\u300D\uFF0C\uFF1A\uFF08\uFF09\u060C"
    u"\u061F"
    u"\u200C";
constexpr std::u16string_view usual =
    u"\u00A9\u00AE\u2122\u00A7\u20AC\u00A3\u00BF\u00A1\u2022\u00B7\u2116\u00AD\u061B\u2010\u2011"
    u"\u300E\u300F\u30FB\uFF01\uFF1F\uFF1B\u3010\u3011\u0387\u037E\u05BE\u05F3\u05F4";
constexpr std::u16string_view lessUsual =
    u"\u00B4\u00BD\u00BC\u00BE\u00B2\u00B3\u00B9\u00D7\u00F7\u00B1\u00AA\u00BA\u201A\u2039\u203A"
    u"\u2020"
    u"\u00B5"
    u"\u200E\u200F\u2030\u2192\u2190\u2605\u25CF\u25A0\u25CB\u25C6\u203B";

int commonness(char16_t sign) {
    if (contains(veryCommon, sign)) {
        return 6;
    }
    if (contains(common, sign)) {
        return 7;
    }
    if (contains(usual, sign)) {
        return 8;
    }
    return contains(lessUsual, sign) ? 10 : rareCost;
}

bool isBlank(char16_t character) {
    return character <= u' ';
}

// What a character costs that is no text at all; zero for others.
int costOfNonText(char16_t character) {
    switch (u_charType(character)) {
        case U_UNASSIGNED:
            return unassignedCost;
        case U_CONTROL_CHAR:
            return controlCost;
        case U_PRIVATE_USE_CHAR:
            return privateUseCost;
        default:
            return character == 0xFFFD ? unassignedCost : 0;
    }
}

struct SignTraits {
    std::uint8_t nonTextCost;
    std::uint8_t commonness;
    bool isLetter;
};

SignTraits findTraits(char16_t character) {
    return {static_cast<std::uint8_t>(costOfNonText(character)),
            static_cast<std::uint8_t>(commonness(character)), u_isalpha(character) != 0};
}

// The traits of a character; those of alphabets and of the signs around them from a table.
SignTraits traitsOf(char16_t character) {
    static const auto table = [] {
        std::array<SignTraits, 0x2600> made{};
        for (std::size_t i = 0; i < made.size(); ++i) {
            made[i] = findTraits(static_cast<char16_t>(i));
        }
        return made;
    }();
    return character < table.size() ? table[character] : findTraits(character);
}

bool isLetter(char16_t character) {
    return traitsOf(character).isLetter;
}

// Signs that stand inside words.
bool joinsLetters(char16_t sign) {
    return contains(
        u"\u00AD\u00B4\u00B7\u00A0\u2010\u2011\u2013\u2014\u200C\u200D\u05BE\u05F3\u05F4\u2026"
        u"\u30FB",
        sign);
}

// Signs that fill lines.
bool isOrnament(char16_t sign) {
    return (sign >= 0x2500 && sign <= 0x25FF) || (sign >= 0xFF00 && sign <= 0xFF0F) ||
           sign == 0xFF1D ||
           contains(u"\u2014\u2013\u2015\u2026\u2022\u00B7\u3000\u2605\u2606\u203B\u00A0", sign);
}

bool isMisplaced(char16_t sign, Neighbours neighbours) {
    const bool letterBefore = isLetter(neighbours.before);
    const bool letterAfter = isLetter(neighbours.after);
    if (isBlank(neighbours.after) && contains(u"\u201E\u201A\u00BF\u00A1", sign)) {
        return true;
    }
    if (isBlank(neighbours.before) && isBlank(neighbours.after) && sign == 0x2026) {
        return true;
    }
    if (sign == 0x2019 || sign == 0x00B4) {
        return !letterBefore && letterAfter;
    }
    if (contains(u"\u00BF\u00A1\u00A9\u00A7\u2116", sign)) {
        return letterBefore;
    }
    if (contains(u"\u00B0\u00B5", sign)) {
        return letterBefore;
    }
    if (contains(u"\u00B1\u00BC\u00BD\u00BE\u00D7\u00F7", sign)) {
        return letterBefore || letterAfter;
    }
    if (contains(u"\u00B9\u00B2\u00B3\u00AA\u00BA\u2122\u00AE", sign)) {
        return letterAfter;
    }
    return letterBefore && letterAfter && !joinsLetters(sign);
}

}  // namespace

int symbolCost(char16_t sign, Neighbours neighbours) {
    const SignTraits traits = traitsOf(sign);
    if (traits.nonTextCost != 0) {
        return traits.nonTextCost;
    }
    if (sign == neighbours.before && isOrnament(sign)) {
        return repeatedCost;
    }
    if (sign >= 0x2500 && sign <= 0x259F) {
        const bool drawing = neighbours.before >= 0x2500 && neighbours.before <= 0x259F;
        const bool amongLetters = isLetter(neighbours.before) || isLetter(neighbours.after);
        return drawing ? boxDrawingCost / 2 : boxDrawingCost + (amongLetters ? misplacedCost : 0);
    }
    const bool alone = isBlank(neighbours.before) && isBlank(neighbours.after);
    if (alone && contains(u"\u2013\u2014\u2022", sign)) {
        return standingAloneCost;
    }
    if (sign == 0x00A4) {
        return currencySignCost;
    }
    return traits.commonness + (isMisplaced(sign, neighbours) ? misplacedCost : 0);
}

}  // namespace platform::i18n::detail
