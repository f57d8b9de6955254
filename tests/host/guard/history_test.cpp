// SPDX-License-Identifier: Apache-2.0
// Earlier versions: which are kept, for how long, and who can have them back.
#include "host/guard/history.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <filesystem>
#include <iterator>
#include <list>
#include <stdexcept>
#include <string>
#include <vector>

#include "tests/support/temporary_directory.h"

namespace {

namespace fs = std::filesystem;

using host::EarlierVersion;
using host::History;
using platform::FileDescriptor;
using test::readFile;
using test::TemporaryDirectory;
using test::writeFile;

class HistoryTest : public testing::Test {
protected:
    FileDescriptor fileOf(const std::string& content) const {
        writeFile(scratch_ / "content", content);
        FileDescriptor file(::open((scratch_ / "content").c_str(), O_RDONLY));
        fs::remove(scratch_ / "content");
        return file;
    }

    static std::string pathOf(const FileDescriptor& file) {
        return "/proc/self/fd/" + std::to_string(file.get());
    }

    static std::string contentOf(const FileDescriptor& file) { return readFile(pathOf(file)); }

    std::string document(const std::string& name) const { return History::nameOf(root_ / name); }

    std::vector<fs::path> files() const {
        std::vector<fs::path> files;
        for (const auto& entry : fs::recursive_directory_iterator(scratch_ / "versions")) {
            if (entry.is_regular_file()) {
                files.push_back(entry.path());
            }
        }
        return files;
    }

