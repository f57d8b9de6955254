// SPDX-License-Identifier: Apache-2.0
// Documents that others change, move and delete while they are read.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <malloc.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <iterator>
#include <optional>
#include <stdexcept>
#include <string>
#include <system_error>
#include <thread>

#include "json/parser.h"
#include "json/serialize.h"
#include "platform/i18n/codecvt.h"
#include "serialization/serialization.h"
#include "tests/support/lease_holder.h"
#include "tests/support/system_call_supervisor.h"
#include "tests/support/temporary_directory.h"

namespace EditorServices {
namespace {

using platform::i18n::to_ustring;

constexpr int readsPerTest = 300;

class ChangingFiles : public testing::Test {
protected:
    /// Calls `read` again and again while another thread calls `change`.
    void readDuring(const std::function<void()>& change, const std::function<void()>& read) {
        std::atomic<bool> isDone = false;
        std::thread changing([&] {
            while (!isDone) {
                change();
            }
        });
        for (int i = 0; i < readsPerTest && !HasFailure(); ++i) {
            read();
        }
        isDone = true;
        changing.join();
    }

    Serialization service;
    test::TemporaryDirectory folder;
    const std::filesystem::path path = folder / "document";
};

TEST_F(ChangingFiles, OfTextGiveWhatWasThereAtSomeTime) {
    test::writeFile(path, "x");
    const int file = ::open(path.c_str(), O_WRONLY | O_APPEND | O_CLOEXEC);
    ASSERT_GE(file, 0);
    const std::string more(3000, 'x');
    std::size_t size = 1;
    readDuring(
        [&] {
            if (size < 200'000) {
                size += static_cast<std::size_t>(
                    std::max<ssize_t>(0, ::write(file, more.data(), more.size())));
            } else {
                ASSERT_EQ(::ftruncate(file, 1), 0);
                size = 1;
            }
        },
        [&] {
            const json::Object answer = service.readTextDocument(to_ustring(path.string()));
            ASSERT_EQ(answer.at("status"), json::Value(true));
            EXPECT_EQ(answer.at("data").get<std::string>().find_first_not_of('x'),
                      std::string::npos);
        });
    ::close(file);
}

TEST_F(ChangingFiles, OfTextThatComeAndGoAreThereOrMissing) {
    const std::filesystem::path elsewhere = folder / "elsewhere";
    test::writeFile(path, "text");
    readDuring(
        [&] {
            std::filesystem::rename(path, elsewhere);
            std::filesystem::rename(elsewhere, path);
        },
        [&] {
            const std::string answer =
                json::serialize(json::Value(service.readTextDocument(to_ustring(path.string()))));
            // Gone between being found and being opened, a file reads as empty.
            EXPECT_TRUE(answer == R"({"data":"text","status":true})" ||
                        answer == R"({"data":"","status":true})" ||
                        answer == R"({"exception":"File does not exist","status":false})")
                << answer;
        });
}

TEST_F(ChangingFiles, OfPackagesGiveThePackageOrTheReason) {
    const std::u16string name = to_ustring(path.string());
    const std::string text(200'000, 'x');
    ASSERT_TRUE(service.writePackageDocument(
        name, json::parse(R"({"parts":[{"partUri":"/a.txt","contentType":"text/plain",)"
                          R"("relationship":null,"content":")" +
                          text + R"("}],"relationships":[]})")));
    const std::string archive = test::readFile(path);
    const json::Object whole = service.readPackageDocument(name);
    ASSERT_EQ(whole.at("status"), json::Value(true));
    std::size_t cut = 0;
    readDuring(
        [&] {
            cut = (cut + 37) % archive.size();
            std::error_code ignored;
            std::filesystem::resize_file(path, cut, ignored);
            test::writeFile(path, archive);
        },
        [&] {
            const json::Object answer = service.readPackageDocument(name);
            if (answer != whole) {
                EXPECT_EQ(answer.at("status"), json::Value(false));
                EXPECT_FALSE(answer.at("exception").get<std::string>().empty());
            }
        });
}

// Documents that change at one system call of the request, and so always at the worst time.
class FilesThatChange : public ChangingFiles {
protected:
    void SetUp() override {
        // The heap of a thread of its own would now and then read a file of the system's.
        ::mallopt(M_ARENA_MAX, 1);
        if (!test::canSupervise()) {
            GTEST_SKIP() << "this system does not let system calls be supervised";
        }
    }

    /// Does `work`, and `change` just before the first call of `systemCall` within it.
    static void changeBefore(int systemCall, const std::function<void()>& change,
                             const std::function<void()>& work) {
        bool isChanged = false;
        test::supervise(work, [&](int call, int) {
            if (call == systemCall && !isChanged) {
                isChanged = true;
                change();
            }
            return 0;
        });
        EXPECT_TRUE(isChanged);
    }

    /// What is read of the file, after `change` at its first read.
    std::string readWhenChanged(const std::function<void()>& change) {
        std::string answer;
        changeBefore(SYS_read, change, [&] {
            answer = json::serialize(json::Value(service.readTextDocument(name)));
        });
        return answer;
    }

    /// Whether a package can be saved, after `change` at the first sync of it.
    bool savesWhenChanged(const std::function<void()>& change) {
        bool isSaved = true;
        changeBefore(SYS_fsync, change, [&] {
            isSaved = service.writePackageDocument(
                name, json::parse(R"({"parts":[],"relationships":[]})"));
        });
        return isSaved;
    }

    void makeFolder() const {
        std::filesystem::remove(path);
        std::filesystem::create_directory(path);
    }

    /// Puts a pipe, which nobody else opens, where the file was.
    void makePipe() const {
        std::filesystem::remove(path);
        ASSERT_EQ(::mkfifo(path.c_str(), 0600), 0);
    }

