// SPDX-License-Identifier: Apache-2.0
// Documents at the longest paths that the system takes, and beyond.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <limits.h>

#include <cstddef>
#include <filesystem>
#include <string>
#include <utility>

#include "json/parser.h"
#include "json/serialize.h"
#include "platform/i18n/codecvt.h"
#include "serialization/serialization.h"
#include "tests/support/temporary_directory.h"

namespace EditorServices {
namespace {

using platform::i18n::to_ustring;
using testing::HasSubstr;

constexpr std::size_t longestPath = PATH_MAX - 1;  // and a zero after it

class PathLimits : public testing::Test {
protected:
    /// A path of `length` bytes to a file in a folder that is there, below the test's own.
    std::u16string pathOf(std::size_t length) const {
        constexpr std::size_t longestName = 255;
        std::string path = folder.path().string();
        while (path.size() + 1 + longestName < length) {
            path += '/' + std::string(200, 'd');
        }
        std::filesystem::create_directories(path);
        path += '/';
        path.resize(length, 'f');
        return to_ustring(path);
    }

    static std::string textOf(json::Object object) {
        return json::serialize(json::Value(std::move(object)));
    }

    static json::Object emptyPackage() { return json::parse(R"({"parts":[],"relationships":[]})"); }

    test::TemporaryDirectory folder;
    Serialization service;
};

TEST_F(PathLimits, TextsAtTheLongestPathAreWrittenAndRead) {
    const std::u16string path = pathOf(longestPath);
    ASSERT_EQ(path.size(), longestPath);
    EXPECT_TRUE(service.writeTextDocument(path, "text", "UTF-8"));
    EXPECT_EQ(textOf(service.readTextDocument(path)), R"({"data":"text","status":true})");
}

TEST_F(PathLimits, PackagesAtTheLongestPathAreWrittenAndRead) {
    const std::u16string path = pathOf(longestPath);
    for (int i = 0; i < 2; ++i) {  // a new one, and one that is replaced
        EXPECT_TRUE(service.writePackageDocument(path, emptyPackage()));
        EXPECT_EQ(textOf(service.readPackageDocument(path)),
                  R"({"parts":[],"relationships":[],"status":true})");
    }
}

TEST_F(PathLimits, NothingIsAtALongerPath) {
    for (const std::size_t length : {longestPath + 1, std::size_t{1'000'000}}) {
        std::u16string path = pathOf(longestPath);
        path.resize(length, u'f');
        EXPECT_FALSE(service.writeTextDocument(path, "text", "UTF-8"));
        EXPECT_FALSE(service.writePackageDocument(path, emptyPackage()));
        EXPECT_THAT(textOf(service.readTextDocument(path)), HasSubstr("File name too long"));
        EXPECT_THAT(textOf(service.readPackageDocument(path)), HasSubstr("File name too long"));
    }
}

}  // namespace
}  // namespace EditorServices
