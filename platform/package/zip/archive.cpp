// SPDX-License-Identifier: Apache-2.0
#include "platform/package/zip/archive.h"

#include <libdeflate.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <new>
#include <optional>
#include <stdexcept>
#include <string_view>
#include <system_error>
#include <utility>

#include "platform/package/zip/format.h"
#include "platform/package/zip/limits.h"
#include "platform/package/zip/little_endian.h"
#include "platform/package/zip/names.h"
#include "platform/posix/system_error.h"
#include "platform/text/quoted.h"

namespace platform::package::zip {
namespace {

using text::quoted;
using Bytes = std::span<const std::uint8_t>;

[[noreturn]] void fail(const std::string& problem) {
    throw std::runtime_error(problem);
}

[[noreturn]] void failForEntry(const std::string& name, const std::string& problem) {
    fail("entry " + quoted(name) + " " + problem);
}

FileDescriptor openArchive(const std::string& path, std::chrono::milliseconds patience,
                           std::uint64_t& size) {
    OpenedFile opened = openRegularFile(path, patience);
    if (opened.error != 0) {
        throw std::system_error(opened.error, std::generic_category(), "cannot be opened");
    }
    if (!opened.descriptor) {
        fail(S_ISDIR(opened.status.st_mode) ? "is a folder" : "is not a regular file");
    }
    size = static_cast<std::uint64_t>(opened.status.st_size);
    return std::move(opened.descriptor);
}

std::string_view asText(Bytes bytes) {
    return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

// The content of the extra field `id`, or nothing. Malformed data ends the search.
std::optional<Bytes> extraField(Bytes extra, std::uint16_t id) {
    while (extra.size() >= 4) {
        const std::size_t length = read16(extra, 2);
        if (length > extra.size() - 4) {
            break;
        }
        if (read16(extra, 0) == id) {
            return extra.subspan(4, length);
        }
        extra = extra.subspan(4 + length);
    }
    return std::nullopt;
}

// Names are UTF-8 if they say so or are valid UTF-8 (many producers do not say so), otherwise code
// page 437, unless an extra field made for this very name has its Unicode form.
std::string decodeName(Bytes name, Bytes extra, std::uint16_t flags) {
    constexpr std::size_t versionAndChecksum = 5;
    if (asText(name).find('\0') != std::string_view::npos) {
        failForEntry(printable(asText(name)), "has a zero in its name");
    }
    if (isUtf8(asText(name))) {
        return std::string(asText(name));
    }
    if ((flags & utf8Flag) != 0) {
        failForEntry(printable(asText(name)), "has a name that is not valid UTF-8");
    }
    const std::optional<Bytes> unicode = extraField(extra, unicodePathExtra);
    if (unicode && unicode->size() > versionAndChecksum && (*unicode)[0] == 1 &&
        read32(*unicode, 1) == libdeflate_crc32(0, name.data(), name.size())) {
        const std::string_view text = asText(unicode->subspan(versionAndChecksum));
        if (isUtf8(text)) {
            return std::string(text);
        }
    }
    return fromCodePage437(asText(name));
}

// Replaces the numbers of `entry` that did not fit their fields by those of the ZIP64 extra field.
void readZip64Numbers(Archive::Entry& entry, Bytes extra) {
    const Bytes numbers = extraField(extra, zip64Extra).value_or(Bytes());
    std::size_t at = 0;
    for (std::uint64_t* number : {&entry.size, &entry.compressedSize, &entry.offset}) {
        if (*number != notIn32Bits) {
            continue;
        }
        if (numbers.size() < at + 8) {
            failForEntry(entry.name, "lacks its ZIP64 sizes");
        }
        *number = read64(numbers, at);
        at += 8;
    }
}

// Describes, by its first bytes, a file in which no archive was found.
[[noreturn]] void failWithoutEndRecord(Bytes start) {
    constexpr std::array<std::uint8_t, 8> compoundFile = {0xD0, 0xCF, 0x11, 0xE0,
                                                          0xA1, 0xB1, 0x1A, 0xE1};
    if (start.empty()) {
        fail("is empty");
    }
    if (std::equal(compoundFile.begin(), compoundFile.end(), start.begin(), start.end())) {
        fail("is not a zip archive but a compound file, as encrypted and old office documents are");
    }
    if (start.size() >= 2 && start[0] == 'P' && start[1] == 'K') {
        fail("is a truncated zip archive: its directory is missing");
    }
    fail("is not a zip archive");
}

}  // namespace

void Archive::FreeDecompressor::operator()(libdeflate_decompressor* decompressor) const noexcept {
    libdeflate_free_decompressor(decompressor);
}

Archive::Archive(const std::string& path, std::chrono::milliseconds patience)
    : file_(openArchive(path, patience, fileSize_)),
      decompressor_(libdeflate_alloc_decompressor()) {
    if (!decompressor_) {
        throw std::bad_alloc();
    }
    const Directory directory = findDirectory();
    if (directory.entryCount > maxEntries) {
        fail("has too many entries: " + std::to_string(directory.entryCount) + ", at most " +
             std::to_string(maxEntries) + " are accepted");
    }
    if (directory.size > maxDirectoryBytes) {
        fail("has a directory of " + std::to_string(directory.size) + " bytes, at most " +
             std::to_string(maxDirectoryBytes) + " are accepted");
    }
    readDirectory(directory);
    checkLayout(directory.offset);
}

// The end record is the last thing in the file but for its comment, in which its signature may
// occur by chance: the last record whose directory lies before it is taken.
Archive::Directory Archive::findDirectory() const {
    constexpr std::uint64_t maxCommentSize = 0xFFFF;
    const std::uint64_t tailSize = std::min(fileSize_, zip64LocatorSize + endSize + maxCommentSize);
    std::vector<std::uint8_t> bytes(tailSize);
    const std::uint64_t tailOffset = fileSize_ - tailSize;
    readAt(tailOffset, bytes);

    for (std::size_t at = bytes.size() < endSize ? 0 : bytes.size() - endSize + 1; at-- > 0;) {
        const Bytes tail = bytes;
        if (read32(tail, at) != endSignature) {
            continue;
        }
        const Bytes record = tail.subspan(at, endSize);
        if (at >= zip64LocatorSize &&
            read32(tail, at - zip64LocatorSize) == zip64LocatorSignature) {
            return findZip64Directory(tailOffset + at - zip64LocatorSize);
        }
        const Directory directory{read16(record, 10), read32(record, 16), read32(record, 12)};
        if (directory.offset + directory.size > tailOffset + at) {
            continue;
        }
        if (read16(record, 4) != 0 || read16(record, 8) != directory.entryCount) {
            fail("is a zip archive that is split over several files");
        }
        return directory;
    }
    std::vector<std::uint8_t> start(std::min<std::uint64_t>(fileSize_, 8));
    readAt(0, start);
    failWithoutEndRecord(start);
}

Archive::Directory Archive::findZip64Directory(std::uint64_t locatorOffset) const {
    std::array<std::uint8_t, zip64LocatorSize> locator{};
    readAt(locatorOffset, locator);
    const std::uint64_t offset = read64(locator, 8);
    if (offset > locatorOffset || locatorOffset - offset < zip64EndSize) {
        fail("is a damaged zip archive: its ZIP64 end record is missing");
    }
    std::array<std::uint8_t, zip64EndSize> record{};
    readAt(offset, record);
    if (read32(record, 0) != zip64EndSignature) {
        fail("is a damaged zip archive: its ZIP64 end record is missing");
    }
    const Directory directory{read64(record, 32), read64(record, 48), read64(record, 40)};
    if (directory.offset > offset || directory.size > offset - directory.offset) {
        fail("is a damaged zip archive: its directory reaches past its end record");
    }
    if (read64(record, 24) != directory.entryCount) {
        fail("is a zip archive that is split over several files");
    }
    return directory;
}

void Archive::readDirectory(const Directory& directory) {
    std::vector<std::uint8_t> bytes(directory.size);
    readAt(directory.offset, bytes);
    Bytes rest = bytes;
    entries_.reserve(directory.entryCount);
    for (std::uint64_t i = 0; i < directory.entryCount; ++i) {
        if (rest.size() < directoryEntrySize || read32(rest, 0) != directorySignature) {
            fail("is a damaged zip archive: its directory has no entry " + std::to_string(i + 1) +
                 " of " + std::to_string(directory.entryCount));
        }
        const std::size_t nameSize = read16(rest, 28);
        const std::size_t extraSize = read16(rest, 30);
        const std::size_t size = directoryEntrySize + nameSize + extraSize + read16(rest, 32);
        if (rest.size() < size) {
            fail("is a damaged zip archive: its directory is cut off");
        }
        Entry& entry = entries_.emplace_back();
        entry.flags = read16(rest, 8);
        entry.method = read16(rest, 10);
        entry.checksum = read32(rest, 16);
        entry.compressedSize = read32(rest, 20);
        entry.size = read32(rest, 24);
        entry.offset = read32(rest, 42);
        const Bytes extra = rest.subspan(directoryEntrySize + nameSize, extraSize);
        if ((entry.flags & maskedDirectoryFlag) != 0) {
            fail("is encrypted");
        }
        entry.name = decodeName(rest.subspan(directoryEntrySize, nameSize), extra, entry.flags);
        readZip64Numbers(entry, extra);
        rest = rest.subspan(size);
    }
    if (rest.size() >= 4 && read32(rest, 0) == directorySignature) {
        fail("is a damaged zip archive: its directory has more entries than it says");
    }
}

// Refuses entries that share bytes, with which a small archive could claim any amount of data.
void Archive::checkLayout(std::uint64_t dataEnd) const {
    std::vector<const Entry*> byOffset;
    byOffset.reserve(entries_.size());
    for (const Entry& entry : entries_) {
        if (entry.offset > dataEnd || entry.compressedSize > dataEnd ||
            localHeaderSize + entry.compressedSize > dataEnd - entry.offset) {
            failForEntry(entry.name, "reaches past the end of the archive's data");
        }
        byOffset.push_back(&entry);
    }
    std::sort(byOffset.begin(), byOffset.end(),
              [](const Entry* a, const Entry* b) { return a->offset < b->offset; });
    std::uint64_t end = 0;
    for (const Entry* entry : byOffset) {
        if (entry->offset < end) {
            failForEntry(entry->name, "overlaps another entry");
        }
        end = entry->offset + localHeaderSize + entry->compressedSize;
    }
}

void Archive::requireWithinLimits(std::span<const Entry* const> entries) const {
    std::uint64_t total = 0;
    for (const Entry* entry : entries) {
        if (entry->size > maxEntryBytes) {
            failForEntry(entry->name, "is too large: " + std::to_string(entry->size) +
                                          " bytes, at most " + std::to_string(maxEntryBytes) +
                                          " are accepted");
        }
        if (entry->method == methodDeflated &&
            entry->size / maxDeflateRatio > entry->compressedSize) {
            failForEntry(entry->name, "has a wrong size: its data cannot expand to " +
                                          std::to_string(entry->size) + " bytes");
        }
        total += entry->size;
    }
    if (total > maxTotalBytes) {
        fail("is too large: it expands to " + std::to_string(total) + " bytes, at most " +
             std::to_string(maxTotalBytes) + " are accepted");
    }
    if (total > harmlessBytes && total / maxExpansionRatio >= fileSize_) {
        fail("expands too much: from " + std::to_string(fileSize_) + " to " +
             std::to_string(total) + " bytes");
    }
}

void Archive::read(const Entry& entry, std::span<std::uint8_t> out) {
    if ((entry.flags & encryptedFlag) != 0) {
        fail("is encrypted");
    }
    const std::uint64_t offset = dataOffset(entry);
    if (entry.method == methodStored) {
        if (entry.size != entry.compressedSize) {
            fail("is damaged (wrong size)");
        }
        readAt(offset, out);
    } else if (entry.method == methodDeflated) {
        expand(entry, offset, out);
    } else {
        fail("is compressed with the unknown method " + std::to_string(entry.method));
    }
    if (libdeflate_crc32(0, out.data(), out.size()) != entry.checksum) {
        fail("is damaged (CRC)");
    }
}

// The name and the extra field of the local header may differ from the directory's.
std::uint64_t Archive::dataOffset(const Entry& entry) const {
    std::array<std::uint8_t, localHeaderSize> header{};
    readAt(entry.offset, header);
    if (read32(header, 0) != localSignature) {
        fail("is damaged (no header where the directory says)");
    }
    return entry.offset + localHeaderSize + read16(header, 26) + read16(header, 28);
}

void Archive::expand(const Entry& entry, std::uint64_t offset, std::span<std::uint8_t> out) {
    if (entry.compressedSize == 0 && out.empty()) {
        return;  // some producers write no bytes at all for empty content
    }
    const Bytes compressed = readCompressed(entry, offset);
    switch (libdeflate_deflate_decompress(decompressor_.get(), compressed.data(), compressed.size(),
                                          out.data(), out.size(), nullptr)) {
        case LIBDEFLATE_SUCCESS:
            return;
        case LIBDEFLATE_SHORT_OUTPUT:
        case LIBDEFLATE_INSUFFICIENT_SPACE:
            fail("is damaged (wrong size)");
        default:
            fail("is damaged (its compressed data is broken)");
    }
}

Bytes Archive::readDeflatedForm(const Entry& entry, Bytes content,
                                std::span<std::uint8_t> scratch) {
    if ((entry.flags & (encryptedFlag | strongEncryptionFlag)) != 0 ||
        entry.method != methodDeflated || entry.size != content.size()) {
        return {};
    }
    const Bytes compressed = readCompressed(entry, dataOffset(entry));
    std::size_t streamSize = 0;
    const libdeflate_result result =
        libdeflate_deflate_decompress_ex(decompressor_.get(), compressed.data(), compressed.size(),
                                         scratch.data(), content.size(), &streamSize, nullptr);
    const bool isSame = result == LIBDEFLATE_SUCCESS && streamSize == compressed.size() &&
                        std::equal(content.begin(), content.end(), scratch.begin());
    return isSame ? compressed : Bytes();
}

Bytes Archive::readCompressed(const Entry& entry, std::uint64_t offset) {
    if (compressedCapacity_ < entry.compressedSize) {
        compressed_.reset();
        compressedCapacity_ = 0;
        compressed_ = std::make_unique_for_overwrite<std::uint8_t[]>(entry.compressedSize);
        compressedCapacity_ = entry.compressedSize;
    }
    const std::span<std::uint8_t> compressed(compressed_.get(), entry.compressedSize);
    readAt(offset, compressed);
    return compressed;
}

void Archive::readAt(std::uint64_t offset, std::span<std::uint8_t> out) const {
    while (!out.empty()) {
        const ssize_t count =
            ::pread(file_.get(), out.data(), out.size(), static_cast<off_t>(offset));
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count < 0) {
            platform::throwSystemError("cannot be read");
        }
        if (count == 0) {
            fail("is truncated");
        }
        offset += static_cast<std::uint64_t>(count);
        out = out.subspan(static_cast<std::size_t>(count));
    }
}

}  // namespace platform::package::zip
