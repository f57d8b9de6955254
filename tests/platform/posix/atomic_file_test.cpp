// SPDX-License-Identifier: Apache-2.0
// Replacing a file whole, whatever happens to its folder meanwhile.
#include "platform/posix/atomic_file.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/xattr.h>

#include <array>
#include <exception>
#include <filesystem>
#include <string>

#include "tests/support/system_call_supervisor.h"
#include "tests/support/temporary_directory.h"

namespace {

namespace fs = std::filesystem;
using platform::AtomicFile;
using test::readFile;
using test::writeFile;

constexpr const char* attributeName = "user.origin";

bool setOrigin(const fs::path& path, const std::string& value) {
    return ::setxattr(path.c_str(), attributeName, value.data(), value.size(), 0) == 0;
}

std::string originOf(const fs::path& path) {
    std::array<char, 64> value{};
    const ssize_t size = ::getxattr(path.c_str(), attributeName, value.data(), value.size());
    return size < 0 ? "none" : std::string(value.data(), static_cast<std::size_t>(size));
}

TEST(AtomicFile, TakesOverNothingOfAFileWhoseFolderIsPutInThePlaceOfTheTargets) {
    if (!test::canSupervise()) {
        GTEST_SKIP() << "this system does not let system calls be supervised";
    }
    bool isMade = true;
    int swaps = 0;
    for (int moment = 0; isMade; ++moment) {
        const test::TemporaryDirectory root;
        for (const char* name : {"inside", "outside"}) {
            fs::create_directory(root / name);
            writeFile(root / name / "a.txt", "old");
            if (!setOrigin(root / name / "a.txt", name)) {
                GTEST_SKIP() << "this file system has no extended attributes";
            }
        }
        isMade = false;
        test::supervise(
            [&] {
                try {
                    AtomicFile file(root / "inside" / "a.txt");
                    file.write("new");
                    file.commit();
                } catch (const std::exception&) {  // as when the folder is gone for a moment
                }
            },
            [&](int, int index) {
                if (index == moment) {
                    isMade = true;
                    ++swaps;
                    fs::rename(root / "inside", root / "moved");
                    fs::create_directory_symlink("outside", root / "inside");
                }
                return 0;
            });
        EXPECT_EQ(originOf(root / (isMade ? "moved" : "inside") / "a.txt"), "inside") << moment;
        EXPECT_EQ(originOf(root / "outside" / "a.txt"), "outside") << moment;
    }
    EXPECT_GT(swaps, 10);
}

TEST(AtomicFile, ReplacesAFileThatMayBeWrittenButNotRead) {
    const test::TemporaryDirectory root;
    writeFile(root / "a.txt", "old");
    ASSERT_EQ(::chmod((root / "a.txt").c_str(), 0222), 0);
    AtomicFile file(root / "a.txt");
    file.write("new");
    file.commit();
    struct stat status {};
    ASSERT_EQ(::stat((root / "a.txt").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0222U);
    EXPECT_EQ(status.st_size, 3);
}

}  // namespace
