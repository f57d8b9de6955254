// SPDX-License-Identifier: Apache-2.0
#include "platform/posix/file_in_memory.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <string>
#include <system_error>
#include <utility>

#include "tests/support/more_memory.h"
#include "tests/support/temporary_directory.h"

namespace {

using platform::FileInMemory;

constexpr std::size_t megabyte = std::size_t{1} << 20U;

TEST(FileInMemory, IsFoundByItsPath) {
    const FileInMemory file("test");
    test::writeFile(file.path(), "content");
    EXPECT_EQ(test::readFile("/proc/self/fd/" + std::to_string(file.descriptor().get())),
              "content");
}

TEST(FileInMemory, CountsWhatIsReservedAsMemoryOfTheProcessForAsLongAsItLives) {
    const std::size_t before = test::countedMemory();
    {
        FileInMemory file("test");
        file.reserve(100 * megabyte);
        file.reserve(50 * megabyte);
        file.reserve(300 * megabyte);
        const FileInMemory moved = std::move(file);
        EXPECT_GE(test::countedMemory(), before + 300 * megabyte);
        EXPECT_LT(test::countedMemory(), before + 320 * megabyte);
    }
    EXPECT_LT(test::countedMemory(), before + 20 * megabyte);
}

TEST(FileInMemory, ReservesNoMoreThanTheProcessMayTake) {
    const test::MoreMemory limited(200 * megabyte);
    FileInMemory file("test");
    EXPECT_THROW(file.reserve(300 * megabyte), std::system_error);
    file.reserve(50 * megabyte);
    EXPECT_THROW(file.reserve(300 * megabyte), std::system_error);
    file.reserve(60 * megabyte);
    EXPECT_THROW(FileInMemory("other").reserve(180 * megabyte), std::system_error);
}

}  // namespace