    const TemporaryDirectory scratch_;
    const TemporaryDirectory root_;
};

TEST_F(HistoryTest, GivesTheVersionsNewestFirstEachWithATimeOfItsOwn) {
    History history({scratch_ / "versions", {root_.path()}});
    for (int i = 0; i < 10; ++i) {
        history.keep(fileOf("version " + std::to_string(i)), document("a.txt"));
    }
    const std::vector<EarlierVersion> versions = history.versionsOf(document("a.txt"));
    ASSERT_EQ(versions.size(), 10U);
    for (std::size_t i = 0; i < versions.size(); ++i) {
        EXPECT_TRUE(i == 0 || versions[i].time < versions[i - 1].time);
        EXPECT_EQ(versions[i].size, 9U);
        EXPECT_EQ(contentOf(history.open(document("a.txt"), versions[i].time)),
                  "version " + std::to_string(9 - i));
    }
    EXPECT_TRUE(history.versionsOf(document("b.txt")).empty());
    EXPECT_THROW(history.open(document("a.txt"), 1), std::runtime_error);
}

TEST_F(HistoryTest, KeepsSoManyVersionsOfADocumentAndNoMore) {
    History history({scratch_ / "versions", {root_.path()}, 3});
    for (int i = 0; i < 10; ++i) {
        history.keep(fileOf(std::to_string(i)), document("a.txt"));
        history.keep(fileOf("b"), document("b.txt"));
    }
    const std::vector<EarlierVersion> versions = history.versionsOf(document("a.txt"));
    ASSERT_EQ(versions.size(), 3U);
    EXPECT_EQ(contentOf(history.open(document("a.txt"), versions[2].time)), "7");
    EXPECT_EQ(files().size(), 6U);
}

TEST_F(HistoryTest, TakesNoMoreThanItsShareOfTheDiskAndRemovesTheOldestFirst) {
    if (::mount("tmpfs", root_.path().c_str(), "tmpfs", 0, "size=1000k,mode=700") != 0) {
        GTEST_SKIP() << "this user may not mount a file system";
    }
    {
        History history({scratch_ / "versions", {root_.path()}});
        for (int i = 0; i < 50; ++i) {
            history.keep(fileOf(std::string(10'000, 'x')), document(std::to_string(i)));
            history.waitUntilIdle();
            EXPECT_LE(files().size(), 10U);
        }
        EXPECT_EQ(history.versionsOf(document("49")).size(), 1U);
        EXPECT_TRUE(history.versionsOf(document("0")).empty());
    }
    ::umount2(root_.path().c_str(), MNT_DETACH);
}

TEST_F(HistoryTest, TakesNoMoreThanTheShareOfItsOwnDiskIfThatIsSmaller) {
    const fs::path folder = scratch_ / "versions";
    fs::create_directory(folder);
    if (::mount("tmpfs", folder.c_str(), "tmpfs", 0, "size=1000k,mode=700") != 0) {
        GTEST_SKIP() << "this user may not mount a file system";
    }
    {
        History history({folder, {root_.path()}});
        for (int i = 0; i < 50; ++i) {
            history.keep(fileOf(std::string(10'000, 'x')), document(std::to_string(i)));
        }
        EXPECT_EQ(history.versionsOf(document("49")).size(), 1U);
        EXPECT_LE(files().size(), 10U);
    }
    ::umount2(folder.c_str(), MNT_DETACH);
}

TEST_F(HistoryTest, SharesItsOwnDiskOutToAllRoots) {
    const fs::path folder = scratch_ / "versions";
    fs::create_directory(folder);
    if (::mount("tmpfs", folder.c_str(), "tmpfs", 0, "size=2000k,mode=700") != 0) {
        GTEST_SKIP() << "this user may not mount a file system";
    }
    {
        const test::TemporaryDirectory other;
        History history({folder, {root_.path(), other.path()}});
        for (int i = 0; i < 50; ++i) {
            const std::string name = std::to_string(i);
            history.keep(fileOf(std::string(10'000, 'x')), document(name));
            history.keep(fileOf(std::string(10'000, 'x')), (other / name).string());
        }
        EXPECT_EQ(history.versionsOf(document("49")).size(), 1U);
        EXPECT_EQ(history.versionsOf((other / "49").string()).size(), 1U);
        EXPECT_LE(files().size(), 20U);
    }
    ::umount2(folder.c_str(), MNT_DETACH);
}

TEST_F(HistoryTest, CountsTheRoomThatSmallVersionsTake) {
    if (::mount("tmpfs", root_.path().c_str(), "tmpfs", 0, "size=1000k,mode=700") != 0) {
        GTEST_SKIP() << "this user may not mount a file system";
    }
    {
        History history({scratch_ / "versions", {root_.path()}});
        for (int i = 0; i < 100; ++i) {
            history.keep(fileOf("x"), document(std::to_string(i)));
        }
        EXPECT_EQ(history.versionsOf(document("99")).size(), 1U);
        EXPECT_LE(files().size(), 1'000'000U / 10 / 4096);
    }
    ::umount2(root_.path().c_str(), MNT_DETACH);
}

TEST_F(HistoryTest, TakesNoMoreThanItsShareTogetherWithThatOfOtherProcesses) {
    if (::mount("tmpfs", root_.path().c_str(), "tmpfs", 0, "size=10000k,mode=700") != 0) {
        GTEST_SKIP() << "this user may not mount a file system";
    }
    {
        std::list<History> histories;
        for (int i = 0; i < 5; ++i) {
            histories.emplace_back(host::HistoryOptions{scratch_ / "versions", {root_.path()}});
        }
        for (int i = 0; i < 300; ++i) {
            History& history =
                i % 2 == 0 ? histories.front() : *std::next(histories.begin(), i % 5);
            history.keepNow(fileOf(std::string(10'000, 'x')), document(std::to_string(i)));
            EXPECT_LE(files().size(), 1'024'000U / 10'000);
        }
    }
    ::umount2(root_.path().c_str(), MNT_DETACH);
}

TEST_F(HistoryTest, LeavesOutWhatIsLargerThanTheShareAndRemovesNothingForIt) {
    if (::mount("tmpfs", root_.path().c_str(), "tmpfs", 0, "size=1000k,mode=700") != 0) {
        GTEST_SKIP() << "this user may not mount a file system";
    }
    {
        History history({scratch_ / "versions", {root_.path()}});
        history.keep(fileOf("old"), document("a.txt"));
        const FileDescriptor large = fileOf("");
        // No disk has room for a copy of it, though its holes take none.
        ASSERT_EQ(::truncate(pathOf(large).c_str(), std::int64_t{1} << 42U), 0);
        history.keepNow(large, document("b.txt"));
        EXPECT_TRUE(history.versionsOf(document("b.txt")).empty());
        EXPECT_EQ(history.versionsOf(document("a.txt")).size(), 1U);
    }
    ::umount2(root_.path().c_str(), MNT_DETACH);
}

// A tmpfs without a limit, and some file systems of networks, say that they have no blocks.
TEST_F(HistoryTest, KeepsVersionsOfDocumentsOnAFileSystemThatDoesNotTellItsSize) {
    if (::mount("tmpfs", root_.path().c_str(), "tmpfs", 0, "size=0,mode=700") != 0) {
        GTEST_SKIP() << "this user may not mount a file system";
    }
    {
        History history({scratch_ / "versions", {root_.path()}});
        history.keep(fileOf("old"), document("a.txt"));
        EXPECT_EQ(history.versionsOf(document("a.txt")).size(), 1U);
    }
    ::umount2(root_.path().c_str(), MNT_DETACH);
}

TEST_F(HistoryTest, LeavesTheVersionsOfOneRootWhateverIsKeptOfAnother) {
    const TemporaryDirectory other;
    if (::mount("tmpfs", root_.path().c_str(), "tmpfs", 0, "size=1000k,mode=700") != 0) {
        GTEST_SKIP() << "this user may not mount a file system";
    }
    {
        History history({scratch_ / "versions", {other.path(), root_.path()}});
        history.keep(fileOf("old"), History::nameOf(other / "a.txt"));
        for (int i = 0; i < 50; ++i) {
            history.keep(fileOf(std::string(10'000, 'x')), document(std::to_string(i)));
        }
        EXPECT_EQ(history.versionsOf(History::nameOf(other / "a.txt")).size(), 1U);
        EXPECT_TRUE(history.versionsOf(document("0")).empty());
    }
    ::umount2(root_.path().c_str(), MNT_DETACH);
}

TEST_F(HistoryTest, LeavesOutWhatIsTooOldOrWasNotCopiedWhole) {
    History history({scratch_ / "versions", {root_.path()}});
    history.keep(fileOf("whole"), document("a.txt"));
    history.waitUntilIdle();
    const fs::path file = files().at(0);
    const std::string name = file.filename();
    const std::string digest = name.substr(0, name.find('-'));
    writeFile(file.parent_path() / (digest + "-9999999999999-100"), "torn");
    writeFile(file.parent_path() / (digest + "-1000000000000-3"), "old");
    EXPECT_EQ(history.versionsOf(document("a.txt")).size(), 1U);
}

TEST_F(HistoryTest, HasNothingOfAnotherRoot) {
    const TemporaryDirectory other;
    {
        History history({scratch_ / "versions", {other.path()}});
        history.keep(fileOf("secret"), History::nameOf(other / "a.txt"));
    }
    History history({scratch_ / "versions", {root_.path()}});
    EXPECT_THROW(history.versionsOf(History::nameOf(other / "a.txt")), std::runtime_error);
    EXPECT_THROW(history.versionsOf(History::nameOf(root_.path().string() + "x/a.txt")),
                 std::runtime_error);
    history.keep(fileOf("x"), History::nameOf(other / "b.txt"));
    history.waitUntilIdle();
    EXPECT_EQ(files().size(), 1U);

    History all({scratch_ / "versions", {}});
    EXPECT_EQ(all.versionsOf(History::nameOf(other / "a.txt")).size(), 1U);
}

TEST_F(HistoryTest, FinishesItsCopiesBeforeItEnds) {
    {
        History history({scratch_ / "versions", {root_.path()}, 100});
        for (int i = 0; i < 50; ++i) {
            history.keep(fileOf("x"), document("a.txt"));
        }
    }
    EXPECT_EQ(files().size(), 50U);
}

TEST_F(HistoryTest, CannotBeMadeWhereThereCanBeNoFolder) {
    writeFile(scratch_ / "file", "");
    EXPECT_THROW(History({scratch_ / "file", {}}), std::runtime_error);
}

}  // namespace
