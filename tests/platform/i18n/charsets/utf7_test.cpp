// SPDX-License-Identifier: Apache-2.0
// UTF-7 (RFC 2152).
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <random>
#include <string>
#include <string_view>

#include "tests/platform/i18n/conversions.h"
#include "tests/platform/i18n/detection/corpus.h"

namespace platform::i18n {
namespace {

std::u16string decode(std::string_view bytes, bool strict = true) {
    return i18n::decode("UTF-7", bytes, strict);
}

std::string encode(std::u16string_view text, bool strict = true) {
    return i18n::encode("UTF-7", text, strict);
}

TEST(Utf7, ReadsTheExamplesOfItsStandard) {
    EXPECT_EQ(decode("A+ImIDkQ."), u"A\u2262\u0391.");
    EXPECT_EQ(decode("Hi Mom -+Jjo--+ACE-"), u"Hi Mom -\u263A-!");
    EXPECT_EQ(decode("+ZeVnLIqe-"), u"\u65E5\u672C\u8A9E");
    EXPECT_EQ(decode("Item 3 is +AKM-1."), u"Item 3 is \u00A31.");
    EXPECT_EQ(decode("1 +- 1 +2D3eAA"), u"1 + 1 \U0001F600");
}

TEST(Utf7, WritesWhatTheCLibraryReads) {
    for (const char* language : {"de", "ru", "ja", "ko"}) {
        const std::string& utf8 = test::corpusText(language);
        const std::u16string text = test::iconvUtf16(utf8);
        EXPECT_EQ(test::iconvDecode("UTF-7", encode(text)), utf8) << language;
        EXPECT_EQ(decode(test::iconvEncode("UTF-7", utf8).value()), text) << language;
    }
}

TEST(Utf7, EndsRunsWhereTheyWouldGoOn) {
    EXPECT_EQ(encode(u"\u3042"), "+MEI-");
    EXPECT_EQ(encode(u"\u3042a \u3042 \u3042-"), "+MEI-a +MEI +MEI--");
    EXPECT_EQ(encode(u"1+1 ~\\"), "1+-1 +AH4AXA-");
}

TEST(Utf7, RefusesShiftsThatBeginNothing) {
    EXPECT_THAT([] { decode("a+"); }, failsWith("ends inside the character at byte 1"));
    EXPECT_THAT([] { decode("+"); }, failsWith("ends inside the character at byte 0"));
    EXPECT_THAT([] { decode("a+ b"); }, failsWith("malformed input at byte 1"));
    EXPECT_THAT([] { decode("+!"); }, failsWith("malformed input at byte 0"));
}

TEST(Utf7, RefusesHalvesOfPairs) {
    EXPECT_THAT([] { decode("a+2AA-"); }, failsWith("malformed input at byte 1"));
    EXPECT_THAT([] { decode("a+3gA-"); }, failsWith("malformed input at byte 1"));
    EXPECT_THAT([] { decode("+2AAAYQ-"); }, failsWith("malformed input at byte 0"));
    EXPECT_THAT([] { encode(u"ab\xD800"); }, failsWith("unpaired surrogate at code unit 2"));
}

TEST(Utf7, RefusesHalvesOfUnitsAndBitsThatAreNotZero) {
    for (const char* malformed : {"+A-", "+AG-", "+AGF-", "+AGEA-", "+AGEAY-", "+AGG-x"}) {
        EXPECT_THAT([&] { decode(malformed); }, failsWith("malformed input at byte 0"))
            << malformed;
    }
}

TEST(Utf7, RefusesBytesThatItHasNot) {
    for (const char* malformed : {"ab\x80", "ab~", "ab\\", "ab\x01", "ab\x7F"}) {
        EXPECT_THAT([&] { decode(malformed); }, failsWith("malformed input at byte 2"))
            << malformed;
    }
}

TEST(Utf7, SubstitutesWhenNotStrict) {
    EXPECT_EQ(decode("a+", false), u"a\uFFFD");
    EXPECT_EQ(decode("+2AA-z\xFF", false), u"\uFFFDz\uFFFD");
    EXPECT_EQ(encode(u"a\xD800z", false), "a+//0-z");
}

TEST(Utf7, GivesEveryTextBack) {
    std::mt19937 random(23);
    for (int i = 0; i < 5000; ++i) {
        std::u16string text;
        for (auto count = random() % 12; count > 0; --count) {
            const unsigned kind = random() % 4;
            if (kind == 0) {
                text += u"\U0001F600";
            } else {
                text += static_cast<char16_t>(kind == 1 ? random() % 0xD800 : random() % 0x80);
            }
        }
        ASSERT_EQ(decode(encode(text)), text);
    }
}

}  // namespace
}  // namespace platform::i18n
