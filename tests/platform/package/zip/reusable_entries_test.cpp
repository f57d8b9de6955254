// SPDX-License-Identifier: Apache-2.0
#include "platform/package/zip/reusable_entries.h"

#include <gtest/gtest.h>
#include <libdeflate.h>
#include <sys/stat.h>

#include <chrono>
#include <cstddef>
#include <filesystem>
#include <memory>
#include <random>
#include <string>

#include "tests/platform/package/zip_builder.h"
#include "tests/support/lease_holder.h"
#include "tests/support/temporary_directory.h"

namespace test {
namespace {

namespace zip = platform::package::zip;

std::string someText() {
    std::string text;
    for (int i = 0; i < 2000; ++i) {
        text += std::to_string(i * i) + (i % 3 == 0 ? "<w:t>" : " ");
    }
    return text;
}

class ReusableEntriesTest : public testing::Test {
protected:
    std::string archiveOf(const std::vector<ZipEntry>& entries, const ZipOptions& options = {}) {
        test::writeFile(path_, buildZip(entries, options));
        return path_;
    }

    // What is found for `content` under the name "a".
    static std::string found(zip::ReusableEntries& entries, const std::string& content,
                             const std::string& name = "a") {
        const auto bytes = entries.find(
            name, {reinterpret_cast<const std::uint8_t*>(content.data()), content.size()},
            checksum(content));
        return {bytes.begin(), bytes.end()};
    }

    std::string foundIn(const ZipEntry& entry, const std::string& content,
                        const ZipOptions& options = {}) {
        zip::ReusableEntries entries(archiveOf({{"b", "another"}, entry}, options));
        return found(entries, content);
    }

    // An entry that says that it expands to text_, with these bytes.
    ZipEntry entryWith(const std::string& deflatedBytes) const {
        ZipEntry entry{"a", deflatedBytes};
        entry.method = 8;
        entry.size = text_.size();
        entry.checksum = checksum(text_);
        return entry;
    }

