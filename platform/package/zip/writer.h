// SPDX-License-Identifier: Apache-2.0
// Writes zip archives, entry after entry, into a file that is written sequentially.
//
// Entries are written one by one and kept nowhere; only the directory is. Equal entries over equal
// archives give equal bytes: all of them have one fixed date. The archives stay within limits.h,
// and so need no ZIP64.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <string_view>

#include "platform/package/zip/reusable_entries.h"
#include "platform/posix/atomic_file.h"

struct libdeflate_compressor;

namespace platform::package::zip {

class Writer {
public:
    /// Appends to `file`, and takes over what it can of `previous`. Both must outlive the writer.
    Writer(AtomicFile& file, ReusableEntries& previous);

    /// Writes an entry. Where the previous archive has the same one, its deflated bytes are taken
    /// over. Else it is deflated if `mayDeflate` and that makes it smaller, but not if it made it
    /// so small that readers would take it for a bomb. Throws std::runtime_error when the entry or
    /// the archive becomes larger than readers accept, or the file cannot be written.
    void add(std::string_view name, std::span<const std::uint8_t> content, bool mayDeflate);

    /// Writes the directory. Nothing can be added any more.
    void finish();

private:
    struct FreeCompressor {
        void operator()(libdeflate_compressor* compressor) const noexcept;
    };

    std::span<const std::uint8_t> deflatedForm(std::string_view name,
                                               std::span<const std::uint8_t> content,
                                               std::uint32_t checksum, bool mayDeflate);
    std::size_t deflate(std::span<const std::uint8_t> content, std::size_t maxSize);
    std::size_t deflateIfWorthIt(std::span<const std::uint8_t> content);
    void checkLimits(std::string_view name, std::uint64_t size) const;
    void write(std::string_view bytes);

    AtomicFile& file_;
    ReusableEntries& previous_;
    std::unique_ptr<libdeflate_compressor, FreeCompressor> compressor_;
    std::unique_ptr<std::uint8_t[]> deflated_;  // the deflated form of the entry being written
    std::size_t deflatedCapacity_ = 0;
    std::string directory_;
    std::uint64_t entryCount_ = 0;
    std::uint64_t contentSize_ = 0;  // of all entries, before deflating
    std::uint64_t offset_ = 0;
};

}  // namespace platform::package::zip
