// SPDX-License-Identifier: Apache-2.0
// What the names of charsets mean.
#include <gtest/gtest.h>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {
namespace {

TEST(CharsetTable, KnowsNamesOfTheSameCharset) {
    EXPECT_TRUE(isSameCharset("utf8", "UTF-8"));
    EXPECT_TRUE(isSameCharset("latin1", "ISO-8859-1"));
    EXPECT_TRUE(isSameCharset("EUC-KR", "cp949"));
    EXPECT_TRUE(isSameCharset("KS_C_5601-1987", "windows-949"));
    EXPECT_TRUE(isSameCharset("GB2312", "GBK"));
    EXPECT_TRUE(isSameCharset("latin10", "iso-8859-16"));
    EXPECT_TRUE(isSameCharset("cp1361", "Johab"));
    EXPECT_TRUE(isSameCharset("HZ", "hz-gb-2312"));
}

TEST(CharsetTable, TellsDifferentCharsetsAndUnknownOnesApart) {
    EXPECT_FALSE(isSameCharset("ISO-8859-1", "windows-1252"));
    EXPECT_FALSE(isSameCharset("UTF-16LE", "UTF-16BE"));
    EXPECT_FALSE(isSameCharset("x-Shift_JIS-nec", "Shift_JIS"));
    EXPECT_FALSE(isSameCharset("no such charset", "no such charset"));
    EXPECT_FALSE(isSameCharset("", "UTF-8"));
}

}  // namespace
}  // namespace platform::i18n::detail
