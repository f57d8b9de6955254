// SPDX-License-Identifier: Apache-2.0
#include "platform/posix/open_regular_file.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <filesystem>
#include <string>

#include "tests/support/lease_holder.h"
#include "tests/support/temporary_directory.h"

namespace platform {
namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

class OpenRegularFile : public testing::Test {
protected:
    void SetUp() override { test::writeFile(file_, "text"); }

    static std::string contentOf(const FileDescriptor& file) {
        std::array<char, 100> buffer{};
        const ssize_t count = ::read(file.get(), buffer.data(), buffer.size());
        return count < 0 ? "cannot be read" : std::string(buffer.data(), std::size_t(count));
    }

    test::TemporaryDirectory folder_;
    std::filesystem::path file_ = folder_ / "file";
};

TEST_F(OpenRegularFile, OpensAFileAndTellsItsSize) {
    const OpenedFile opened = openRegularFile(file_);
    ASSERT_TRUE(opened.descriptor);
    EXPECT_EQ(opened.status.st_size, 4);
    EXPECT_EQ(contentOf(opened.descriptor), "text");
    EXPECT_NE(::fcntl(opened.descriptor.get(), F_GETFD) & FD_CLOEXEC, 0);
}

TEST_F(OpenRegularFile, SaysWhyAFileCannotBeOpened) {
    const OpenedFile opened = openRegularFile(folder_ / "none");
    EXPECT_FALSE(opened.descriptor);
    EXPECT_EQ(opened.error, ENOENT);
}

TEST_F(OpenRegularFile, OpensNothingElse) {
    const std::filesystem::path pipe = folder_ / "pipe";
    ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
    for (const std::string& path :
         {pipe.string(), folder_.path().string(), std::string("/dev/zero")}) {
        const OpenedFile opened = openRegularFile(path);
        EXPECT_FALSE(opened.descriptor) << path;
        EXPECT_EQ(opened.error, 0) << path;
        EXPECT_FALSE(S_ISREG(opened.status.st_mode)) << path;
    }
}

TEST_F(OpenRegularFile, WaitsUntilALeaseIsGivenUp) {
    const test::LeaseHolder holder(file_, milliseconds(150));
    if (!holder.hasLease()) {
        GTEST_SKIP() << "this file system knows no leases";
    }
    const auto start = steady_clock::now();
    const OpenedFile opened = openRegularFile(file_);
    EXPECT_GE(steady_clock::now() - start, milliseconds(140));
    ASSERT_TRUE(opened.descriptor);
    EXPECT_EQ(contentOf(opened.descriptor), "text");
}

TEST_F(OpenRegularFile, WaitsNoLongerThanItsPatience) {
    const test::LeaseHolder holder(file_, std::nullopt);
    if (!holder.hasLease()) {
        GTEST_SKIP() << "this file system knows no leases";
    }
    const auto start = steady_clock::now();
    const OpenedFile opened = openRegularFile(file_, milliseconds(100));
    EXPECT_GE(steady_clock::now() - start, milliseconds(100));
    EXPECT_FALSE(opened.descriptor);
    EXPECT_EQ(opened.error, EWOULDBLOCK);
}

TEST_F(OpenRegularFile, OpensForWritingWhenALeaseIsGivenUp) {
    const test::LeaseHolder holder(file_, milliseconds(50));
    if (!holder.hasLease()) {
        GTEST_SKIP() << "this file system knows no leases";
    }
    const FileDescriptor file = openWithoutHanging(file_, O_WRONLY | O_CREAT | O_TRUNC, 0600);
    ASSERT_TRUE(file);
    EXPECT_EQ(::write(file.get(), "new", 3), 3);
    EXPECT_EQ(test::readFile(file_), "new");
}

TEST_F(OpenRegularFile, LeavesTheContentAloneWhenALeaseIsNotGivenUp) {
    {
        const test::LeaseHolder holder(file_, std::nullopt);
        if (!holder.hasLease()) {
            GTEST_SKIP() << "this file system knows no leases";
        }
        EXPECT_FALSE(
            openWithoutHanging(file_, O_WRONLY | O_CREAT | O_TRUNC, 0600, milliseconds(20)));
        EXPECT_EQ(errno, EWOULDBLOCK);
    }
    EXPECT_EQ(test::readFile(file_), "text");
}

TEST_F(OpenRegularFile, CreatesAFileWithTheModeThatItIsGiven) {
    const FileDescriptor file =
        openWithoutHanging(folder_ / "created", O_WRONLY | O_CREAT | O_TRUNC, 0600);
    ASSERT_TRUE(file);
    struct stat status {};
    ASSERT_EQ(::fstat(file.get(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0600U);
}

}  // namespace
}  // namespace platform
