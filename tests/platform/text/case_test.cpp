// SPDX-License-Identifier: Apache-2.0
#include "platform/text/case.h"

#include <gtest/gtest.h>

namespace platform::text {
namespace {

TEST(ToLowerAscii, ChangesTheLettersFromAToZAndNoOtherByte) {
    for (int value = 0; value < 256; ++value) {
        const char c = static_cast<char>(value);
        const char expected = value >= 'A' && value <= 'Z' ? static_cast<char>(value + 32) : c;
        EXPECT_EQ(toLowerAscii(c), expected) << value;
    }
    EXPECT_EQ(toLowerAscii("[AZ@\xC3\x84z{]"), "[az@\xC3\x84z{]");
}

TEST(EqualIgnoringCase, ComparesWholeTexts) {
    EXPECT_TRUE(equalIgnoringCase("", ""));
    EXPECT_TRUE(equalIgnoringCase("Content-LENGTH", "content-length"));
    EXPECT_FALSE(equalIgnoringCase("abc", "ab"));
    EXPECT_FALSE(equalIgnoringCase("ab", "abc"));
    EXPECT_FALSE(equalIgnoringCase("[", "{")) << "no letters";
}

}  // namespace
}  // namespace platform::text
