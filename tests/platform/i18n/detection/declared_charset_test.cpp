// SPDX-License-Identifier: Apache-2.0
// What documents say about their charset.
#include "platform/i18n/detection/declared_charset.h"

#include <gtest/gtest.h>

namespace platform::i18n::detail {
namespace {

TEST(DeclaredCharset, IsFoundInEveryUsualForm) {
    EXPECT_EQ(declaredCharset("<meta charset=\"KOI8-R\">"), "koi8-r");
    EXPECT_EQ(declaredCharset("<META CHARSET='Big5'>"), "big5");
    EXPECT_EQ(
        declaredCharset("<meta http-equiv=\"Content-Type\" content=\"text/html; charset=euc-jp\">"),
        "euc-jp");
    EXPECT_EQ(declaredCharset("<?xml version=\"1.0\" encoding=\"ISO-8859-2\"?>"), "iso-8859-2");
    EXPECT_EQ(declaredCharset("<?xml version='1.0' encoding = 'windows-1251' ?>"), "windows-1251");
    EXPECT_EQ(declaredCharset("# -*- coding: latin-1 -*-\n"), "latin-1");
    EXPECT_EQ(declaredCharset("# vim: set fileencoding=cp1250 :\n"), "cp1250");
    EXPECT_EQ(declaredCharset("@charset \"Shift_JIS\";\nbody {}"), "shift_jis");
    EXPECT_EQ(declaredCharset("Content-Type: text/plain; charset=gb2312\n\n"), "gb2312");
}

TEST(DeclaredCharset, IsEmptyWhereNoneIsNamed) {
    for (const char* text : {"", "charset", "charset=", "charset = \"\"", "the encoding was wrong",
                             "<?xml version=\"1.0\"?>", "coding;latin-1"}) {
        EXPECT_EQ(declaredCharset(text), "") << text;
    }
    EXPECT_EQ(declaredCharset("charset=" + std::string(100, 'x')), "");
}

TEST(DeclaredCharset, PassesOverWordsThatNameNone) {
    EXPECT_EQ(declaredCharset("Encoding is hard. charset=utf-8"), "utf-8");
    EXPECT_EQ(declaredCharset("accept-charset <meta charset=utf-8>"), "utf-8");
}

TEST(DeclaredCharset, IsLookedForAtTheBeginningOnly) {
    EXPECT_EQ(declaredCharset(std::string(10000, ' ') + "<meta charset=koi8-r>"), "");
}

}  // namespace
}  // namespace platform::i18n::detail
