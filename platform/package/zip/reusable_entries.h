// SPDX-License-Identifier: Apache-2.0
// Deflating takes most of the time of a save, and nearly every save changes one part of a document
// that is on disk already. So the deflated bytes of unchanged entries are copied from there.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/package/zip/archive.h"

namespace platform::package::zip {

/// The entries of an archive that is about to be replaced, whichever program wrote it. The
/// file may be anything, and may vanish, be cut short or written to at any time: what cannot be
/// read from it counts as absent.
class ReusableEntries {
public:
    /// Reads the directory of the archive at the UTF-8 `path`, without waiting for a lease on it.
    /// Takes time and memory in proportion to its directory.
    explicit ReusableEntries(const std::string& path);

    /// The deflated bytes of the entry `name` if they expand to exactly `content`, of which
    /// `checksum` is the CRC-32, and are as the writer would write them: smaller, but not so small
    /// that readers would think them a decompression bomb. Else nothing. Valid until the next call.
    /// All bytes are compared: the checksum only spares expanding what has changed. Takes memory
    /// for the largest content once more.
    std::span<const std::uint8_t> find(std::string_view name, std::span<const std::uint8_t> content,
                                       std::uint32_t checksum) noexcept;

    /// The content of the entry `name`. Throws std::runtime_error when there is none, it is longer
    /// than `maxSize` bytes, or it cannot be read.
    std::vector<std::uint8_t> read(std::string_view name, std::uint64_t maxSize);

private:
    std::span<std::uint8_t> scratch(std::size_t size);

    std::optional<Archive> archive_;
    std::unordered_map<std::string_view, const Archive::Entry*> byName_;  // in archive_
    std::unique_ptr<std::uint8_t[]> scratch_;
    std::size_t scratchCapacity_ = 0;
};

}  // namespace platform::package::zip
