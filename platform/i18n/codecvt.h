// SPDX-License-Identifier: Apache-2.0
// Conversion between bytes in a named charset and UTF-16 text.
#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <string_view>

namespace platform::i18n {

namespace detail {
class Charset;
}

/// Decodes bytes of one charset to UTF-16. A converter is cheap to keep and holds no text between
/// calls, but must not be used by two threads at once.
class codecvt_string_to_ustring {
public:
    /// `charset` is an IANA name or a usual alias, compared without case. `strict` decides what
    /// malformed input does: true throws, false puts U+FFFD in its place. True also refuses what
    /// could be decoded but would not encode again: a save would lose it. In charsets in which a
    /// text has one right spelling (BOCU-1, GSM 03.38), that means every other spelling.
    /// Throws std::runtime_error naming the charset when it is unknown or empty.
    codecvt_string_to_ustring(const std::string& charset, bool strict);
    codecvt_string_to_ustring(codecvt_string_to_ustring&&) noexcept;
    codecvt_string_to_ustring& operator=(codecvt_string_to_ustring&&) noexcept;
    ~codecvt_string_to_ustring();

    /// Decodes `length` bytes at `data` as one whole text. A byte-order mark is kept as U+FEFF.
    /// Throws std::runtime_error naming the charset and the byte offset of malformed input, or of
    /// what could not be encoded again, when strict. Linear in `length`.
    std::u16string do_convert(const char* data, std::size_t length);

private:
    std::unique_ptr<detail::Charset> charset_;
};

/// Encodes UTF-16 to bytes of one charset. Sharing is as for codecvt_string_to_ustring.
class codecvt_ustring_to_string {
public:
    /// As for codecvt_string_to_ustring; otherwise the charset's substitution character replaces
    /// what it cannot hold.
    codecvt_ustring_to_string(const std::string& charset, bool strict);
    codecvt_ustring_to_string(codecvt_ustring_to_string&&) noexcept;
    codecvt_ustring_to_string& operator=(codecvt_ustring_to_string&&) noexcept;
    ~codecvt_ustring_to_string();

    /// Encodes `length` code units at `data` as one whole text. No byte-order mark is added.
    /// Throws std::runtime_error naming the charset and the code-unit offset of what it cannot hold
    /// when strict. Linear in `length`.
    std::string do_convert(const char16_t* data, std::size_t length);

private:
    std::unique_ptr<detail::Charset> charset_;
};

/// `bytes` decoded with `converter`; empty text stays empty.
std::u16string to_ustring(std::string_view bytes, codecvt_string_to_ustring& converter);

/// `text` encoded with `converter`; empty text stays empty.
std::string to_string(std::u16string_view text, codecvt_ustring_to_string& converter);

/// Whether `bytes` are known to be valid in `charset` and to come back as they are when they are
/// decoded and encoded again. This is checked without converting them, so the result may be false
/// for bytes that do come back. Throws std::runtime_error when the charset is unknown. Linear in
/// their number.
bool comesBackUnchanged(std::string_view bytes, const std::string& charset);

/// Strict UTF-8 to UTF-16. Throws std::runtime_error naming the byte offset of malformed input.
std::u16string to_ustring(std::string_view utf8);

/// Strict UTF-16 to UTF-8. Throws std::runtime_error naming the offset of an unpaired surrogate.
std::string to_string(std::u16string_view text);

}  // namespace platform::i18n
