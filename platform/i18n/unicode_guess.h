// UTF-16 and UTF-32 without a byte-order mark.
#pragma once

#include <string>
#include <string_view>

namespace platform::i18n::detail {

/// The name of the encoding form that `bytes` are in, when they are text in one of UTF-16LE,
/// UTF-16BE, UTF-32LE and UTF-32BE as a whole and much more plausible so than as anything else;
/// else empty. Linear in the size.
std::string unmarkedUnicode(std::string_view bytes);

}  // namespace platform::i18n::detail
