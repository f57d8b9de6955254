// SPDX-License-Identifier: Apache-2.0
// Number texts to doubles and UTF-16 units to UTF-8.
#include "json/conversions.h"

#include <gtest/gtest.h>

#include <bit>
#include <charconv>
#include <clocale>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <limits>
#include <random>

namespace json {
namespace {

TEST(StringToDouble, ReadsNumbersAsJsonWritesThem) {
    EXPECT_EQ(string_to_double("0"), 0.0);
    EXPECT_EQ(string_to_double("12"), 12.0);
    EXPECT_EQ(string_to_double("-3"), -3.0);
    EXPECT_EQ(string_to_double("0.1"), 0.1);
    EXPECT_EQ(string_to_double("1E+2"), 100.0);
    EXPECT_EQ(string_to_double("25e-1"), 2.5);
    EXPECT_EQ(string_to_double("9007199254740993"), 9007199254740992.0);
}

TEST(StringToDouble, ReadsShortNumbersAsTheCLibraryDoes) {
    std::mt19937 random(1);
    for (int i = 0; i < 200000; ++i) {
        std::string text = random() % 2 == 0 ? "-" : "";
        const std::size_t digits = 1 + random() % 18;
        const std::size_t point = random() % 20;
        for (std::size_t d = 0; d < digits; ++d) {
            if (d == point && d != 0)
                text += '.';
            text += static_cast<char>('0' + random() % 10);
        }
        ASSERT_EQ(std::bit_cast<std::uint64_t>(string_to_double(text)),
                  std::bit_cast<std::uint64_t>(std::strtod(text.c_str(), nullptr)))
            << text;
    }
}

TEST(StringToDouble, KeepsTheSignOfZero) {
    EXPECT_TRUE(std::signbit(string_to_double("-0")));
    EXPECT_TRUE(std::signbit(string_to_double("-0.0e5")));
    EXPECT_FALSE(std::signbit(string_to_double("0")));
}

TEST(StringToDouble, OverflowsToInfinity) {
    const double infinity = std::numeric_limits<double>::infinity();
    EXPECT_EQ(string_to_double("1e309"), infinity);
    EXPECT_EQ(string_to_double("-1e309"), -infinity);
    EXPECT_EQ(string_to_double("1e99999999999999999999"), infinity);
    EXPECT_EQ(string_to_double(std::string("1") + std::string(400, '0')), infinity);
    EXPECT_EQ(string_to_double("1.7976931348623157e308"), std::numeric_limits<double>::max());
    EXPECT_EQ(string_to_double("1.7976931348623159e308"), infinity);
}

TEST(StringToDouble, UnderflowsToDenormalsAndToZero) {
    const double denormal = std::numeric_limits<double>::denorm_min();
    EXPECT_EQ(string_to_double("4.9406564584124654e-324"), denormal);
    EXPECT_EQ(string_to_double("2.5e-324"), denormal);
    EXPECT_EQ(string_to_double("2.4e-324"), 0.0);
    EXPECT_EQ(string_to_double("1e-99999999999999999999"), 0.0);
    EXPECT_TRUE(std::signbit(string_to_double("-1e-400")));
    EXPECT_EQ(string_to_double(std::string("0.") + std::string(400, '0') + "1"), 0.0);
    EXPECT_EQ(string_to_double(std::string("0.") + std::string(400, '0') + "1e401"), 1.0);
}

TEST(StringToDouble, RoundsTextsOfAnyLengthCorrectly) {
    // Half-way between two doubles, and just above it far beyond the digits that a double holds.
    const std::string halfway = std::string("9007199254740993.") + std::string(2000, '0');
    EXPECT_EQ(string_to_double(halfway), 9007199254740992.0);
    EXPECT_EQ(string_to_double(halfway + "1"), 9007199254740994.0);
}

TEST(StringToDouble, AgreesWithTheCLibrary) {
    std::mt19937_64 engine(1);
    for (int i = 0; i < 20000; ++i) {
        std::string text = std::to_string(engine() % 1000000) + "." + std::to_string(engine());
        text += "e" + std::to_string(static_cast<int>(engine() % 700) - 350);
        ASSERT_EQ(string_to_double(text), std::strtod(text.c_str(), nullptr)) << text;
    }
}

TEST(StringToDouble, ReadsBackEveryDouble) {
    std::mt19937_64 engine(2);
    for (int i = 0; i < 20000; ++i) {
        const double number = std::bit_cast<double>(engine());
        if (!std::isfinite(number))
            continue;
        char text[32];
        const auto end = std::to_chars(text, text + sizeof text, number).ptr;
        ASSERT_EQ(string_to_double({text, end}), number);
    }
}

TEST(StringToDouble, TakesNoNoticeOfTheLocale) {
    // A locale of a package that may be missing; "1,5" would then not be tried.
    const std::string before = std::setlocale(LC_NUMERIC, nullptr);
    for (char const* name : {"de_DE.UTF-8", "fr_FR.UTF-8", "C"}) {
        if (std::setlocale(LC_NUMERIC, name) == nullptr)
            continue;
        EXPECT_EQ(string_to_double("1.5"), 1.5) << name;
        EXPECT_EQ(string_to_double("1.5e400"), std::numeric_limits<double>::infinity()) << name;
        EXPECT_EQ(string_to_double("1.5e-400"), 0.0) << name;
    }
    std::setlocale(LC_NUMERIC, before.c_str());
}

TEST(StringToDouble, OfATextThatBeginsWithNoNumberIsZero) {
    for (char const* text : {"", "-", "inf", "-inf", "nan", "+1", ".5", " 1", "x", "-x"})
        EXPECT_EQ(string_to_double(text), 0.0) << text;
}

TEST(U16ToU8, EncodesOneUnit) {
    EXPECT_EQ(u16_to_u8(std::u16string(1, u'\0')), std::string(1, '\0'));
    EXPECT_EQ(u16_to_u8(u"A"), "A");
    EXPECT_EQ(u16_to_u8(u"\x7F"), "\x7F");
    EXPECT_EQ(u16_to_u8(u"\x80"), "\xC2\x80");
    EXPECT_EQ(u16_to_u8(u"\x7FF"), "\xDF\xBF");
    EXPECT_EQ(u16_to_u8(u"\x800"), "\xE0\xA0\x80");
    EXPECT_EQ(u16_to_u8(u"\xD7FF"), "\xED\x9F\xBF");
    EXPECT_EQ(u16_to_u8(u"\xE000"), "\xEE\x80\x80");
    EXPECT_EQ(u16_to_u8(u"\xFFFF"), "\xEF\xBF\xBF");
}

TEST(U16ToU8, JoinsAPairToOneCharacter) {
    EXPECT_EQ(u16_to_u8(u"\xD83D\xDE00"), "\xF0\x9F\x98\x80");
    EXPECT_EQ(u16_to_u8(u"\xD800\xDC00"), "\xF0\x90\x80\x80");
    EXPECT_EQ(u16_to_u8(u"\xDBFF\xDFFF"), "\xF4\x8F\xBF\xBF");
}

TEST(U16ToU8, ReplacesASurrogateThatStandsAlone) {
    for (const char16_t unit : std::u16string{0xD800, 0xDBFF, 0xDC00, 0xDFFF})
        EXPECT_EQ(u16_to_u8(std::u16string(1, unit)), "\xEF\xBF\xBD");
}

TEST(U16ToU8, ConvertsEachOfTwoUnitsThatAreNoPair) {
    EXPECT_EQ(u16_to_u8(std::u16string{0xD83D, 0x1DE0}), "\xEF\xBF\xBD\xE1\xB7\xA0");
    EXPECT_EQ(u16_to_u8(std::u16string{0xD83D, u'a'}),
              "\xEF\xBF\xBD"
              "a");
    EXPECT_EQ(u16_to_u8(std::u16string{0xD83D, 0xD83D}), "\xEF\xBF\xBD\xEF\xBF\xBD");
    EXPECT_EQ(u16_to_u8(std::u16string{0xDE00, 0xD83D}), "\xEF\xBF\xBD\xEF\xBF\xBD");
    EXPECT_EQ(u16_to_u8(u"ab"), "ab");
}

}  // namespace
}  // namespace json
