// SPDX-License-Identifier: Apache-2.0
// Which buffers are asked to be backed by large pages, as the system tells.
#include "platform/large_pages.h"

#include <gtest/gtest.h>
#include <malloc.h>

#include <cstddef>
#include <cstdint>
#include <fstream>
#include <ios>
#include <sstream>
#include <string>

#include "platform/data_buffer.h"

namespace platform {
namespace {

/// Whether the memory at `address` is to be backed by large pages.
bool isAdvised(const void* address) {
    const auto wanted = reinterpret_cast<std::uintptr_t>(address);
    std::ifstream mappings("/proc/self/smaps");
    bool isWithin = false;
    for (std::string line; std::getline(mappings, line);) {
        std::uintptr_t begin = 0;
        std::uintptr_t end = 0;
        char dash = '\0';
        if (std::istringstream(line) >> std::hex >> begin >> dash >> end && dash == '-') {
            isWithin = begin <= wanted && wanted < end;
        } else if (isWithin && line.starts_with("VmFlags:")) {
            return (line + ' ').find(" hg ") != std::string::npos;
        }
    }
    return false;
}

class LargePages : public testing::Test {
protected:
    void SetUp() override {
        if (!std::ifstream("/sys/kernel/mm/transparent_hugepage/enabled").is_open()) {
            GTEST_SKIP() << "this system has no large pages";
        }
        // All of these buffers come from the system, none from memory that was used before.
        ::mallopt(M_MMAP_THRESHOLD, 1 << 20);
    }
};

constexpr std::size_t large = smallestLargeBuffer + 5'000'000;

TEST_F(LargePages, BackLargeDataBuffers) {
    DataBuffer buffer(large);
    EXPECT_TRUE(isAdvised(buffer.data() + large / 2));
}

TEST_F(LargePages, BackStringsThatAreToBecomeLarge) {
    std::string text = "kept";
    reserveLarge(text, large);
    EXPECT_GE(text.capacity(), large);
    EXPECT_EQ(text, "kept");
    EXPECT_TRUE(isAdvised(text.data() + large / 2));
}

TEST_F(LargePages, AreNotForSmallBuffers) {
    std::string text;
    reserveLarge(text, smallestLargeBuffer - 1);
    EXPECT_EQ(text.capacity(), std::string().capacity()) << "it is left to grow as usual";
    const DataBuffer buffer(smallestLargeBuffer - 1);
    EXPECT_FALSE(isAdvised(buffer.data() + buffer.capacity() / 2));
}

}  // namespace
}  // namespace platform
