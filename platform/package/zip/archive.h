// SPDX-License-Identifier: Apache-2.0
// Reads zip archives: the directory when the archive is opened, and each entry's bytes on demand.
//
// The code of this folder is our own because the libraries for zip archives do not do three things
// that documents need. They allocate memory before they check whether entries overlap or claim more
// than their data can expand to. They report that an archive is bad, but not what is wrong with
// which entry. And they cannot write the same bytes for the same entries, or reuse an entry's
// deflated bytes only where these are known to hold exactly the content.
//
// Nothing that the archive says is trusted. Opening it takes time and memory in proportion to its
// directory, whose size is limited, and refuses archives whose entries overlap. Before entries are
// read, requireWithinLimits refuses those that claim more than their data can expand to, or than
// the limits allow (limits.h); what nobody reads may claim anything.
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "platform/posix/file_descriptor.h"
#include "platform/posix/open_regular_file.h"

struct libdeflate_decompressor;

namespace platform::package::zip {

class Archive {
public:
    struct Entry {
        std::string name;  ///< as it stands, in UTF-8
        std::uint64_t size = 0;
        std::uint64_t compressedSize = 0;
        std::uint64_t offset = 0;  ///< of the local header
        std::uint32_t checksum = 0;
        std::uint16_t method = 0;
        std::uint16_t flags = 0;
    };

    /// Opens the archive at the UTF-8 `path` and reads its directory. What is not a regular file is
    /// refused without waiting; another program's lease is waited for, for `patience`. Throws
    /// std::runtime_error saying what is wrong with the file (without its path) or, about one
    /// entry, with its name.
    explicit Archive(const std::string& path, std::chrono::milliseconds patience = leasePatience);

    /// All entries, folders included, in the order of the directory.
    const std::vector<Entry>& entries() const noexcept { return entries_; }

    /// Throws std::runtime_error naming what goes beyond the limits when one of `entries` of this
    /// archive does, or all of them together do, or when one claims a size to which its data cannot
    /// expand. To be called before memory is allocated for them.
    void requireWithinLimits(std::span<const Entry* const> entries) const;

    /// Reads and expands `entry` of this archive into `out`, which has `entry.size` bytes, and
    /// checks the result against its checksum. Throws std::runtime_error saying what is wrong with
    /// the entry (without its name).
    void read(const Entry& entry, std::span<std::uint8_t> out);

    /// The deflated bytes of `entry` of this archive if they are a stream that ends exactly at
    /// their end and expands to exactly `content`; else nothing. Valid until the next call. The
    /// entry is expanded into `scratch`, which has at least the size of `content`. Throws
    /// std::runtime_error when the entry cannot be read.
    std::span<const std::uint8_t> readDeflatedForm(const Entry& entry,
                                                   std::span<const std::uint8_t> content,
                                                   std::span<std::uint8_t> scratch);

private:
    struct Directory {
        std::uint64_t entryCount;
        std::uint64_t offset;
        std::uint64_t size;
    };
    struct FreeDecompressor {
        void operator()(libdeflate_decompressor* decompressor) const noexcept;
    };

    Directory findDirectory() const;
    Directory findZip64Directory(std::uint64_t locatorOffset) const;
    void readDirectory(const Directory& directory);
    void checkLayout(std::uint64_t dataEnd) const;
    std::uint64_t dataOffset(const Entry& entry) const;
    void expand(const Entry& entry, std::uint64_t offset, std::span<std::uint8_t> out);
    std::span<const std::uint8_t> readCompressed(const Entry& entry, std::uint64_t offset);
    void readAt(std::uint64_t offset, std::span<std::uint8_t> out) const;

    std::uint64_t fileSize_ = 0;
    FileDescriptor file_;
    std::vector<Entry> entries_;
    std::unique_ptr<std::uint8_t[]> compressed_;  // the deflated bytes of the entry being read
    std::uint64_t compressedCapacity_ = 0;
    std::unique_ptr<libdeflate_decompressor, FreeDecompressor> decompressor_;
};

}  // namespace platform::package::zip
