// SPDX-License-Identifier: Apache-2.0
#include "platform/text/quoted.h"

#include <gtest/gtest.h>

#include <string>
#include <string_view>

namespace platform::text {
namespace {

TEST(Quoted, PutsQuestionMarksForControlCharacters) {
    using namespace std::string_view_literals;
    EXPECT_EQ(quoted("a\0b\x1F\xC3\xA9"sv), "\"a?b?\xC3\xA9\"");
}

TEST(Printable, EscapesWhatIsNotPrintableAscii) {
    EXPECT_EQ(printable("a\n\x1B\xC3\xA9 \"z\x7F~"), "a\\x0A\\x1B\\xC3\\xA9 \"z\\x7F~");
}

TEST(Printable, CutsALongText) {
    EXPECT_EQ(printable(std::string(200, 'x')), std::string(200, 'x'));
    EXPECT_EQ(printable(std::string(201, 'x')), std::string(200, 'x') + "...");
    EXPECT_EQ(printable("\nbc", 2), "\\x0Ab...");
}

}  // namespace
}  // namespace platform::text
