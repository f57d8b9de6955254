// SPDX-License-Identifier: Apache-2.0
// The charsets behind the converters: one object decodes and encodes one charset.
#pragma once

#include <memory>
#include <string>
#include <string_view>

namespace platform::i18n::detail {

/// One charset, opened for use by one thread. Each call handles one whole text.
class Charset {
public:
    Charset() = default;
    Charset(const Charset&) = delete;
    Charset& operator=(const Charset&) = delete;
    virtual ~Charset() = default;

    /// The text of `bytes`. Malformed input throws std::runtime_error when the charset was opened
    /// strict, else becomes U+FFFD. Strict decoding also refuses what `encode` would then refuse.
    virtual std::u16string decode(std::string_view bytes) = 0;

    /// The bytes of `text`. What the charset cannot hold throws std::runtime_error when the charset
    /// was opened strict, else becomes the charset's replacement.
    virtual std::string encode(std::u16string_view text) = 0;

    /// Whether `bytes` are known to decode strictly and to encode back to the same bytes. Does not
    /// convert them, which would take several times as long; so false where only converting can
    /// tell.
    virtual bool roundTrips(std::string_view bytes) {
        static_cast<void>(bytes);
        return false;
    }
};

/// Opens the charset that `name` means. Throws std::runtime_error naming it when it is not known.
std::unique_ptr<Charset> openCharset(std::string_view name, bool strict);

/// Whether both names mean the same charset, known to both converters.
bool isSameCharset(std::string_view name, std::string_view other);

}  // namespace platform::i18n::detail
