// SPDX-License-Identifier: Apache-2.0
#include "host/server/private_folder.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <set>
#include <stdexcept>
#include <string>

#include "tests/support/temporary_directory.h"

namespace {

namespace fs = std::filesystem;

using host::PrivateFolder;
using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

// Folders are made below one of the test's.
class PrivateFolders : public ::testing::Test {
protected:
    PrivateFolders() {
        ::unsetenv("XDG_RUNTIME_DIR");
        ::setenv("TMPDIR", parent_.path().c_str(), 1);
    }
    ~PrivateFolders() override { ::unsetenv("TMPDIR"); }

    std::set<fs::path> folders() const {
        std::set<fs::path> found;
        for (const auto& entry : fs::directory_iterator(parent_.path())) {
            found.insert(entry.path());
        }
        return found;
    }

    // What a process leaves that is killed while it has a folder with a file.
    void leaveOneBehind() {
        const pid_t process = ::fork();
        if (process == 0) {
            const PrivateFolder folder;
            std::ofstream(folder.path() / "file") << "text";
            ::raise(SIGKILL);
        }
        int status = 0;
        ::waitpid(process, &status, 0);
        ASSERT_TRUE(WIFSIGNALED(status));
    }

    std::string failure() const {
        try {
            const PrivateFolder folder;
            return "none";
        } catch (const std::runtime_error& error) {
            return error.what();
        }
    }

    const test::TemporaryDirectory parent_;
};

TEST_F(PrivateFolders, AreForTheirUserAloneAndGoWithTheirOwner) {
    {
        const PrivateFolder folder;
        struct stat status {};
        ASSERT_EQ(::stat(folder.path().c_str(), &status), 0);
        EXPECT_EQ(status.st_mode & 0777U, 0700U);
        std::ofstream(folder.path() / "file") << "text";
    }
    EXPECT_THAT(folders(), IsEmpty());
}

TEST_F(PrivateFolders, ThatAKilledProcessLeftAreRemovedByTheNext) {
    leaveOneBehind();
    ASSERT_EQ(folders().size(), 1U);
    const PrivateFolder folder;
    EXPECT_EQ(folders(), std::set<fs::path>{folder.path()});
}

TEST_F(PrivateFolders, ThatAreInUseStay) {
    const PrivateFolder one;
    const PrivateFolder two;
    EXPECT_EQ(folders(), (std::set<fs::path>{one.path(), two.path()}));
}

TEST_F(PrivateFolders, OfOtherNamesAndLinksStay) {
    const fs::path other = parent_ / "other";
    fs::create_directory(other);
    std::ofstream(other / "file") << "text";
    fs::create_directory_symlink(other, parent_ / "serialization_host.link");
    { const PrivateFolder folder; }
    EXPECT_TRUE(fs::exists(other / "file"));
    EXPECT_TRUE(fs::is_symlink(parent_ / "serialization_host.link"));
}

TEST_F(PrivateFolders, NameThePlaceThatIsMissing) {
    ::setenv("TMPDIR", "/no/such/folder", 1);
    EXPECT_THAT(failure(), AllOf(HasSubstr("/no/such/folder: No such file or directory"),
                                 HasSubstr("TMPDIR")));
}

TEST_F(PrivateFolders, NameThePlaceThatHasNoRoom) {
    // The system's error differs from that of a full disk, but is handled alike.
    rlimit limit{};
    ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &limit), 0);
    const rlimit none{0, limit.rlim_max};
    ::signal(SIGXFSZ, SIG_IGN);
    ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &none), 0);
    const std::string text = failure();
    ::setrlimit(RLIMIT_FSIZE, &limit);
    EXPECT_THAT(text, AllOf(HasSubstr(parent_.path().string()), HasSubstr("TMPDIR")));
    EXPECT_THAT(folders(), IsEmpty());
}

}  // namespace
