// SPDX-License-Identifier: Apache-2.0
// How often units of a text stand next to each other: all that the language models need.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

#include "platform/i18n/detection/character_traits.h"

namespace platform::i18n::detail {

/// The cost of any ASCII character: about the entropy of letters by themselves, punctuation
/// included.
constexpr Cost asciiBits = bits(5);
/// The cost of a control code that texts do not hold.
constexpr Cost strayControlBits = bits(20);

/// Whether `byte` is a control code that texts do not hold. DEL is not counted among them: in
/// EBCDIC its byte is the quotation mark, so ASCII text with many would cost less as EBCDIC. What
/// is decoded from EBCDIC pays for it elsewhere.
constexpr bool isStrayControl(char byte) {
    const auto code = static_cast<unsigned char>(byte);
    return code < 0x20 && (code < '\t' || code > '\r') && code != 0x1A && code != 0x1B;
}

/// Two neighbours, and how often they occur.
struct UnitPair {
    char16_t before;
    char16_t current;
    std::uint32_t count;
};

/// A unit between its neighbours, and how often they occur.
struct UnitTriple {
    char16_t before;
    char16_t current;
    char16_t after;
    std::uint32_t count;
};

/// Counts over a text. Its units are characters or, for charsets of single bytes, bytes: each of
/// those charsets then only costs a pass over the counts, however long the text is.
///
/// Only runs of units that hold something beyond ASCII tell charsets apart: ASCII letters and units
/// from 0x80 on. Everything else costs the same in every charset.
struct TextCounts {
    enum class Runs { beyondAscii, all };

    /// Counts pairs in these runs of `units`. Linear in their number.
    explicit TextCounts(std::u16string_view units, Runs runs = Runs::beyondAscii);

    /// Counts the triples of the same units, which are bytes or characters. Of characters, letters
    /// next to other letters beyond ASCII are left out, as no model asks for them. Linear in the
    /// number of units.
    void countTriplesOfBytes(std::u16string_view units);
    void countTriplesOfCharacters(std::u16string_view units);

    /// The cost of the ASCII outside the runs.
    Cost asciiCost = 0;
    /// The neighbours in the runs; '\0' stands for what is beyond a run's end. The first
    /// `commonest` of them are the commonest, in that order.
    std::vector<UnitPair> pairs;
    static constexpr std::size_t commonest = 32;
    /// Units from 0x80 on between their neighbours, whatever these are; '\0' at the text's ends.
    /// Empty until they are counted.
    std::vector<UnitTriple> triples;
};

}  // namespace platform::i18n::detail
