// SPDX-License-Identifier: Apache-2.0
// Which codes of a charset round-trip: encode back to themselves once decoded.
#pragma once

#include <array>
#include <atomic>
#include <cstdint>
#include <string_view>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

/// The round-tripping codes of one charset in which every character is one or two bytes whose
/// meaning does not depend on what is around them; longer codes count as ones that do not. The
/// table starts empty and learns each code from the charset when it first occurs. May be used by
/// several threads.
class RoundTripCodes {
public:
    /// Whether each code in `bytes` round-trips. `charset`, opened strict, converts those that have
    /// not occurred before.
    bool holdAll(std::string_view bytes, Charset& charset);

private:
    enum Kind : std::uint8_t {
        unknown,
        roundTrips,
        changes,
        lead,  // a byte that begins codes of two
    };

    Kind kindOfByte(std::uint8_t byte, Charset& charset);
    Kind kindOfPair(std::uint8_t first, std::uint8_t second, Charset& charset);

    std::array<std::atomic<Kind>, 0x100> bytes_{};
    std::array<std::atomic<Kind>, 0x10000> pairs_{};
};

}  // namespace platform::i18n::detail
