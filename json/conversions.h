// SPDX-License-Identifier: Apache-2.0
// Conversions of the pieces that JSON text is made of: number texts and UTF-16 escapes.
#pragma once

#include <string>
#include <string_view>

namespace json {

/// The double nearest to the number that `text` begins with, written as JSON writes numbers. A
/// number too large becomes infinity, one too small zero or a denormal; a text that begins with no
/// number is 0. It depends on no locale.
double string_to_double(std::string_view text);

/// The UTF-8 form of one UTF-16 unit, or of two. A surrogate pair is one character; of two units
/// that are not a pair, each is converted by itself. A surrogate that is not part of a pair becomes
/// U+FFFD.
std::string u16_to_u8(std::u16string_view units);

}  // namespace json
