// SPDX-License-Identifier: Apache-2.0
// What strict conversion refuses and the converters of ICU's would let through.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <string_view>

#include "tests/platform/i18n/conversions.h"

namespace platform::i18n {
namespace {

using std::string_view_literals::operator""sv;

constexpr const char16_t* invisible[] = {u"\u200B", u"\uFEFF", u"\u200E",
                                         u"\uFE0F", u"\u2060", u"\U000E0001"};

TEST(StrictEncoding, RefusesInvisibleCharactersThatTheCharsetLacks) {
    for (const char* charset : {"ISO-8859-1", "windows-1252", "KOI8-R", "Shift_JIS", "EUC-KR",
                                "Big5", "EUC-JP", "ISO-2022-JP", "IBM037", "US-ASCII", "GBK"}) {
        for (const char16_t* character : invisible) {
            EXPECT_THAT([&] { encode(charset, std::u16string(u"ab") + character + u"c"); },
                        failsWith("found at code unit 2"))
                << charset;
        }
    }
}

TEST(StrictEncoding, KeepsInvisibleCharactersThatTheCharsetHas) {
    EXPECT_EQ(encode("windows-1255", u"\u200E"), "\xFD");
    EXPECT_EQ(decode("GB18030", encode("GB18030", u"\u200B\uFEFF")), u"\u200B\uFEFF");
}

TEST(LenientEncoding, SubstitutesInvisibleCharactersToo) {
    EXPECT_EQ(encode("windows-1252", u"a\u200Bz", false), "a?z");
    EXPECT_EQ(encode("Shift_JIS", u"a\uFEFF\U000E0001z", false), "a??z");
}

TEST(StrictEncoding, CountsAPairAcrossInternalPiecesFromItsFirstHalf) {
    const std::u16string text = std::u16string(0xFFFF, u'x') + u"\U0001F600";
    EXPECT_THAT([&] { encode("KOI8-R", text); },
                failsWith("no character U+1F600, found at code unit 65535"));
}

TEST(StrictDecoding, RefusesCharactersThatTheCharsetDoesNotEncode) {
    EXPECT_THAT([] { decode("EUC-JP", "\xA4\xA2\x8E\xE0"); },
                failsWith("malformed input at byte 2"));
    EXPECT_EQ(decode("EUC-JP", "\xA4\xA2\x8E\xE0", false), u"\u3042\u00A2");
    EXPECT_THAT([] { decode("EUC-JP", "\x8F\xA2\xC3"); }, failsWith("malformed input at byte 0"));
    EXPECT_THAT([] { decode("ibm-1250", "ab\x80"); }, failsWith("malformed input at byte 2"));
    EXPECT_THAT([] { decode("ISO-2022-JP", "ab\x1B(IE"); }, failsWith("malformed input at byte 2"));
}

TEST(StrictDecoding, RefusesHalvesOfPairs) {
    EXPECT_THAT([] { decode("SCSU", "ab\x0E\xD8\0z"sv); }, failsWith("malformed input at byte 2"));
    EXPECT_EQ(decode("SCSU", "\x0E\xD8\x3D\x0E\xDE\0"sv), u"\U0001F600");
}

TEST(StrictDecoding, RefusesShiftsAloneOfWhichNothingWouldBeLeft) {
    for (const char* charset : {"SCSU", "ISO-2022-CN", "ISO-2022-KR", "ibm-930"}) {
        EXPECT_THROW(decode(charset, "\x0F"), std::runtime_error) << charset;
    }
}

TEST(StrictDecoding, RefusesSpellingsThatAreNotCanonical) {
    EXPECT_THAT([] { decode("BOCU-1", "\x50"); }, failsWith("malformed input at byte 0"));
    EXPECT_THAT([] { decode("GSM0338", "a\x1B"); }, failsWith("malformed input at byte 1"));
    EXPECT_EQ(decode("BOCU-1", encode("BOCU-1", u"\u3042 \u0416")), u"\u3042 \u0416");
    EXPECT_EQ(decode("GSM0338", "\x1B\x65"), u"\u20AC");
}

TEST(Encoding, OfEmptyTextIsEmptyInEveryCharset) {
    EXPECT_EQ(encode("ISO-2022-KR", u""), "");
    EXPECT_EQ(decode("ISO-2022-KR", ""), u"");
}

}  // namespace
}  // namespace platform::i18n
