// SPDX-License-Identifier: Apache-2.0
#include "host/commands/package_text.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

namespace host {
namespace {

using ::testing::HasSubstr;
using ::testing::IsEmpty;

const std::string package = R"({"parts":[{"a":1}],"relationships":[],"status":true})";

TEST(FindPackage, FindsThePackageWithoutTheSpaceAroundIt) {
    for (const std::string& text : {package, " \r\n\t" + package, package + "\n \n"}) {
        const PackageText found = findPackage(text);
        EXPECT_THAT(found.fault, IsEmpty());
        EXPECT_EQ(found.json, package);
    }
}

TEST(FindPackage, TellsWhatIsWrong) {
    const auto fault = [](const std::string& text) { return findPackage(text).fault; };
    EXPECT_THAT(fault(""), HasSubstr("empty"));
    EXPECT_THAT(fault(" \n"), HasSubstr("empty"));
    EXPECT_THAT(fault("text"), HasSubstr("no JSON object"));
    EXPECT_THAT(fault("[]"), HasSubstr("no JSON object"));
    EXPECT_THAT(fault(package + "x"), HasSubstr("more follows"));
    EXPECT_THAT(fault(package + package), HasSubstr("more follows"));
    EXPECT_THAT(fault(R"({"parts":[]})"), HasSubstr("relationships"));
    EXPECT_THAT(fault(R"({"parts":{},"relationships":[]})"), HasSubstr("parts"));
    EXPECT_THAT(fault(R"({"exception":"not a zip archive","status":false})"),
                HasSubstr("not a zip archive"));
}

TEST(FindPackage, RefusesPartsThatWritingWouldChange) {
    const auto refusal = [](const std::string& content) {
        return findPackage(
                   R"({"parts":[{"partUri":"/a.xml","contentType":"application/xml","content":")" +
                   content + R"("}],"relationships":[],"status":true})")
            .refusal;
    };
    for (const std::string text : {"", "a\\t\\r\\nz", "~\u00A0\u00C2\u00E2\u00EF",
                                   "\u200A\u200C\uFFFD", "\U0001F3FE\U0010FFFF"}) {
        EXPECT_THAT(refusal(text), IsEmpty()) << text;
        EXPECT_THAT(refusal("a" + text + "z"), IsEmpty()) << text;
    }
    for (const std::string text : {"\\u0000", "\\u001F", "\x7F", "\u0080", "\u009F", "\u200B",
                                   "\uFFFE", "\uFFFF", "\xFF", "\xC2"}) {
        EXPECT_THAT(refusal(text), HasSubstr("/a.xml")) << text;
        EXPECT_THAT(refusal("a" + text + "z"), HasSubstr("/a.xml")) << text;
    }
}

TEST(FindPackage, FindsNoneInThePartOfOne) {
    for (std::size_t length = 0; length < package.size(); ++length) {
        EXPECT_FALSE(findPackage(package.substr(0, length)).fault.empty()) << length;
    }
}

}  // namespace
}  // namespace host
