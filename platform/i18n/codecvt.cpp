// SPDX-License-Identifier: Apache-2.0
// The public converters: each holds one opened charset.
#include "platform/i18n/codecvt.h"

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n {

codecvt_string_to_ustring::codecvt_string_to_ustring(const std::string& charset, bool strict)
    : charset_(detail::openCharset(charset, strict)) {}

codecvt_string_to_ustring::codecvt_string_to_ustring(codecvt_string_to_ustring&&) noexcept =
    default;
codecvt_string_to_ustring& codecvt_string_to_ustring::operator=(
    codecvt_string_to_ustring&&) noexcept = default;
codecvt_string_to_ustring::~codecvt_string_to_ustring() = default;

std::u16string codecvt_string_to_ustring::do_convert(const char* data, std::size_t length) {
    return charset_->decode({data, length});
}

codecvt_ustring_to_string::codecvt_ustring_to_string(const std::string& charset, bool strict)
    : charset_(detail::openCharset(charset, strict)) {}

codecvt_ustring_to_string::codecvt_ustring_to_string(codecvt_ustring_to_string&&) noexcept =
    default;
codecvt_ustring_to_string& codecvt_ustring_to_string::operator=(
    codecvt_ustring_to_string&&) noexcept = default;
codecvt_ustring_to_string::~codecvt_ustring_to_string() = default;

std::string codecvt_ustring_to_string::do_convert(const char16_t* data, std::size_t length) {
    return charset_->encode({data, length});
}

std::u16string to_ustring(std::string_view bytes, codecvt_string_to_ustring& converter) {
    return bytes.empty() ? std::u16string() : converter.do_convert(bytes.data(), bytes.size());
}

std::string to_string(std::u16string_view text, codecvt_ustring_to_string& converter) {
    return text.empty() ? std::string() : converter.do_convert(text.data(), text.size());
}

bool comesBackUnchanged(std::string_view bytes, const std::string& charset) {
    return detail::openCharset(charset, true)->roundTrips(bytes);
}

std::u16string to_ustring(std::string_view utf8) {
    return detail::openCharset("UTF-8", true)->decode(utf8);
}

std::string to_string(std::u16string_view text) {
    return detail::openCharset("UTF-8", true)->encode(text);
}

}  // namespace platform::i18n
