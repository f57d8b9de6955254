// SPDX-License-Identifier: Apache-2.0
// Which codes of a charset round-trip.
#include "platform/i18n/charsets/round_trip_codes.h"

#include <unicode/utf16.h>

#include <cstddef>
#include <stdexcept>
#include <string>

namespace platform::i18n::detail {

namespace {

constexpr auto relaxed = std::memory_order_relaxed;

std::size_t placeOf(std::uint8_t first, std::uint8_t second) {
    return std::size_t{first} << 8U | second;
}

bool isOneCharacter(const std::u16string& text) {
    return text.size() == 1 ||
           (text.size() == 2 && U16_IS_LEAD(text.front()) && U16_IS_TRAIL(text.back()));
}

}  // namespace

bool RoundTripCodes::holdAll(std::string_view bytes, Charset& charset) {
    for (std::size_t i = 0; i < bytes.size(); ++i) {
        const auto byte = static_cast<std::uint8_t>(bytes[i]);
        Kind kind = bytes_[byte].load(relaxed);
        if (kind == unknown) {
            kind = kindOfByte(byte, charset);
        }
        if (kind == roundTrips) {
            continue;
        }
        if (kind != lead || ++i == bytes.size()) {
            return false;
        }
        const auto second = static_cast<std::uint8_t>(bytes[i]);
        kind = pairs_[placeOf(byte, second)].load(relaxed);
        if (kind == unknown) {
            kind = kindOfPair(byte, second, charset);
        }
        if (kind != roundTrips) {
            return false;
        }
    }
    return true;
}

RoundTripCodes::Kind RoundTripCodes::kindOfByte(std::uint8_t byte, Charset& charset) {
    const std::string code(1, static_cast<char>(byte));
    Kind kind = lead;
    try {
        const std::u16string text = charset.decode(code);
        kind = isOneCharacter(text) && charset.encode(text) == code ? roundTrips : changes;
    } catch (const std::runtime_error&) {
        // No character by itself: it may be the first half of one. If it is not, no pair that it
        // begins will be a character either.
    }
    bytes_[byte].store(kind, relaxed);
    return kind;
}

RoundTripCodes::Kind RoundTripCodes::kindOfPair(std::uint8_t first, std::uint8_t second,
                                                Charset& charset) {
    const std::string code{static_cast<char>(first), static_cast<char>(second)};
    Kind kind = changes;
    try {
        const std::u16string text = charset.decode(code);
        kind = isOneCharacter(text) && charset.encode(text) == code ? roundTrips : changes;
    } catch (const std::runtime_error&) {
        // malformed, or the beginning of a longer code
    }
    pairs_[placeOf(first, second)].store(kind, relaxed);
    return kind;
}

}  // namespace platform::i18n::detail
