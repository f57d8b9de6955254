// Number texts to doubles, UTF-16 units to UTF-8.
#include "json/conversions.h"

#include <locale.h>
#include <stdlib.h>

#include <charconv>
#include <system_error>

#include "platform/i18n/ascii.h"

namespace json {
namespace {

constexpr bool isHighSurrogate(char16_t unit) {
    return unit >= 0xD800 && unit <= 0xDBFF;
}
constexpr bool isLowSurrogate(char16_t unit) {
    return unit >= 0xDC00 && unit <= 0xDFFF;
}

char32_t codePoint(std::u16string_view units) {
    if (units.size() == 1 && !isHighSurrogate(units[0]) && !isLowSurrogate(units[0]))
        return units[0];
    if (units.size() == 2 && isHighSurrogate(units[0]) && isLowSurrogate(units[1])) {
        return 0x10000 + ((static_cast<char32_t>(units[0]) - 0xD800) << 10) +
               (static_cast<char32_t>(units[1]) - 0xDC00);
    }
    return 0xFFFD;
}

/// The C library tells overflow from underflow, which std::from_chars does not.
double convertOutOfRange(std::string_view text) {
    static const locale_t cLocale = newlocale(LC_ALL_MASK, "C", nullptr);
    return strtod_l(std::string(text).c_str(), nullptr, cLocale);
}

}  // namespace

double string_to_double(std::string_view text) {
    const std::size_t sign = text.starts_with('-') ? 1 : 0;
    // std::from_chars would also take "inf" and "nan".
    if (text.size() == sign || !platform::i18n::isdigit_ascii(text[sign]))
        return 0;
    double value = 0;
    const auto result = std::from_chars(text.data(), text.data() + text.size(), value);
    return result.ec == std::errc::result_out_of_range ? convertOutOfRange(text) : value;
}

std::string u16_to_u8(std::u16string_view units) {
    const char32_t c = codePoint(units);
    const auto continuation = [c](int shift) {
        return static_cast<char>(0x80 | ((c >> shift) & 0x3F));
    };
    if (c < 0x80)
        return {static_cast<char>(c)};
    if (c < 0x800)
        return {static_cast<char>(0xC0 | (c >> 6)), continuation(0)};
    if (c < 0x10000)
        return {static_cast<char>(0xE0 | (c >> 12)), continuation(6), continuation(0)};
    return {static_cast<char>(0xF0 | (c >> 18)), continuation(12), continuation(6),
            continuation(0)};
}

}  // namespace json
