// SPDX-License-Identifier: Apache-2.0
#include "host/guard/file_content.h"

#include <fcntl.h>
#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <random>
#include <string>
#include <string_view>

#include "json/serialize.h"
#include "json/value.h"
#include "platform/posix/file_descriptor.h"
#include "tests/support/temporary_directory.h"

namespace {

using host::hasContentOf;
using platform::FileDescriptor;

class FileContent : public testing::Test {
protected:
    int holding(const std::string& content) {
        test::writeFile(folder_ / "file", content);
        file_ = FileDescriptor(::open((folder_ / "file").c_str(), O_RDONLY));
        return file_.get();
    }

    const test::TemporaryDirectory folder_;
    FileDescriptor file_;
};

TEST_F(FileContent, IsWhatALiteralStandsForAndNothingElse) {
    EXPECT_TRUE(hasContentOf(holding(""), R"("")"));
    EXPECT_TRUE(hasContentOf(holding("a\"\\/\b\f\n\r\tb"), R"("a\"\\\/\b\f\n\r\tb")"));
    EXPECT_TRUE(hasContentOf(holding("é😀 \xFF"), "\"\\u00E9\\uD83D\\uDE00 \xFF\""));
    EXPECT_FALSE(hasContentOf(holding("ab"), R"("a")"));
    EXPECT_FALSE(hasContentOf(holding("a"), R"("ab")"));
    EXPECT_FALSE(hasContentOf(holding("a"), R"("b")"));
    EXPECT_FALSE(hasContentOf(holding(""), R"("a")"));
    EXPECT_FALSE(hasContentOf(-1, R"("a")"));
}

TEST_F(FileContent, IsNotWhatAMalformedLiteralBeginsWith) {
    for (const char* literal : {R"("a\x")", R"("a\")", R"("a\u12")", R"("a\uD83Dx")", "\"", ""}) {
        EXPECT_FALSE(hasContentOf(holding("a"), literal)) << literal;
    }
}

TEST_F(FileContent, IsComparedOverManyBlocks) {
    std::mt19937 random(1);
    constexpr std::array<std::string_view, 6> pieces = {"plain text", "\n",       "\\\\\\",
                                                        "\"",         "\x01\x02", "é"};
    for (const std::size_t size : {std::size_t{262'143}, std::size_t{1'000'000}}) {
        std::string text;
        while (text.size() < size) {
            text += pieces.at(random() % pieces.size());
        }
        const std::string literal = json::serialize(json::Value(text));
        EXPECT_TRUE(hasContentOf(holding(text), literal));
        for (int i = 0; i < 5; ++i) {
            std::string other = text;
            other[random() % other.size()] ^= 1;
            EXPECT_FALSE(hasContentOf(holding(other), literal));
        }
        EXPECT_FALSE(hasContentOf(holding(text.substr(1)), literal));
    }
}

}  // namespace
