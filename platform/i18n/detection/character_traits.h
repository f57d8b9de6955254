// SPDX-License-Identifier: Apache-2.0
// How the language models see each character: a letter, or a sign with a cost of its own.
#pragma once

#include <cstdint>

namespace platform::i18n::detail {

/// An amount of information: quarter bits. How unexpected something is, -log2 of its probability.
using Cost = std::int64_t;

constexpr Cost bits(double amount) {
    return static_cast<Cost>(amount * 4);
}

enum class LetterCase : std::uint8_t { none, small, capital };

struct CharacterTraits {
    char16_t lower;  // itself in lower case
    bool isLetter;   // a letter or a mark, a part of words
    LetterCase letterCase;
    std::uint8_t signBits;    // of what is not a letter: what it costs where it belongs
    std::uint16_t signRules;  // and where it does not belong
};

/// The traits of all 65,536 code units, made at the first call.
const CharacterTraits* allTraits();

inline const CharacterTraits& traitsOf(char16_t c) {
    return allTraits()[c];
}

/// `all` is what allTraits() returns.
inline bool isLetterBeyondAscii(const CharacterTraits* all, char16_t c) {
    return c >= 0x80 && all[c].isLetter;
}

/// The cost of the non-ASCII character `sign`, which is not a letter, between its neighbours; those
/// are '\0' at the ends of the text. `all` is what allTraits() returns.
Cost signCost(const CharacterTraits* all, char16_t before, char16_t sign, char16_t after);

}  // namespace platform::i18n::detail
