// SPDX-License-Identifier: Apache-2.0
// Questions about UTF-16 paths, on a real file system.
#include "platform/filesystem/filesystem.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <limits.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <stdexcept>

#include "platform/i18n/codecvt.h"
#include "tests/support/temporary_directory.h"

namespace platform::filesystem {
namespace {

using std::string_view_literals::operator""sv;
using ::testing::HasSubstr;
using ::testing::ThrowsMessage;

class Paths : public ::testing::Test {
protected:
    static void create(const std::filesystem::path& path) { std::ofstream(path) << "x"; }

    std::u16string inFolder(const std::string& name) const {
        return i18n::to_ustring((folder_ / name).string());
    }

    const test::TemporaryDirectory directory_;
    const std::filesystem::path folder_ = directory_.path();
};

// What `check` returns in a process that may not do everything, as root may.
int asNobody(int (*check)(const std::u16string&), const std::u16string& path) {
    const pid_t child = fork();
    if (child == 0) {
        constexpr uid_t nobody = 65534;
        if (geteuid() == 0 && (setgid(nobody) != 0 || setuid(nobody) != 0)) {
            _exit(100);
        }
        _exit(check(path));
    }
    int status = 0;
    waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

TEST_F(Paths, OfFilesAndFoldersExist) {
    create(folder_ / "file");
    EXPECT_TRUE(exists(inFolder("file")));
    EXPECT_TRUE(exists(inFolder("")));
    EXPECT_TRUE(exists(u"/"));
    EXPECT_TRUE(exists(u"/dev/null"));
}

TEST_F(Paths, OfNothingDoNotExist) {
    EXPECT_FALSE(exists(inFolder("missing")));
    EXPECT_FALSE(exists(inFolder("missing/file")));
    EXPECT_FALSE(exists(u""));
}

TEST_F(Paths, ThatGoOnBehindAFileDoNotExist) {
    create(folder_ / "file");
    EXPECT_FALSE(exists(inFolder("file/more")));
}

TEST_F(Paths, ThroughLinksAreFollowed) {
    create(folder_ / "file");
    std::filesystem::create_symlink("file", folder_ / "link");
    std::filesystem::create_symlink("nowhere", folder_ / "dangling");
    EXPECT_TRUE(exists(inFolder("link")));
    EXPECT_FALSE(exists(inFolder("dangling")));
}

TEST_F(Paths, WhoseLinksGoInCirclesAreErrors) {
    std::filesystem::create_symlink("circle", folder_ / "circle");
    EXPECT_THROW(exists(inFolder("circle")), std::filesystem::filesystem_error);
}

TEST_F(Paths, BeyondAsciiAreFound) {
    create(folder_ / "\xD1\x84\xD0\xB0\xD0\xB9\xD0\xBB \xF0\x9F\x98\x80");
    EXPECT_TRUE(
        exists(i18n::to_ustring(folder_.string()) + u"/\u0444\u0430\u0439\u043B \U0001F600"));
    EXPECT_FALSE(exists(i18n::to_ustring(folder_.string()) + u"/\u0444\u0430\u0439\u043B"));
}

TEST_F(Paths, TooLongAreErrors) {
    EXPECT_THROW(exists(inFolder(std::string(300, 'x'))), std::filesystem::filesystem_error);
    std::u16string longPath(10000, u'x');
    longPath.front() = u'/';
    EXPECT_THROW(exists(longPath), std::filesystem::filesystem_error);
}

TEST_F(Paths, TooLongAreNotRepeatedInTheError) {
    try {
        exists(std::u16string(1'000'000, u'/'));
        FAIL();
    } catch (const std::filesystem::filesystem_error& error) {
        EXPECT_EQ(error.code(), std::errc::filename_too_long);
        EXPECT_LT(std::string_view(error.what()).size(), 200U);
    }
}

// Of a path of 4095 characters, which the system takes, and of one that is longer.
TEST_F(Paths, AreTooLongFromTheLengthOnThatTheSystemRefuses) {
    const std::u16string root(PATH_MAX - 1, u'/');
    EXPECT_TRUE(exists(root));
    EXPECT_THROW(exists(root + u'/'), std::filesystem::filesystem_error);
}

TEST_F(Paths, InFoldersThatMayNotBeEnteredAreErrors) {
    std::filesystem::create_directory(folder_ / "closed");
    create(folder_ / "closed/file");
    std::filesystem::permissions(folder_, std::filesystem::perms::all);
    std::filesystem::permissions(folder_ / "closed", std::filesystem::perms::none);
    const int answer = asNobody(
        [](const std::u16string& path) {
            try {
                return exists(path) ? 1 : 2;
            } catch (const std::filesystem::filesystem_error&) {
                return 3;
            }
        },
        inFolder("closed/file"));
    std::filesystem::permissions(folder_ / "closed", std::filesystem::perms::all);
    EXPECT_EQ(answer, 3);
}

TEST_F(Paths, OfFilesThatMayNotBeReadExist) {
    create(folder_ / "secret");
    std::filesystem::permissions(folder_, std::filesystem::perms::all);
    std::filesystem::permissions(folder_ / "secret", std::filesystem::perms::none);
    const int answer = asNobody(
        [](const std::u16string& path) {
            const std::ifstream stream(make_native_access_form_with_cleanup(path));
            return exists(path) && !stream.is_open() ? 1 : 2;
        },
        inFolder("secret"));
    EXPECT_EQ(answer, 1);
}

TEST_F(Paths, WithAZeroOrHalfACharacterAreErrors) {
    EXPECT_THAT([] { exists(u"/tmp\0/x"sv); },
                ThrowsMessage<std::runtime_error>(HasSubstr("zero")));
    EXPECT_THROW(exists(u"/tmp/\xD800"), std::runtime_error);
    EXPECT_THROW(exists(u"\xDC00"), std::runtime_error);
}

TEST(NativeAccessForm, IsTheUtf8BytesOfThePath) {
    EXPECT_EQ(make_native_access_form_with_cleanup(u""), "");
    EXPECT_EQ(make_native_access_form_with_cleanup(u"/a b/../c"), "/a b/../c");
    EXPECT_EQ(make_native_access_form_with_cleanup(u"\u00E9\u0436\U0001F600"),
              "\xC3\xA9\xD0\xB6\xF0\x9F\x98\x80");
}

TEST(NativeAccessForm, RefusesAZeroAndHalfACharacter) {
    EXPECT_THAT([] { make_native_access_form_with_cleanup(u"ab\0c"sv); },
                ThrowsMessage<std::runtime_error>("Invalid path: it holds a zero at code unit 2"));
    EXPECT_THAT([] { make_native_access_form_with_cleanup(u"ab\xD800"); },
                ThrowsMessage<std::runtime_error>(HasSubstr("code unit 2")));
    EXPECT_THROW(make_native_access_form_with_cleanup(u"\0"sv), std::runtime_error);
}

TEST_F(Paths, InNativeFormOpenTheStandardStreams) {
    const std::u16string path = i18n::to_ustring(folder_.string()) + u"/\u65E5\u672C.txt";
    std::ofstream(make_native_access_form_with_cleanup(path)) << "content";
    std::string content;
    std::ifstream(make_native_access_form_with_cleanup(path)) >> content;
    EXPECT_EQ(content, "content");
}

}  // namespace
}  // namespace platform::filesystem
