// SPDX-License-Identifier: Apache-2.0
#include "host/commands/text_file.h"

#include <simdjson.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <set>
#include <sstream>
#include <stdexcept>
#include <system_error>
#include <vector>

#include "platform/i18n/codecvt.h"
#include "platform/i18n/detect_charset.h"

namespace host {

namespace {

using platform::i18n::codecvt_string_to_ustring;
using platform::i18n::codecvt_ustring_to_string;

// A character that a charset lacks, and its first position.
struct Misfit {
    std::u16string character;
    std::size_t line;
    std::size_t column;
};

// How many of the characters that a charset lacks are named.
constexpr std::size_t mostMisfits = 5;

bool canEncode(std::u16string_view text, codecvt_ustring_to_string& converter) {
    try {
        converter.do_convert(text.data(), text.size());
        return true;
    } catch (const std::runtime_error&) {
        return false;
    }
}

std::u16string_view firstCharacter(std::u16string_view text) {
    return text.substr(0, text.size() > 1 && (text[0] & 0xFC00) == 0xD800 ? 2 : 1);
}

// The first different characters of `text` that cannot be encoded each by itself.
std::vector<Misfit> misfitsOf(std::u16string_view text, codecvt_ustring_to_string& converter) {
    std::vector<Misfit> misfits;
    std::set<std::u16string_view> seen;
    std::size_t line = 1;
    std::size_t column = 1;
    while (!text.empty() && misfits.size() < mostMisfits) {
        const std::u16string_view character = firstCharacter(text);
        if (seen.insert(character).second && !canEncode(character, converter)) {
            misfits.push_back({std::u16string(character), line, column});
        }
        column = character == u"\n" ? 1 : column + 1;
        line += character == u"\n" ? 1 : 0;
        text.remove_prefix(character.size());
    }
    return misfits;
}

// For example: "é" (U+00E9)
std::string nameOf(const std::u16string& character) {
    const char32_t code = character.size() == 1 ? character[0]
                                                : 0x10000U + ((character[0] & 0x3FFU) << 10U) +
                                                      (character[1] & 0x3FFU);
    std::array<char, 16> number{};
    std::snprintf(number.data(), number.size(), "(U+%04X)", static_cast<unsigned>(code));
    const bool isHalf = character.size() == 1 && (code & 0xF800U) == 0xD800U;
    return isHalf ? std::string("half a surrogate pair ") + number.data()
                  : "\"" + platform::i18n::to_string(character) + "\" " + number.data();
}

std::string describe(const std::vector<Misfit>& misfits, const std::string& charset) {
    std::string text = charset + " has no ";
    for (const Misfit& misfit : misfits) {
        text += (&misfit == &misfits.front() ? "" : ", ") + nameOf(misfit.character) + " at line " +
                std::to_string(misfit.line) + ", column " + std::to_string(misfit.column);
    }
    return misfits.size() == mostMisfits ? text + " and perhaps others" : text;
}

}  // namespace

std::optional<std::string> readRegularFile(const std::string& path) {
    std::error_code unknown;
    if (!std::filesystem::is_regular_file(path, unknown)) {
        return std::nullopt;
    }
    std::ifstream file(path, std::ios::binary);
    if (!file) {
        return std::nullopt;
    }
    std::string bytes;
    bytes.resize(static_cast<std::size_t>(
        std::max<std::uintmax_t>(std::filesystem::file_size(path, unknown) + 1, 4096)));
    std::size_t length = 0;
    while (file.read(bytes.data() + length, static_cast<std::streamsize>(bytes.size() - length))) {
        length = bytes.size();
        bytes.resize(bytes.size() * 2);
    }
    bytes.resize(length + static_cast<std::size_t>(file.gcount()));
    return bytes;
}

std::string charsetOf(std::string_view bytes) {
    std::ostringstream diagnostics;  // Its messages are of no use here.
    return platform::i18n::detect_charset(bytes.data(), bytes.size(), diagnostics, u"<unknown>");
}

TextFile readTextFile(const std::string& path) {
    TextFile file;
    file.bytes = readRegularFile(path).value_or("");
    file.charset = charsetOf(file.bytes);
    codecvt_string_to_ustring converter(file.charset, true);
    file.text = platform::i18n::to_ustring(file.bytes, converter);
    return file;
}

std::string toUtf8(std::string_view bytes, const std::string& charset) {
    if (charset == "UTF-8" && simdjson::validate_utf8(bytes.data(), bytes.size())) {
        return std::string(bytes);
    }
    codecvt_string_to_ustring converter(charset, true);
    return platform::i18n::to_string(platform::i18n::to_ustring(bytes, converter));
}

std::string asValidUtf8(std::string_view text) {
    if (simdjson::validate_utf8(text.data(), text.size())) {
        return std::string(text);
    }
    codecvt_string_to_ustring converter("UTF-8", false);
    return platform::i18n::to_string(platform::i18n::to_ustring(text, converter));
}

std::string encode(std::u16string_view text, const std::string& charset) {
    codecvt_ustring_to_string converter(charset, true);
    try {
        return platform::i18n::to_string(text, converter);
    } catch (const std::runtime_error&) {
        const std::vector<Misfit> misfits = misfitsOf(text, converter);
        if (misfits.empty()) {
            throw;
        }
        throw std::runtime_error(describe(misfits, charset));
    }
}

bool canHold(std::u16string_view text, const std::string& charset) {
    codecvt_ustring_to_string converter(charset, true);
    return canEncode(text, converter);
}

std::string faultOfText(std::string_view bytes, const std::string& charset) {
    try {
        if (!platform::i18n::comesBackUnchanged(bytes, charset)) {
            codecvt_string_to_ustring converter(charset, true);
            encode(platform::i18n::to_ustring(bytes, converter), charset);
        }
        return "";
    } catch (const std::runtime_error& error) {
        return error.what();
    }
}

}  // namespace host
