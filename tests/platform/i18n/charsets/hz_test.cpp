// SPDX-License-Identifier: Apache-2.0
// HZ: what is valid comes back byte for byte, everything else is refused.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <random>
#include <stdexcept>
#include <string>
#include <string_view>

#include "tests/platform/i18n/conversions.h"
#include "tests/platform/i18n/detection/corpus.h"

namespace platform::i18n {
namespace {

std::u16string decode(std::string_view bytes, bool strict = true) {
    return i18n::decode("HZ-GB-2312", bytes, strict);
}

std::string encode(std::u16string_view text, bool strict = true) {
    return i18n::encode("HZ-GB-2312", text, strict);
}

TEST(Hz, ShiftsBetweenAsciiAndRows) {
    EXPECT_EQ(encode(u"abc"), "abc");
    EXPECT_EQ(encode(u"~ \u4F60\u597D~\n\u4F60"), "~~ ~{Dc:C~}~~\n~{Dc~}");
    EXPECT_EQ(decode("~~ ~{Dc:C~}~~\n~{Dc~}"), u"~ \u4F60\u597D~\n\u4F60");
}

TEST(Hz, HoldsTheCharactersOfGb2312) {
    std::size_t characters = 0;
    for (char row = 0x21; row < 0x7E; ++row) {
        for (char column = 0x21; column <= 0x7E; ++column) {
            const std::string euc{static_cast<char>(row | 0x80), static_cast<char>(column | 0x80)};
            const auto utf8 = test::iconvDecode("GB2312", euc);
            // The C library takes two signs for others than the web does.
            if (!utf8 || euc == "\xA1\xA4" || euc == "\xA1\xAA") {
                continue;
            }
            ++characters;
            const std::string bytes = std::string("~{") + row + column + "~}";
            ASSERT_EQ(decode(bytes), test::iconvUtf16(*utf8)) << bytes;
            ASSERT_EQ(encode(test::iconvUtf16(*utf8)), bytes);
        }
    }
    EXPECT_EQ(characters, 7445u - 2u);
}

TEST(Hz, RefusesWhatIsCutOff) {
    EXPECT_THAT([] { decode("abc~"); }, failsWith("ends inside the character at byte 3"));
    EXPECT_THAT([] { decode("~{::W"); }, failsWith("ends inside the character at byte 4"));
    EXPECT_THAT([] { decode("~{"); }, failsWith("ends inside the character at byte 2"));
    EXPECT_THAT([] { decode("~{::"); }, failsWith("ends inside the character at byte 4"));
}

TEST(Hz, RefusesWhatIsMalformed) {
    EXPECT_THAT([] { decode("~}"); }, failsWith("malformed input at byte 0"));
    EXPECT_THAT([] { decode("ab~x"); }, failsWith("malformed input at byte 2"));
    EXPECT_THAT([] { decode("ab\x80"); }, failsWith("malformed input at byte 2"));
    EXPECT_THAT([] { decode("~{::\xBA\xBA~}"); }, failsWith("malformed input at byte 4"));
    EXPECT_THAT([] { decode("~{::\n~}"); }, failsWith("malformed input at byte 4"));
    EXPECT_THAT([] { decode("~{!\x7F~}"); }, failsWith("malformed input at byte 2"));
    EXPECT_THAT([] { decode("~{*!~}"); }, failsWith("malformed input at byte 2"));  // empty place
}

TEST(Hz, RefusesShiftsAndContinuationsThatEncodingWouldLeaveOut) {
    EXPECT_THAT([] { decode("~{~}"); }, failsWith("malformed input at byte 2"));
    EXPECT_THAT([] { decode("~{::~}~{::~}"); }, failsWith("malformed input at byte 6"));
    EXPECT_THAT([] { decode("ab~\ncd"); }, failsWith("malformed input at byte 2"));
}

TEST(Hz, RefusesCharactersThatItLacks) {
    EXPECT_THAT([] { encode(u"a\u00E4"); }, failsWith("no character U+00E4, found at code unit 1"));
    EXPECT_THAT([] { encode(u"\U0001F600"); },
                failsWith("no character U+1F600, found at code unit 0"));
    EXPECT_THAT([] { encode(u"ab\xD800"); }, failsWith("unpaired surrogate at code unit 2"));
}

TEST(Hz, SubstitutesWhenNotStrict) {
    EXPECT_EQ(decode("a\xFF~{::\n::~}~\nz~", false), u"a\uFFFD\u6C49\n::\uFFFD}z\uFFFD");
    EXPECT_EQ(decode("~{::~}~{::", false), u"\u6C49\u6C49");
    EXPECT_EQ(encode(u"\u4F60\u00E4\U0001F600\u4F60", false), "~{Dc~}??~{Dc~}");
}

TEST(Hz, GivesEveryAcceptedTextBackByteForByte) {
    constexpr std::string_view pieces[] = {"~{", "~}", "~~",   "~\n", "~", "::",  "Dc:C",
                                           "W",  "\n", "abc ", "{",   "}", "\xBA"};
    std::mt19937 random(5);
    int accepted = 0;
    for (int i = 0; i < 20000; ++i) {
        std::string bytes;
        for (auto count = random() % 8; count > 0; --count) {
            bytes += pieces[random() % std::size(pieces)];
        }
        std::u16string text;
        try {
            text = decode(bytes);
        } catch (const std::runtime_error&) {
            continue;
        }
        ++accepted;
        ASSERT_EQ(encode(text), bytes);
    }
    EXPECT_GT(accepted, 1000);
}

}  // namespace
}  // namespace platform::i18n
