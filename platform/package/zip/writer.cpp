// SPDX-License-Identifier: Apache-2.0
#include "platform/package/zip/writer.h"

#include <libdeflate.h>

#include <algorithm>
#include <new>
#include <stdexcept>

#include "platform/package/zip/format.h"
#include "platform/package/zip/limits.h"
#include "platform/package/zip/little_endian.h"

namespace platform::package::zip {
namespace {

constexpr int compressionLevel = 6;
constexpr std::uint16_t versionNeeded = 20;
constexpr std::uint16_t dosDate = 1U << 5U | 1U;  // 1 January 1980, the earliest date

// All offsets fit their fields: content, and names in local headers and in the directory.
static_assert(maxTotalBytes + 2 * maxDirectoryBytes < notIn32Bits);
static_assert(maxEntries < notIn16Bits);

bool isAscii(std::string_view text) {
    return std::all_of(text.begin(), text.end(), [](char c) { return (c & 0x80) == 0; });
}

}  // namespace

void Writer::FreeCompressor::operator()(libdeflate_compressor* compressor) const noexcept {
    libdeflate_free_compressor(compressor);
}

Writer::Writer(AtomicFile& file, ReusableEntries& previous)
    : file_(file), previous_(previous), compressor_(libdeflate_alloc_compressor(compressionLevel)) {
    if (!compressor_) {
        throw std::bad_alloc();
    }
}

void Writer::add(std::string_view name, std::span<const std::uint8_t> content, bool mayDeflate) {
    checkLimits(name, content.size());
    const std::uint32_t checksum = libdeflate_crc32(0, content.data(), content.size());
    const std::span<const std::uint8_t> deflated =
        deflatedForm(name, content, checksum, mayDeflate);
    const bool isDeflated = !deflated.empty();
    const std::span<const std::uint8_t> data = isDeflated ? deflated : content;

    // What the local header and the directory's entry have in common.
    std::string common;
    append16(common, versionNeeded);
    append16(common, isAscii(name) ? 0 : utf8Flag);
    append16(common, isDeflated ? methodDeflated : methodStored);
    append16(common, 0);  // midnight
    append16(common, dosDate);
    append32(common, checksum);
    append32(common, static_cast<std::uint32_t>(data.size()));
    append32(common, static_cast<std::uint32_t>(content.size()));
    append16(common, static_cast<std::uint16_t>(name.size()));
    append16(common, 0);  // extra

    append32(directory_, directorySignature);
    append16(directory_, versionNeeded);
    directory_.append(common);
    directory_.append(10, '\0');  // comment length, disk, attributes
    append32(directory_, static_cast<std::uint32_t>(offset_));
    directory_.append(name);

    std::string header;
    append32(header, localSignature);
    header.append(common).append(name);
    write(header);
    write({reinterpret_cast<const char*>(data.data()), data.size()});
    ++entryCount_;
    contentSize_ += content.size();
}

void Writer::finish() {
    const std::uint64_t directoryOffset = offset_;
    write(directory_);
    std::string end;
    append32(end, endSignature);
    append32(end, 0);  // disks
    append16(end, static_cast<std::uint16_t>(entryCount_));
    append16(end, static_cast<std::uint16_t>(entryCount_));
    append32(end, static_cast<std::uint32_t>(directory_.size()));
    append32(end, static_cast<std::uint32_t>(directoryOffset));
    append16(end, 0);  // comment length
    write(end);
}

// The deflated form of `content`, or nothing if it is to be stored.
std::span<const std::uint8_t> Writer::deflatedForm(std::string_view name,
                                                   std::span<const std::uint8_t> content,
                                                   std::uint32_t checksum, bool mayDeflate) {
    if (const auto known = previous_.find(name, content, checksum); !known.empty()) {
        return known;
    }
    const std::size_t size = mayDeflate ? deflateIfWorthIt(content) : 0;
    return {deflated_.get(), size};
}

// Deflates `content` into deflated_. Returns the size, or zero if that exceeds `maxSize`. Parts of
// the buffer that are not written take no memory.
std::size_t Writer::deflate(std::span<const std::uint8_t> content, std::size_t maxSize) {
    if (deflatedCapacity_ < maxSize) {
        deflated_.reset();
        deflated_ = std::make_unique_for_overwrite<std::uint8_t[]>(maxSize);
        deflatedCapacity_ = maxSize;
    }
    return libdeflate_deflate_compress(compressor_.get(), content.data(), content.size(),
                                       deflated_.get(), maxSize);
}

// Returns the size of the deflated form in deflated_, or zero to store the content. Large content
// is tried on a sample first, taken from the middle because headers compress even where the rest
// does not.
std::size_t Writer::deflateIfWorthIt(std::span<const std::uint8_t> content) {
    constexpr std::size_t sampleSize = 65'536;
    constexpr std::size_t worthwhile = sampleSize - sampleSize / 32;
    if (content.empty()) {
        return 0;
    }
    if (content.size() > 4 * sampleSize &&
        deflate(content.subspan(content.size() / 2, sampleSize), worthwhile) == 0) {
        return 0;
    }
    const std::size_t size = deflate(content, content.size() - 1);
    return content.size() / maxExpansionRatio < size ? size : 0;
}

void Writer::checkLimits(std::string_view name, std::uint64_t size) const {
    constexpr std::size_t maxNameSize = 0xFFFF;
    if (size > maxEntryBytes) {
        throw std::runtime_error("is too large: " + std::to_string(size) + " bytes, at most " +
                                 std::to_string(maxEntryBytes) + " are accepted");
    }
    if (size > maxTotalBytes - contentSize_) {
        throw std::runtime_error("makes the package larger than " + std::to_string(maxTotalBytes) +
                                 " bytes");
    }
    if (entryCount_ == maxEntries || name.size() > maxNameSize ||
        directory_.size() + directoryEntrySize + name.size() > maxDirectoryBytes) {
        throw std::runtime_error("has one part too many, or too long a name");
    }
}

void Writer::write(std::string_view bytes) {
    file_.write(bytes);
    offset_ += bytes.size();
}

}  // namespace platform::package::zip
