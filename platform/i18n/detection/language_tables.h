// SPDX-License-Identifier: Apache-2.0
// How often letters follow each other in each language: the statistics against which decoded text
// is measured.
#pragma once

#include <span>
#include <string_view>

namespace platform::i18n::detail {

/// A language with an alphabet, in one spelling. The tables hold how unexpected a letter is, in
/// quarter bits, each written as the character that many after '0'. `frequencies` has it for each
/// letter by itself. `costs` is a square of (letters + 1) rows and columns: row i, column j has it
/// for letter j - 1 of the alphabet after letter i - 1. Row and column 0 stand for no letter: where
/// words begin and end.
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
