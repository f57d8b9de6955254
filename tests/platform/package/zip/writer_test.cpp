// SPDX-License-Identifier: Apache-2.0
#include "platform/package/zip/writer.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <stdexcept>
#include <string>

#include "platform/package/zip/archive.h"
#include "platform/package/zip/limits.h"
#include "tests/platform/package/package_test_support.h"

namespace test {
namespace {

namespace zip = platform::package::zip;
using platform::AtomicFile;
using testing::HasSubstr;
using testing::ThrowsMessage;

/// As many bytes as a part may have, which take little memory: one block of text again and again.
class LargestPart {
public:
    LargestPart() {
        const int file = ::memfd_create("block", MFD_CLOEXEC);
        std::string block;
        for (int i = 0; block.size() < blockSize; ++i) {
            block.append(std::to_string(i * 7919)).append(1500, ' ');
        }
        block.resize(blockSize);
        start_ = static_cast<char*>(::mmap(nullptr, zip::maxEntryBytes, PROT_NONE,
                                           MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0));
        bool isMapped =
            start_ != MAP_FAILED && ::write(file, block.data(), block.size()) == ssize_t{blockSize};
        for (std::size_t at = 0; isMapped && at < zip::maxEntryBytes; at += blockSize) {
            isMapped = ::mmap(start_ + at, blockSize, PROT_READ, MAP_PRIVATE | MAP_FIXED, file,
                              0) != MAP_FAILED;
        }
        ::close(file);
        if (!isMapped) {
            throw std::runtime_error("no memory for the largest part");
        }
    }
    LargestPart(const LargestPart&) = delete;
    LargestPart& operator=(const LargestPart&) = delete;
    ~LargestPart() { ::munmap(start_, zip::maxEntryBytes); }

    std::span<const std::uint8_t> bytes() const {
        return {reinterpret_cast<const std::uint8_t*>(start_), zip::maxEntryBytes};
    }

private:
    static constexpr std::size_t blockSize = 16 << 20;
    char* start_;
};

TEST(ZipWriter, WritesAsMuchAsReadersAcceptAndNoMore) {
    const TemporaryFolder folder;
    const std::string path = (folder.path() / "a.zip").string();
    const LargestPart part;
    AtomicFile file(path);
    zip::ReusableEntries nothing{std::string()};
    zip::Writer writer(file, nothing);
    writer.add("a", part.bytes(), true);
    writer.add("b", part.bytes(), true);
    static_assert(2 * zip::maxEntryBytes == zip::maxTotalBytes);
    EXPECT_THAT([&] { writer.add("c", part.bytes().first(1), true); },
                ThrowsMessage<std::runtime_error>(HasSubstr("makes the package larger than")));
    writer.add("d", {}, true);
    writer.finish();
    file.commit();
    EXPECT_EQ(zip::Archive(path).entries().size(), 3U);
}

TEST(ZipWriter, RefusesAPartThatIsTooLarge) {
    const TemporaryFolder folder;
    void* memory = ::mmap(nullptr, zip::maxEntryBytes + 1, PROT_NONE,
                          MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
    ASSERT_NE(memory, MAP_FAILED);
    AtomicFile file((folder.path() / "a.zip").string());
    zip::ReusableEntries nothing{std::string()};
    zip::Writer writer(file, nothing);
    EXPECT_THAT(
        [&] {
            writer.add("a", {static_cast<const std::uint8_t*>(memory), zip::maxEntryBytes + 1},
                       true);
        },
        ThrowsMessage<std::runtime_error>(HasSubstr("is too large: 1073741825 bytes")));
    ::munmap(memory, zip::maxEntryBytes + 1);
}

}  // namespace
}  // namespace test
