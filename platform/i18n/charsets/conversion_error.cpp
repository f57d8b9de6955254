// SPDX-License-Identifier: Apache-2.0
// The texts of failed conversions, the same for every charset.
#include "platform/i18n/charsets/conversion_error.h"

#include <unicode/utf16.h>

#include <cstdio>
#include <stdexcept>
#include <string>

namespace platform::i18n::detail {

namespace {

std::string codePointName(char32_t character) {
    char name[16];
    std::snprintf(name, sizeof name, "U+%04X", static_cast<unsigned>(character));
    return name;
}

std::string cannotDecode(std::string_view charset) {
    return "Cannot decode text as " + std::string(charset) + ": ";
}

std::string cannotEncode(std::string_view charset) {
    return "Cannot encode text as " + std::string(charset) + ": ";
}

}  // namespace

void throwMalformed(std::string_view charset, std::size_t offset) {
    throw std::runtime_error(cannotDecode(charset) + "malformed input at byte " +
                             std::to_string(offset));
}

void throwTruncated(std::string_view charset, std::size_t offset) {
    throw std::runtime_error(cannotDecode(charset) +
                             "the input ends inside the character at byte " +
                             std::to_string(offset));
}

void throwUnmappable(std::string_view charset, char32_t character, std::size_t offset) {
    throw std::runtime_error(cannotEncode(charset) + "it has no character " +
                             codePointName(character) + ", found at code unit " +
                             std::to_string(offset));
}

void throwUnpairedSurrogate(std::string_view charset, std::size_t offset) {
    throw std::runtime_error(cannotEncode(charset) + "unpaired surrogate at code unit " +
                             std::to_string(offset));
}

bool startsWithPair(std::u16string_view text) {
    return text.size() > 1 && U16_IS_LEAD(text[0]) && U16_IS_TRAIL(text[1]);
}

void throwCannotEncode(std::string_view charset, std::u16string_view text, std::size_t offset) {
    const char16_t unit = text[offset];
    if (startsWithPair(text.substr(offset))) {
        throwUnmappable(
            charset, static_cast<char32_t>(U16_GET_SUPPLEMENTARY(unit, text[offset + 1])), offset);
    }
    if (U16_IS_SURROGATE(unit)) {
        throwUnpairedSurrogate(charset, offset);
    }
    throwUnmappable(charset, unit, offset);
}

void throwUnknownCharset(std::string_view name) {
    if (name.empty()) {
        throw std::runtime_error("Unknown charset: the name is empty");
    }
    constexpr std::size_t longestShown = 60;
    std::string shown(name.substr(0, longestShown));
    for (char& c : shown) {
        if (c < ' ' || c > '~') {
            c = '?';
        }
    }
    if (name.size() > longestShown) {
        shown += "...";
    }
    throw std::runtime_error("Unknown charset \"" + shown + "\"");
}

}  // namespace platform::i18n::detail
