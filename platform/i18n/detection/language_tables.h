// SPDX-License-Identifier: Apache-2.0
// How often letters follow each other in each language: what decoded text is measured with.
#pragma once

#include <span>
#include <string_view>

namespace platform::i18n::detail {

/// A language with an alphabet, in one spelling. How unexpected a letter is stands there in quarter
/// bits, each written as the character that many behind '0'. `frequencies` has it for each letter
/// by itself. `costs` is a square of (letters + 1) rows and columns: row i, column j has it for
/// letter j - 1 of the alphabet behind letter i - 1. Row and column 0 stand for what is no letter:
/// where words begin and end.
struct LetterTable {
    const char* language;
    std::u16string_view alphabet;
    std::string_view frequencies;
    std::string_view costs;
};

/// Characters of one language that are about equally frequent: each costs `halfBits` / 2 bits.
struct CharacterGroup {
    int halfBits;
    std::u16string_view characters;
};

/// A language written with thousands of characters.
struct CharacterTable {
    const char* language;
    std::span<const CharacterGroup> groups;
};

std::span<const LetterTable> letterTables();
std::span<const CharacterTable> characterTables();

}  // namespace platform::i18n::detail
