// SPDX-License-Identifier: Apache-2.0
// What is odd about Shift_JIS, and the variants of charsets in which characters have two codes.
#include "platform/i18n/charsets/shift_jis.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <string_view>

#include "tests/platform/i18n/conversions.h"
#include "tests/platform/i18n/detection/corpus.h"

namespace platform::i18n {
namespace {

using std::string_view_literals::operator""sv;
using std::string_literals::operator""s;

TEST(ShiftJis, DecodesTheBytesThatItsTableExchangesToThemselves) {
    EXPECT_EQ(decode("Shift_JIS", "\x1A\x1C\x7F"), u"\x1A\x1C\x7F");
    EXPECT_EQ(encode("Shift_JIS", u"\x1A\x1C\x7F"), "\x1A\x1C\x7F");
}

TEST(ShiftJis, GetsItsEndOfFileMarksBackAndNoOtherCharsetDoes) {
    std::u16string text = u"a\x1C\u3042\x1C\x1A";
    restoreEndOfFileMarks(text, "shift_jis");
    EXPECT_EQ(text, u"a\x1C\u3042\x1C\x1A");
    restoreEndOfFileMarks(text, "Shift_JIS");
    EXPECT_EQ(text, u"a\x1A\u3042\x1A\x1A");
    std::string bytes = "a\x1C\x82\xA0\x1C\x1A";
    restoreEndOfFileMarks(bytes, "EUC-JP");
    EXPECT_EQ(bytes, "a\x1C\x82\xA0\x1C\x1A");
    restoreEndOfFileMarks(bytes, "Shift_JIS");
    EXPECT_EQ(bytes, "a\x1A\x82\xA0\x1A\x1A");
}

TEST(CodeVariants, AreEncodedByTheVariantThatPrefersThem) {
    EXPECT_EQ(encode("Shift_JIS", u"a\u2252\u9AD9\u2160"), "a\x81\xE0\xFB\xFC\x87\x54");
    EXPECT_EQ(encode("x-Shift_JIS-nec", u"a\u2252\u9AD9\u2160"), "a\x87\x90\xEE\xE0\x87\x54");
    EXPECT_EQ(encode("x-Shift_JIS-ibm", u"\u2252\u9AD9\u2160z"), "\x81\xE0\xFB\xFC\xFA\x4Az");
    EXPECT_EQ(encode("x-EUC-JP-nec", u"\u2252"), "\xAD\xF0");
    EXPECT_EQ(encode("x-Big5-eten", u"\u2550"), "\xA2\xA4");
    EXPECT_THROW(encode("x-Big5-eten", u"\u2550\u0E01"), std::runtime_error);
    for (const char* charset : {"Shift_JIS", "EUC-JP", "Big5"}) {
        const std::string variant = charset == "Big5"sv ? "x-Big5-eten" : "x-"s + charset + "-nec";
        const std::string bytes = test::iconvEncode(charset, "\xE3\x80\x81 \xE4\xB8\x80").value();
        EXPECT_EQ(decode(variant, bytes), decode(charset, bytes));
    }
}

}  // namespace
}  // namespace platform::i18n
