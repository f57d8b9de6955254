// SPDX-License-Identifier: Apache-2.0
// Names of entries: their encodings, and how they are shown.
#pragma once

#include <string>
#include <string_view>

namespace platform::package::zip {

/// Whether `bytes` are valid UTF-8.
bool isUtf8(std::string_view bytes) noexcept;

/// The UTF-8 form of `bytes` in code page 437, the charset of names that declare no other. Every
/// byte stands for a character.
std::string fromCodePage437(std::string_view bytes);

/// `name` for an error, which must be valid text: if it is not valid UTF-8, U+FFFD stands for each
/// of its bytes outside of ASCII.
std::string printable(std::string_view name);

}  // namespace platform::package::zip
