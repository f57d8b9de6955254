// SPDX-License-Identifier: Apache-2.0
// Number texts to doubles, UTF-16 units to UTF-8.
#include "json/conversions.h"

#include <locale.h>
#include <stdlib.h>

#include <charconv>
#include <cstdint>
#include <system_error>

#include "platform/text/ascii.h"

namespace json {
namespace {

constexpr bool isHighSurrogate(char16_t unit) {
    return unit >= 0xD800 && unit <= 0xDBFF;
}
constexpr bool isLowSurrogate(char16_t unit) {
    return unit >= 0xDC00 && unit <= 0xDFFF;
}

void appendUtf8(char32_t c, std::string& text) {
    const auto continuation = [c](int shift) {
        return static_cast<char>(0x80 | ((c >> shift) & 0x3F));
    };
    if (c < 0x80)
        text += static_cast<char>(c);
    else if (c < 0x800)
        text += {static_cast<char>(0xC0 | (c >> 6)), continuation(0)};
    else if (c < 0x10000)
        text += {static_cast<char>(0xE0 | (c >> 12)), continuation(6), continuation(0)};
    else
        text += {static_cast<char>(0xF0 | (c >> 18)), continuation(12), continuation(6),
                 continuation(0)};
}

/// The C library distinguishes overflow from underflow, which std::from_chars does not.
double convertOutOfRange(std::string_view text) {
    static const locale_t cLocale = newlocale(LC_ALL_MASK, "C", nullptr);
    return strtod_l(std::string(text).c_str(), nullptr, cLocale);
}

/// Converts a number of few digits: an integer that a double holds exactly, multiplied or divided
/// by a power of ten that it holds exactly too, is rounded once, and so correctly. Returns whether
/// `text` is one.
bool convertShort(std::string_view text, double& value) {
    constexpr std::size_t maxDigits = 15;
    constexpr double powersOfTen[] = {1e0, 1e1, 1e2,  1e3,  1e4,  1e5,  1e6,  1e7,
                                      1e8, 1e9, 1e10, 1e11, 1e12, 1e13, 1e14, 1e15};
    const bool negative = text.starts_with('-');
    const std::string_view number = text.substr(negative ? 1 : 0);
    if (number.size() > maxDigits)
        return false;
    std::uint64_t digits = 0;
    std::size_t i = 0;
    const auto readDigits = [&] {
        const std::size_t start = i;
        for (; i < number.size() && platform::text::isdigit_ascii(number[i]); ++i)
            digits = digits * 10 + static_cast<std::uint64_t>(number[i] - '0');
        return i - start;
    };
    readDigits();
    std::size_t fraction = 0;
    if (i < number.size() && number[i] == '.') {
        ++i;
        fraction = readDigits();
    }
    if (i != number.size())
        return false;
    const double magnitude = static_cast<double>(digits) / powersOfTen[fraction];
    value = negative ? -magnitude : magnitude;
    return true;
}

}  // namespace

double string_to_double(std::string_view text) {
    const std::size_t sign = text.starts_with('-') ? 1 : 0;
    // std::from_chars would also take "inf" and "nan".
    if (text.size() == sign || !platform::text::isdigit_ascii(text[sign]))
        return 0;
    double value = 0;
    if (convertShort(text, value))
        return value;
    const auto result = std::from_chars(text.data(), text.data() + text.size(), value);
    return result.ec == std::errc::result_out_of_range ? convertOutOfRange(text) : value;
}

std::string u16_to_u8(std::u16string_view units) {
    std::string text;
    if (units.size() == 2 && isHighSurrogate(units[0]) && isLowSurrogate(units[1])) {
        appendUtf8(0x10000 + ((static_cast<char32_t>(units[0]) - 0xD800) << 10) +
                       (static_cast<char32_t>(units[1]) - 0xDC00),
                   text);
        return text;
    }
    constexpr char32_t replacement = 0xFFFD;
    for (const char16_t unit : units)
        appendUtf8(isHighSurrogate(unit) || isLowSurrogate(unit) ? replacement : unit, text);
    return text;
}

}  // namespace json
