// SPDX-License-Identifier: Apache-2.0
// UTF-16 and UTF-32 without a byte-order mark.
#pragma once

#include <optional>
#include <string_view>

namespace platform::i18n::detail {

/// One of UTF-16LE, UTF-16BE, UTF-32LE and UTF-32BE, and the bits that a byte of the text costs in
/// it.
struct UnmarkedUnicode {
    const char* charset;
    double bitsPerByte;
};

/// The encoding form in which `bytes`, as a whole, are the most plausible text; none when they are
/// not plausible in any. Linear in the size.
std::optional<UnmarkedUnicode> unmarkedUnicode(std::string_view bytes);

}  // namespace platform::i18n::detail