    test::TemporaryDirectory folder_;
    std::filesystem::path path_ = folder_ / "archive";
    const std::string text_ = someText();
    const std::string deflated_ = deflate(text_);
};

TEST_F(ReusableEntriesTest, AreTheDeflatedBytesOfTheSameContent) {
    EXPECT_EQ(foundIn({"a", text_, true}, text_), deflated_);
}

TEST_F(ReusableEntriesTest, AreFoundHoweverTheirSizesAreWritten) {
    ZipEntry entry{"a", text_, true};
    entry.hasDataDescriptor = true;
    EXPECT_EQ(foundIn(entry, text_), deflated_);
    entry.hasDataDescriptor = false;
    entry.isZip64 = true;
    ZipOptions options;
    options.isZip64 = true;
    EXPECT_EQ(foundIn(entry, text_, options), deflated_);
}

TEST_F(ReusableEntriesTest, AreNotFoundForAnotherNameOrContent) {
    zip::ReusableEntries entries(archiveOf({{"a", text_, true}}));
    EXPECT_EQ(found(entries, text_, "A"), "");
    EXPECT_EQ(found(entries, text_ + " "), "");
    EXPECT_EQ(found(entries, text_.substr(1)), "");
    std::string other = text_;
    other.back() = '!';
    EXPECT_EQ(found(entries, other), "");
    EXPECT_EQ(found(entries, text_), deflated_);
}

TEST_F(ReusableEntriesTest, AreComparedByTheirBytesAndNotByTheirChecksum) {
    std::string other = text_;
    other[1000] = '!';
    ZipEntry entry{"a", other, true};
    entry.checksum = checksum(text_);
    EXPECT_EQ(foundIn(entry, text_), "");
}

TEST_F(ReusableEntriesTest, HaveNothingBehindTheirStream) {
    EXPECT_EQ(foundIn(entryWith(deflated_), text_), deflated_);
    EXPECT_EQ(foundIn(entryWith(deflated_ + "hidden"), text_), "");
    EXPECT_EQ(foundIn(entryWith(deflated_ + std::string(1, '\0')), text_), "");
}

TEST_F(ReusableEntriesTest, ExpandToNoMoreAndNoLess) {
    EXPECT_EQ(foundIn(entryWith(deflate(text_ + "more")), text_), "");
    EXPECT_EQ(foundIn(entryWith(deflate(text_.substr(1))), text_), "");
    EXPECT_EQ(foundIn(entryWith(deflated_.substr(0, deflated_.size() - 1)), text_), "");
}

TEST_F(ReusableEntriesTest, AreNeitherStoredNorEncrypted) {
    EXPECT_EQ(foundIn({"a", text_, false}, text_), "");
    for (const std::uint16_t flag : {std::uint16_t{1}, std::uint16_t{1U << 6U}}) {
        ZipEntry entry{"a", text_, true};
        entry.flags = flag;
        EXPECT_EQ(foundIn(entry, text_), "");
    }
    ZipEntry entry{"a", text_, true};
    entry.method = 9;
    EXPECT_EQ(foundIn(entry, text_), "");
}

TEST_F(ReusableEntriesTest, KeepToTheLimitOfExpansion) {
    const std::string blanks(1'000'000, ' ');
    EXPECT_EQ(foundIn({"a", blanks, true}, blanks), "");
}

TEST_F(ReusableEntriesTest, AreSmallerThanTheirContent) {
    const std::string tiny = "x";
    EXPECT_EQ(foundIn({"a", tiny, true}, tiny), "");
    EXPECT_EQ(foundIn({"a", "", true}, ""), "");
}

TEST_F(ReusableEntriesTest, AreNoneWhereThereIsNoArchive) {
    const auto expectNone = [&](const std::string& path) {
        zip::ReusableEntries entries(path);
        EXPECT_EQ(found(entries, text_), "") << path;
    };
    expectNone(folder_ / "missing");
    expectNone(folder_.path());
    expectNone("");
    const std::filesystem::path pipe = folder_ / "pipe";
    ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
    expectNone(pipe);
    test::writeFile(path_, "no archive");
    expectNone(path_);
    const std::string archive = buildZip({{"a", text_, true}});
    for (std::size_t length = 0; length < archive.size(); length += 7) {
        test::writeFile(path_, archive.substr(0, length));
        expectNone(path_);
    }
}

TEST_F(ReusableEntriesTest, AreNotWaitedFor) {
    const test::LeaseHolder holder(archiveOf({{"a", text_, true}}), std::nullopt);
    if (!holder.hasLease()) {
        GTEST_SKIP() << "this file system knows no leases";
    }
    const auto start = std::chrono::steady_clock::now();
    zip::ReusableEntries entries(path_);
    EXPECT_EQ(found(entries, text_), "");
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(10));
}

TEST_F(ReusableEntriesTest, StayWhenTheFileIsRemovedOrReplaced) {
    zip::ReusableEntries entries(archiveOf({{"a", text_, true}}));
    std::filesystem::remove(path_);
    EXPECT_EQ(found(entries, text_), deflated_);
    test::writeFile(path_, "another file");
    EXPECT_EQ(found(entries, text_), deflated_);
}

TEST_F(ReusableEntriesTest, AreGoneWhenTheFileIsCutShort) {
    zip::ReusableEntries entries(archiveOf({{"a", text_, true}}));
    for (const std::uintmax_t size : {deflated_.size(), std::size_t{40}, std::size_t{0}}) {
        std::filesystem::resize_file(path_, size);
        EXPECT_EQ(found(entries, text_), "") << size;
    }
}

TEST_F(ReusableEntriesTest, ExpandToTheContentWhateverIsWrittenIntoTheFileMeanwhile) {
    const std::unique_ptr<libdeflate_decompressor, void (*)(libdeflate_decompressor*)> decompressor(
        libdeflate_alloc_decompressor(), libdeflate_free_decompressor);
    const std::string archive = buildZip({{"a", text_, true}});
    std::mt19937 random(1);
    std::size_t changed = 0;
    for (int run = 0; run < 1000; ++run) {
        test::writeFile(path_, archive);
        zip::ReusableEntries entries(path_);
        std::string damaged = archive;
        damaged[random() % damaged.size()] = static_cast<char>(random());
        test::writeFile(path_, damaged);
        const std::string bytes = found(entries, text_);
        if (bytes.empty()) {
            ++changed;
            continue;
        }
        std::string expanded(text_.size(), '\0');
        ASSERT_EQ(libdeflate_deflate_decompress(decompressor.get(), bytes.data(), bytes.size(),
                                                expanded.data(), expanded.size(), nullptr),
                  LIBDEFLATE_SUCCESS);
        ASSERT_EQ(expanded, text_);
    }
    EXPECT_GT(changed, 500U);
}

}  // namespace
}  // namespace test
