// SPDX-License-Identifier: Apache-2.0
// Charsets that switch between ASCII and other characters by escape sequences. All their bytes are
// ASCII, so they have to be looked for before a file passes for plain ASCII.
#include "platform/i18n/charsets/escape_charsets.h"

#include <algorithm>
#include <initializer_list>
#include <stdexcept>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

namespace {

bool spellsMoreThanAscii(const char* charset, std::string_view bytes) {
    try {
        const std::unique_ptr<Charset> opened = openCharset(charset, true);
        const std::u16string text = opened->decode(bytes);
        return std::any_of(text.begin(), text.end(), [](char16_t c) { return c >= 0x80; }) &&
               opened->encode(text) == bytes;
    } catch (const std::runtime_error&) {
        return false;
    }
}

std::string firstOf(std::initializer_list<const char*> charsets, std::string_view bytes) {
    for (const char* charset : charsets) {
        if (spellsMoreThanAscii(charset, bytes)) {
            return charset;
        }
    }
    return {};
}

}  // namespace

std::string escapedCharset(std::string_view bytes) {
    if (bytes.find('\x1B') != std::string_view::npos) {
        return firstOf({"ISO-2022-JP", "ISO-2022-JP-1", "ISO-2022-JP-2", "ISO-2022-KR",
                        "ISO-2022-CN", "ISO-2022-CN-EXT"},
                       bytes);
    }
    return bytes.find("~{") != std::string_view::npos ? firstOf({"HZ-GB-2312"}, bytes)
                                                      : std::string();
}

}  // namespace platform::i18n::detail
