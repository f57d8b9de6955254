// SPDX-License-Identifier: Apache-2.0
#include "platform/package/zip/reusable_entries.h"

#include <chrono>
#include <exception>
#include <stdexcept>

#include "platform/package/zip/limits.h"

namespace platform::package::zip {

ReusableEntries::ReusableEntries(const std::string& path) {
    try {
        archive_.emplace(path, std::chrono::milliseconds(0));
        for (const Archive::Entry& entry : archive_->entries()) {
            byName_.try_emplace(entry.name, &entry);
        }
    } catch (const std::exception&) {
        // There is no such file, or it is not an archive: then everything is deflated.
        byName_.clear();
    }
}

std::span<const std::uint8_t> ReusableEntries::find(std::string_view name,
                                                    std::span<const std::uint8_t> content,
                                                    std::uint32_t checksum) noexcept {
    const auto found = byName_.find(name);
    if (found == byName_.end()) {
        return {};
    }
    const Archive::Entry& entry = *found->second;
    if (entry.size != content.size() || entry.checksum != checksum ||
        entry.compressedSize >= content.size() ||
        entry.compressedSize <= content.size() / maxExpansionRatio) {
        return {};
    }
    try {
        return archive_->readDeflatedForm(entry, content, scratch(content.size()));
    } catch (const std::exception&) {
        // The file is damaged or was changed, or there is no memory to look at it.
        return {};
    }
}

std::vector<std::uint8_t> ReusableEntries::read(std::string_view name, std::uint64_t maxSize) {
    const auto found = byName_.find(name);
    if (found == byName_.end() || found->second->size > maxSize) {
        throw std::runtime_error("is not there, or is too large");
    }
    std::vector<std::uint8_t> content(found->second->size);
    archive_->read(*found->second, content);
    return content;
}

// Room for `size` bytes.
std::span<std::uint8_t> ReusableEntries::scratch(std::size_t size) {
    if (scratchCapacity_ < size) {
        scratch_.reset();
        scratchCapacity_ = 0;
        scratch_ = std::make_unique_for_overwrite<std::uint8_t[]>(size);
        scratchCapacity_ = size;
    }
    return {scratch_.get(), size};
}

}  // namespace platform::package::zip