    static std::string successOf(const std::string& text) {
        return R"({"data":")" + text + R"(","status":true})";
    }

    const std::u16string name = to_ustring(path.string());
};

TEST_F(FilesThatChange, AreReadToTheEndThatTheyHaveGotWhenTheyGrow) {
    test::writeFile(path, "x");
    const std::string longer(1'000'000, 'x');
    EXPECT_EQ(readWhenChanged([&] { test::writeFile(path, longer); }), successOf(longer));
}

TEST_F(FilesThatChange, AreReadToTheEndThatTheyHaveGotWhenTheyShrink) {
    test::writeFile(path, std::string(1'000'000, 'x'));
    EXPECT_EQ(readWhenChanged([&] { std::filesystem::resize_file(path, 5); }), successOf("xxxxx"));
}

TEST_F(FilesThatChange, AreReadWholeWhenTheyAreDeleted) {
    test::writeFile(path, "text");
    EXPECT_EQ(readWhenChanged([&] { std::filesystem::remove(path); }), successOf("text"));
}

TEST_F(FilesThatChange, AreRefusedOnceTheyHaveGrownBeyondWhatATextMayHave) {
    if (UNDER_SANITIZERS) {
        GTEST_SKIP() << "with the sanitizers' own, this takes too much memory";
    }
    constexpr std::uintmax_t largest = std::uintmax_t{1} << 30;
    test::writeFile(path, "");
    std::filesystem::resize_file(path, largest);
    std::string error;
    changeBefore(
        SYS_read, [&] { std::filesystem::resize_file(path, largest + 1); },
        [&] {
            try {
                service.readFileBytes(name);
            } catch (const std::runtime_error& tooLarge) {
                error = tooLarge.what();
            }
        });
    EXPECT_EQ(error, "The text is too large: 1073741825 bytes, at most 1073741824 are accepted");
}

TEST_F(FilesThatChange, AreNotWaitedForWhenTheyBecomePipes) {
    test::writeFile(path, "text");
    std::string answer;
    changeBefore(
        SYS_openat, [&] { makePipe(); },
        [&] { answer = json::serialize(json::Value(service.readTextDocument(name))); });
    EXPECT_EQ(answer, successOf(""));
}

TEST_F(FilesThatChange, AreNotWrittenWhenTheyBecomePipes) {
    test::writeFile(path, "old");
    bool isWritten = true;
    changeBefore(
        SYS_openat, [&] { makePipe(); },
        [&] { isWritten = service.writeTextDocument(name, "text", "UTF-8"); });
    EXPECT_FALSE(isWritten);
}

TEST_F(FilesThatChange, AreNotWrittenWhenTheyBecomePipesThatAreRead) {
    test::writeFile(path, "old");
    int reader = -1;
    bool isWritten = true;
    changeBefore(
        SYS_openat,
        [&] {
            makePipe();
            reader = ::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
        },
        [&] { isWritten = service.writeTextDocument(name, "text", "UTF-8"); });
    EXPECT_FALSE(isWritten);
    char byte = 0;
    EXPECT_EQ(::read(reader, &byte, 1), 0);
    ::close(reader);
}

TEST_F(FilesThatChange, AreNotReplacedByTextsWhenTheyBecomeFolders) {
    test::writeFile(path, "old");
    bool isWritten = true;
    changeBefore(
        SYS_openat, [&] { makeFolder(); },
        [&] { isWritten = service.writeTextDocument(name, "text", "UTF-8"); });
    EXPECT_FALSE(isWritten);
    EXPECT_TRUE(std::filesystem::is_empty(path));
}

TEST_F(FilesThatChange, AreNotReplacedByPackagesWhenTheyBecomeFolders) {
    test::writeFile(path, "old");
    EXPECT_FALSE(savesWhenChanged([&] { makeFolder(); }));
    EXPECT_TRUE(std::filesystem::is_empty(path));
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(folder.path()), {}), 1);
}

TEST_F(FilesThatChange, LeaveNothingWhenTheirFolderIsDeletedDuringASave) {
    EXPECT_FALSE(savesWhenChanged([&] { std::filesystem::remove_all(folder.path()); }));
    EXPECT_FALSE(std::filesystem::exists(folder.path()));
}

// While another program has a lease on the file, which it releases shortly after it is asked to.
class FilesUnderALease : public FilesThatChange {
protected:
    bool takeLease() {
        holder_.emplace(path, std::chrono::milliseconds(50));
        return holder_->hasLease();
    }

    std::optional<test::LeaseHolder> holder_;
};

TEST_F(FilesUnderALease, AreReadWhenItIsGivenUp) {
    test::writeFile(path, "text");
    if (!takeLease()) {
        GTEST_SKIP() << "this file system has no leases";
    }
    EXPECT_EQ(json::serialize(json::Value(service.readTextDocument(name))), successOf("text"));
}

TEST_F(FilesUnderALease, AreWrittenWhenItIsGivenUp) {
    test::writeFile(path, "old");
    if (!takeLease()) {
        GTEST_SKIP() << "this file system has no leases";
    }
    EXPECT_TRUE(service.writeTextDocument(name, "new", "UTF-8"));
    EXPECT_EQ(test::readFile(path), "new");
}

TEST_F(FilesUnderALease, AreReadAsPackagesWhenItIsGivenUp) {
    ASSERT_TRUE(service.writePackageDocument(
        name, {{"parts", json::Array()}, {"relationships", json::Array()}}));
    if (!takeLease()) {
        GTEST_SKIP() << "this file system has no leases";
    }
    EXPECT_EQ(json::serialize(json::Value(service.readPackageDocument(name))),
              R"({"parts":[],"relationships":[],"status":true})");
}

}  // namespace
}  // namespace EditorServices
