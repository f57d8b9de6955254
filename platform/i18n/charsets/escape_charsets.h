// SPDX-License-Identifier: Apache-2.0
// Charsets that switch between ASCII and other characters by escape sequences.
#pragma once

#include <string>
#include <string_view>

namespace platform::i18n::detail {

/// The name of the charset of `bytes`, which are all ASCII, when escape sequences in them spell
/// other characters, and encoding these again gives the same bytes; else empty.
std::string escapedCharset(std::string_view bytes);

}  // namespace platform::i18n::detail
