// SPDX-License-Identifier: Apache-2.0
#include "platform/data_buffer.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <limits>
#include <stdexcept>
#include <string>
#include <utility>

namespace platform {
namespace {

TEST(DataBuffer, OfNoBytesHasNoStorage) {
    for (const DataBuffer& buffer : {DataBuffer(), DataBuffer(0), DataBuffer::copyOf("")}) {
        EXPECT_EQ(buffer.data(), nullptr);
        EXPECT_EQ(buffer.capacity(), 0U);
        EXPECT_TRUE(buffer.empty());
        EXPECT_EQ(buffer.view(), "");
    }
}

TEST(DataBuffer, CopiesExactlyTheBytes) {
    const std::string bytes("a\0b\xFF", 4);
    const DataBuffer buffer = DataBuffer::copyOf(bytes);
    EXPECT_EQ(buffer.view(), bytes);
    EXPECT_EQ(buffer.length(), 4U);
    EXPECT_EQ(buffer.capacity(), 4U);
    EXPECT_NE(buffer.data(), bytes.data());
}

TEST(DataBuffer, HasNoneOfItsBytesInUseAtFirst) {
    DataBuffer buffer(3);
    EXPECT_EQ(buffer.capacity(), 3U);
    EXPECT_TRUE(buffer.empty());
    buffer.data()[0] = 'x';
    buffer.setLength(1);
    EXPECT_EQ(buffer.view(), "x");
}

TEST(DataBuffer, KeepsItsBytesWhenItIsResized) {
    DataBuffer buffer;
    std::string expected;
    for (const std::size_t size : {3U, 100'000U, 20'000'000U, 100'000U, 5U}) {
        const std::size_t kept = std::min(size, expected.size());
        buffer.resize(size);
        ASSERT_EQ(buffer.length(), size);
        EXPECT_EQ(buffer.capacity(), size);
        EXPECT_TRUE(buffer.view().substr(0, kept) == expected.substr(0, kept));
        std::memset(buffer.data() + kept, static_cast<int>(size % 128), size - kept);
        expected = buffer.view();
    }
    buffer.resize(0);
    EXPECT_EQ(buffer.data(), nullptr);
    EXPECT_EQ(buffer.capacity(), 0U);
}

TEST(DataBuffer, StaysAsItWasWhenThereIsNoMemoryToResizeIt) {
    if (UNDER_SANITIZERS) {
        GTEST_SKIP() << "the sanitizers end a program that asks for so much";
    }
    DataBuffer buffer = DataBuffer::copyOf("text");
    EXPECT_THROW(buffer.resize(std::numeric_limits<std::size_t>::max() / 2), std::runtime_error);
    EXPECT_EQ(buffer.view(), "text");
}

TEST(DataBuffer, GivesItsStorageAwayWhenItIsMoved) {
    DataBuffer first = DataBuffer::copyOf("text");
    const char* const storage = first.data();
    DataBuffer second(std::move(first));
    EXPECT_EQ(second.data(), storage);
    EXPECT_EQ(second.view(), "text");
    // NOLINTNEXTLINE(bugprone-use-after-move)
    EXPECT_EQ(first.data(), nullptr);
    EXPECT_EQ(first.capacity(), 0U);
    EXPECT_TRUE(first.empty());

    first = DataBuffer::copyOf("other");
    first = std::move(second);
    EXPECT_EQ(first.data(), storage);
    EXPECT_EQ(first.capacity(), 4U);
    // NOLINTNEXTLINE(bugprone-use-after-move)
    EXPECT_TRUE(second.empty());
}

}  // namespace
}  // namespace platform
