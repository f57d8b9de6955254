// SPDX-License-Identifier: Apache-2.0
// Detection of the charset of a text file.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iosfwd>
#include <string>
#include <string_view>

namespace platform::i18n {

/// The longest text in bytes that detect_charset takes: 1 GiB. A longer one, in UTF-16 and escaped
/// for a message, would not fit in the memory of most machines.
inline constexpr std::size_t maxTextLength = std::size_t{1} << 30;

/// Throws std::runtime_error, which names both lengths, when `length` is above maxTextLength.
void requireTextLength(std::uintmax_t length);

/// The charset of the `length` bytes at `data`, by its IANA preferred name ("UTF-8", "Shift_JIS",
/// "windows-1251"); always one that both converters accept and in which all the bytes decode
/// strictly; they also encode back to the same bytes, except where escape sequences of ISO-2022 or
/// HZ are spelt in a way that no converter writes. A byte-order mark decides; empty, ASCII and
/// valid UTF-8 input is "UTF-8"; of charsets that agree on all bytes, the one that holds more
/// characters is named; input that fits no charset is "ISO-8859-1", which holds every byte, and
/// only then one line that names `sourceName` is written to `diagnostics`. Throws
/// std::runtime_error when `length` is above maxTextLength. Linear in `length`.
std::string detect_charset(const char* data, std::size_t length, std::ostream& diagnostics,
                           std::u16string_view sourceName);

/// Whether `charset`, as detect_charset names it, switches between sets of characters by escape
/// sequences: only then may text that was found to be in it encode back to other bytes.
bool hasEscapeSequences(std::string_view charset);

}  // namespace platform::i18n
