// SPDX-License-Identifier: Apache-2.0
// Charsets that switch between ASCII and other characters by escape sequences.
#pragma once

#include <string>
#include <string_view>

namespace platform::i18n::detail {

/// Whether escape sequences may begin with `byte`.
constexpr bool mayBeginEscape(char byte) {
    return byte == '\x1B' || byte == '~';
}

/// The name of the charset of `bytes`, which are all ASCII, when escape sequences in them spell
/// other characters: the first of the ISO-2022 family and HZ in which they decode strictly and
/// encode again to the same bytes or, if there is none, to other bytes for the same text. Else
/// empty.
std::string escapedCharset(std::string_view bytes);

/// Whether `charset` is one of those that escapedCharset returns.
bool isEscapedCharset(std::string_view charset);

}  // namespace platform::i18n::detail
