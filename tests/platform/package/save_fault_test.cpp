// SPDX-License-Identifier: Apache-2.0
// What is left on disk when a save fails or is killed at any of its system calls.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <functional>
#include <map>
#include <random>
#include <stdexcept>
#include <string>
#include <system_error>

#include "platform/package/quillet_file_reader.h"
#include "platform/package/quillet_file_writer.h"
#include "tests/platform/package/package_test_support.h"
#include "tests/support/system_call_supervisor.h"

namespace test {
namespace {

using platform::package::QuilletFileReader;
using platform::package::QuilletFileWriter;
using test::callsOf;
using test::canSupervise;
using test::supervise;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

// A package of which the archive takes several writes.
QuilletFilePackage newDocument() {
    std::mt19937 random(5);
    std::vector<Part> parts(3);
    for (std::size_t i = 0; i < parts.size(); ++i) {
        parts[i].partUri = i == 0 ? u"/a" : i == 1 ? u"/b" : u"/c";
        parts[i].contentType = u"a/b";
        parts[i].content.resize(100'000);
        for (std::uint8_t& byte : parts[i].content) {
            byte = static_cast<std::uint8_t>(random());
        }
    }
    std::vector<Relationship> relationships;
    return {parts, relationships};
}

class SaveFaultTest : public testing::Test {
protected:
    void SetUp() override {
        if (!canSupervise()) {
            GTEST_SKIP() << "this system does not let system calls be supervised";
        }
        save(folder_.at("expected"));
        new_ = folder_.bytesOf("expected");
        std::filesystem::remove(folder_.path() / "expected");
    }

    void save(const std::u16string& path) const {
        QuilletFileWriter writer(path, {});
        writer.write(package_);
        writer.close(false);
    }

    // Makes a save whose calls `decide` may fail, and counts them.
    void superviseSave(std::string& error, const std::function<int(int, int)>& decide) {
        supervise(saving(error), [&](int call, int index) {
            const int decided = decide(call, index);
            faults_ += decided != 0 ? 1 : 0;
            return decided;
        });
    }

    void TearDown() override { RecordProperty("faults", std::to_string(faults_)); }

    // The work of one save, which notes the error that it ends with.
    std::function<void()> saving(std::string& error) {
        return [this, &error] {
            error.clear();
            try {
                save(path_);
            } catch (const std::exception& exception) {
                error = exception.what();
            }
        };
    }

    // Puts the old document there, reached through a symbolic link and with permissions of its own.
    void placeOldDocument() {
        std::filesystem::remove(folder_.path() / "a.docx");
        folder_.file("a.docx", "old");
        ASSERT_EQ(::chmod((folder_.path() / "a.docx").c_str(), 0640), 0);
        ::setxattr((folder_.path() / "a.docx").c_str(), "user.origin", "x", 1, 0);
        std::filesystem::remove(folder_.path() / "link");
        ASSERT_EQ(::symlink("a.docx", (folder_.path() / "link").c_str()), 0);
        path_ = folder_.at("link");
    }

    std::vector<int> callsOfASave() {
        placeOldDocument();
        std::string error;
        const std::vector<int> calls = callsOf(saving(error));
        EXPECT_EQ(error, "");
        EXPECT_EQ(folder_.bytesOf("a.docx"), new_);
        return calls;
    }

    static int positionOfRename(const std::vector<int>& calls) {
        const auto isRename = [](int call) {
            return call == SYS_renameat || call == SYS_renameat2 ||
#ifdef SYS_rename
                   call == SYS_rename;
#else
                   false;
#endif
        };
        const auto place = std::find_if(calls.begin(), calls.end(), isRename);
        EXPECT_NE(place, calls.end());
        return static_cast<int>(place - calls.begin());
    }

    TemporaryFolder folder_;
    QuilletFilePackage package_ = newDocument();
    std::string new_;
    std::u16string path_;
    int faults_ = 0;
};

TEST_F(SaveFaultTest, SyncsTheContentBeforeTheRenameAndTheFolderAfterIt) {
    const std::vector<int> calls = callsOfASave();
    const int rename = positionOfRename(calls);
    const std::vector<int> before(calls.begin(), calls.begin() + rename);
    const std::vector<int> after(calls.begin() + rename + 1, calls.end());
    EXPECT_EQ(std::count(before.begin(), before.end(), SYS_fsync), 1);
    EXPECT_EQ(std::count(after.begin(), after.end(), SYS_fsync), 1);
    EXPECT_GE(std::count(before.begin(), before.end(), SYS_write), 3);
    EXPECT_EQ(std::count(after.begin(), after.end(), SYS_write), 0);
}

TEST_F(SaveFaultTest, LeavesTheOldDocumentOrTheNewOneWhicheverCallFails) {
    const std::vector<int> calls = callsOfASave();
    const int rename = positionOfRename(calls);
    std::map<int, int> failures;  // of saves, by system call
    for (int failing = 0; failing < static_cast<int>(calls.size()); ++failing) {
        for (const int error : {ENOSPC, EIO, EACCES, EPERM, EINVAL, EINTR}) {
            SCOPED_TRACE("call " + std::to_string(failing) + ", system call " +
                         std::to_string(calls[static_cast<std::size_t>(failing)]) + ", errno " +
                         std::to_string(error));
            placeOldDocument();
            std::string thrown;
            superviseSave(thrown, [&](int, int index) { return index == failing ? error : 0; });
            const bool mustBeOld = !thrown.empty() && failing <= rename;
            EXPECT_EQ(folder_.bytesOf("a.docx"), mustBeOld ? "old" : new_);
            EXPECT_THAT(folder_.names(), ElementsAre("a.docx", "link"));
            if (!thrown.empty()) {
                ++failures[calls[static_cast<std::size_t>(failing)]];
            }
            if (!thrown.empty() && error != EINVAL) {  // which says of a link that it is none
                EXPECT_THAT(thrown, HasSubstr(std::generic_category().message(error)));
            }
            struct stat status {};
            ASSERT_EQ(::stat((folder_.path() / "a.docx").c_str(), &status), 0);
            EXPECT_EQ(status.st_mode & 07777U, 0640U);
        }
    }
    // Failures of these are never passed over, whatever the error; an interrupted call is made
    // again.
    for (const int call : {SYS_openat, SYS_write, SYS_fsync}) {
        EXPECT_GE(failures[call], 5) << call;
    }
    EXPECT_EQ(failures[SYS_fchmod], 6);
    EXPECT_EQ(failures[calls[static_cast<std::size_t>(rename)]], 6);
}

TEST_F(SaveFaultTest, LeavesTheOldDocumentWhenTheDiskStaysFull) {
    const std::vector<int> calls = callsOfASave();
    for (int first = 0; first < static_cast<int>(calls.size()); ++first) {
        if (calls[static_cast<std::size_t>(first)] != SYS_write) {
            continue;
        }
        placeOldDocument();
        std::string thrown;
        superviseSave(thrown, [&](int call, int index) {
            return index >= first && (call == SYS_write || call == SYS_fsync) ? ENOSPC : 0;
        });
        EXPECT_THAT(thrown, HasSubstr("No space left on device"));
        EXPECT_EQ(folder_.bytesOf("a.docx"), "old");
        EXPECT_THAT(folder_.names(), ElementsAre("a.docx", "link"));
    }
}

TEST_F(SaveFaultTest, LeavesNothingWhereThereWasNoDocumentWhicheverCallFails) {
    path_ = folder_.at("a.docx");
    std::string thrown;
    const std::vector<int> calls = callsOf(saving(thrown));
    EXPECT_EQ(thrown, "");
    const int rename = positionOfRename(calls);
    for (int failing = 0; failing < static_cast<int>(calls.size()); ++failing) {
        for (const int error : {ENOSPC, EIO, EACCES}) {
            SCOPED_TRACE("call " + std::to_string(failing) + ", errno " + std::to_string(error));
            std::filesystem::remove(folder_.path() / "a.docx");
            superviseSave(thrown, [&](int, int index) { return index == failing ? error : 0; });
            if (!thrown.empty() && failing <= rename) {
                EXPECT_THAT(folder_.names(), IsEmpty());
            } else {
                EXPECT_EQ(folder_.bytesOf("a.docx"), new_);
                EXPECT_THAT(folder_.names(), ElementsAre("a.docx"));
            }
        }
    }
}

TEST_F(SaveFaultTest, NeverOpensTheDocumentToOthersWhicheverCallFails) {
    const std::vector<int> calls = callsOfASave();
    constexpr const char* name = "system.posix_acl_access";
    // user::rw-, user:1234:rw-, group::---, mask::rw-, other::---: without the list, the mask would
    // be the permissions of the group.
    constexpr std::uint64_t none = 0xFFFFFFFF;
    const std::string list = bytes32(2) + bytes16(1) + bytes16(6) + bytes32(none) + bytes16(2) +
                             bytes16(6) + bytes32(1234) + bytes16(4) + bytes16(0) + bytes32(none) +
                             bytes16(16) + bytes16(6) + bytes32(none) + bytes16(32) + bytes16(0) +
                             bytes32(none);
    const std::string path = (folder_.path() / "a.docx").string();
    // With a list more calls are made; the first fault that does not come ends the loop.
    bool isMade = true;
    int failing = 0;
    for (; isMade; ++failing) {
        placeOldDocument();
        if (::setxattr(path.c_str(), name, list.data(), list.size(), 0) != 0) {
            GTEST_SKIP() << "this file system has no access control lists";
        }
        isMade = false;
        std::string thrown;
        superviseSave(thrown, [&](int, int index) {
            isMade = isMade || index == failing;
            return index == failing ? EIO : 0;
        });
        std::string found(list.size(), '\0');
        ASSERT_EQ(::getxattr(path.c_str(), name, found.data(), found.size()),
                  static_cast<ssize_t>(list.size()))
            << failing;
        EXPECT_EQ(found, list) << failing;
    }
    EXPECT_GT(failing, static_cast<int>(calls.size()));
}

TEST_F(SaveFaultTest, LeavesTheOldDocumentOrTheNewOneWhenItIsKilledAtAnyCall) {
    const std::vector<int> calls = callsOfASave();
    const int rename = positionOfRename(calls);
    for (int last = 0; last < static_cast<int>(calls.size()); ++last) {
        placeOldDocument();
        ++faults_;
        const pid_t child = ::fork();
        if (child == 0) {
            std::string thrown;
            supervise(saving(thrown), [&](int, int index) {
                return index == last ? ::kill(::getpid(), SIGKILL) : 0;
            });
            ::_exit(1);
        }
        int status = 0;
        ASSERT_EQ(::waitpid(child, &status, 0), child);
        ASSERT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGKILL) << status;
        EXPECT_EQ(folder_.bytesOf("a.docx"), last <= rename ? "old" : new_) << "killed at " << last;
        // The temporary file may be left, but nothing that could be taken for a document.
        for (const std::string& name : folder_.names()) {
            if (name != "a.docx" && name != "link") {
                EXPECT_TRUE(name.starts_with(".~saving-") && name.ends_with(".tmp")) << name;
                std::filesystem::remove(folder_.path() / name);
            }
        }
    }
}

// A small file system in memory, mounted as long as this object lives.
class SmallDisk {
public:
    explicit SmallDisk(const std::filesystem::path& folder)
        : path_(folder),
          isMounted_(::mount("tmpfs", path_.c_str(), "tmpfs", 0, "size=400k,mode=700") == 0) {}
    SmallDisk(const SmallDisk&) = delete;
    SmallDisk& operator=(const SmallDisk&) = delete;
    ~SmallDisk() {
        if (isMounted_) {
            ::umount2(path_.c_str(), MNT_DETACH);
        }
    }
    bool isMounted() const { return isMounted_; }
    bool makeReadOnly() const {
        return ::mount("tmpfs", path_.c_str(), "tmpfs", MS_REMOUNT | MS_RDONLY, nullptr) == 0;
    }

private:
    std::filesystem::path path_;
    bool isMounted_;
};

TEST(SaveToDisk, KeepsTheOldDocumentOnAFullDisk) {
    const TemporaryFolder folder;
    const SmallDisk disk(folder.path());
    if (!disk.isMounted()) {
        GTEST_SKIP() << "this user may not mount a file system";
    }
    const std::string old(200'000, 'o');
    folder.file("a.docx", old);
    QuilletFileWriter writer(folder.at("a.docx"), {});
    EXPECT_THAT([&] { writer.write(newDocument()); },
                testing::ThrowsMessage<std::runtime_error>(HasSubstr("No space left on device")));
    EXPECT_EQ(folder.bytesOf("a.docx"), old);
    EXPECT_THAT(folder.names(), ElementsAre("a.docx"));
}

TEST(SaveToDisk, RefusesAReadOnlyFileSystem) {
    const TemporaryFolder folder;
    const SmallDisk disk(folder.path());
    if (!disk.isMounted()) {
        GTEST_SKIP() << "this user may not mount a file system";
    }
    folder.file("a.docx", "old");
    ASSERT_TRUE(disk.makeReadOnly());
    for (const char* name : {"a.docx", "new.docx"}) {
        QuilletFileWriter writer(folder.at(name), {});
        EXPECT_THAT([&] { writer.write(newDocument()); },
                    testing::ThrowsMessage<std::runtime_error>(HasSubstr("Read-only file system")));
    }
    EXPECT_EQ(folder.bytesOf("a.docx"), "old");
}

}  // namespace
}  // namespace test
