// SPDX-License-Identifier: Apache-2.0
#include "platform/package/zip/zip_writer.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <stdexcept>
#include <string>

#include "platform/package/limits.h"
#include "platform/package/zip/zip_archive.h"
#include "tests/platform/package/package_test_support.h"

namespace testing_package {
namespace {

namespace limits = platform::package::limits;
using platform::AtomicFile;
using platform::package::ZipArchive;
using platform::package::ZipWriter;
using testing::HasSubstr;
using testing::ThrowsMessage;

/// As many bytes as a part may have, which take little memory: one block of text again and again.
class LargestPart {
public:
    LargestPart() {
        const int file = ::memfd_create("block", MFD_CLOEXEC);
        std::string block;
        for (int i = 0; block.size() < kBlockSize; ++i) {
            block.append(std::to_string(i * 7919)).append(1500, ' ');
        }
        block.resize(kBlockSize);
        start_ = static_cast<char*>(::mmap(nullptr, limits::kMaxPartBytes, PROT_NONE,
                                           MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0));
        bool isMapped = start_ != MAP_FAILED &&
                        ::write(file, block.data(), block.size()) == ssize_t{kBlockSize};
        for (std::size_t at = 0; isMapped && at < limits::kMaxPartBytes; at += kBlockSize) {
            isMapped = ::mmap(start_ + at, kBlockSize, PROT_READ, MAP_PRIVATE | MAP_FIXED, file,
                              0) != MAP_FAILED;
        }
        ::close(file);
        if (!isMapped) {
            throw std::runtime_error("no memory for the largest part");
        }
    }
    LargestPart(const LargestPart&) = delete;
    LargestPart& operator=(const LargestPart&) = delete;
    ~LargestPart() { ::munmap(start_, limits::kMaxPartBytes); }

    std::span<const std::uint8_t> bytes() const {
        return {reinterpret_cast<const std::uint8_t*>(start_), limits::kMaxPartBytes};
    }

private:
    static constexpr std::size_t kBlockSize = 16 << 20;
    char* start_;
};

TEST(ZipWriter, WritesAsMuchAsReadersAcceptAndNoMore) {
    const TemporaryFolder folder;
    const std::string path = (folder.path() / "a.zip").string();
    const LargestPart part;
    AtomicFile file(path);
    ZipWriter zip(file);
    zip.add("a", part.bytes(), true);
    zip.add("b", part.bytes(), true);
    static_assert(2 * limits::kMaxPartBytes == limits::kMaxTotalBytes);
    EXPECT_THAT([&] { zip.add("c", part.bytes().first(1), true); },
                ThrowsMessage<std::runtime_error>(HasSubstr("makes the package larger than")));
    zip.add("d", {}, true);
    zip.finish();
    file.commit();
    EXPECT_EQ(ZipArchive(path).entries().size(), 3U);
}

TEST(ZipWriter, RefusesAPartThatIsTooLarge) {
    const TemporaryFolder folder;
    void* memory = ::mmap(nullptr, limits::kMaxPartBytes + 1, PROT_NONE,
                          MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
    ASSERT_NE(memory, MAP_FAILED);
    AtomicFile file((folder.path() / "a.zip").string());
    ZipWriter zip(file);
    EXPECT_THAT(
        [&] {
            zip.add("a", {static_cast<const std::uint8_t*>(memory), limits::kMaxPartBytes + 1},
                    true);
        },
        ThrowsMessage<std::runtime_error>(HasSubstr("is too large: 1073741825 bytes")));
    ::munmap(memory, limits::kMaxPartBytes + 1);
}

}  // namespace
}  // namespace testing_package
