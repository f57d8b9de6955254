// SPDX-License-Identifier: Apache-2.0
// The texts of failed conversions, the same for every charset.
#pragma once

#include <cstddef>
#include <string_view>

namespace platform::i18n::detail {

/// Throws std::runtime_error: the byte at `offset` begins no character of `charset`.
[[noreturn]] void throwMalformed(std::string_view charset, std::size_t offset);

/// Throws std::runtime_error: the input ends inside the character that begins at byte `offset`.
[[noreturn]] void throwTruncated(std::string_view charset, std::size_t offset);

/// Throws std::runtime_error: `charset` lacks the character at code unit `offset`.
[[noreturn]] void throwUnmappable(std::string_view charset, char32_t character, std::size_t offset);

/// Throws std::runtime_error: code unit `offset` is a surrogate without its other half.
[[noreturn]] void throwUnpairedSurrogate(std::string_view charset, std::size_t offset);

/// Whether `text` begins with a surrogate pair.
bool startsWithPair(std::u16string_view text);

/// Throws the reason why the character at code unit `offset` of `text` cannot be encoded: it is an
/// unpaired surrogate, or `charset` lacks it.
[[noreturn]] void throwCannotEncode(std::string_view charset, std::u16string_view text,
                                    std::size_t offset);

/// Throws std::runtime_error: there is no charset of this name. A name that is long or not plain
/// text is shortened, so that the message stays one readable line.
[[noreturn]] void throwUnknownCharset(std::string_view name);

}  // namespace platform::i18n::detail
