// SPDX-License-Identifier: Apache-2.0
// The archive in which a bundle's file carries its manifest, made by the compiler: a zip archive
// without compression. It holds no times and no owners, so that equal sources make equal bundles.
//
//   local header of the folder <name>/               30 bytes and the entry's name
//   local header of the file <name>/manifest.json    30 bytes and the entry's name
//   the manifest
//   central record of the folder                     46 bytes and the entry's name
//   central record of the file                       46 bytes and the entry's name
//   end of the central directory                     22 bytes
//
// <name> is the bundle's symbolic name. Numbers are little-endian.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

namespace framework {
namespace detail {

struct ArchiveEntry {
    std::string_view folder;
    std::string_view file;
    std::string_view content;
    std::uint32_t unixMode;

    constexpr std::size_t nameSize() const { return folder.size() + 1 + file.size(); }
    constexpr std::size_t localSize() const { return 30 + nameSize() + content.size(); }
    constexpr std::size_t centralSize() const { return 46 + nameSize(); }
};

inline constexpr std::string_view manifestFileName = "manifest.json";

// Each entry has its name twice, once in each of its records.
constexpr std::size_t archiveSize(std::size_t symbolicNameSize, std::size_t manifestSize) {
    const std::size_t folderName = symbolicNameSize + 1;
    const std::size_t fileName = folderName + manifestFileName.size();
    return 2 * (30 + 46 + folderName + fileName) + manifestSize + 22;
}

constexpr std::uint32_t crc32(std::string_view bytes) {
    std::uint32_t crc = 0xFFFFFFFF;
    for (const char byte : bytes) {
        crc ^= static_cast<unsigned char>(byte);
        for (int bit = 0; bit < 8; ++bit) {
            crc = (crc >> 1) ^ ((crc & 1) != 0 ? 0xEDB88320 : 0);
        }
    }
    return ~crc;
}

// Writes the records one after the other to the bytes from `out` on.
class ArchiveWriter {
public:
    constexpr explicit ArchiveWriter(char* out) : out_(out) {}

    constexpr void local(const ArchiveEntry& entry) {
        text("PK\3\4");
        describe(entry);
        name(entry);
        text(entry.content);
    }

    constexpr void central(const ArchiveEntry& entry, std::size_t localOffset) {
        text("PK\1\2");
        number16(0x0314);  // made by version 2.0 on Unix
        describe(entry);
        number16(0);  // no comment
        number16(0);  // disk number
        number16(0);  // internal attributes
        number32(entry.unixMode << 16);
        number32(localOffset);
        name(entry);
    }

    constexpr void end(std::size_t entries, std::size_t centralSize, std::size_t centralOffset) {
        text("PK\5\6");
        number16(0);  // disk number
        number16(0);  // disk with the central directory
        number16(entries);
        number16(entries);
        number32(centralSize);
        number32(centralOffset);
        number16(0);  // no comment
    }

private:
    // What the two records of an entry have in common.
    constexpr void describe(const ArchiveEntry& entry) {
        number16(20);      // needs version 2.0
        number16(0);       // no flags
        number16(0);       // stored
        number16(0);       // 00:00:00
        number16(0x0021);  // 1980-01-01
        number32(crc32(entry.content));
        number32(entry.content.size());
        number32(entry.content.size());
        number16(entry.nameSize());
        number16(0);  // no extra field
    }

    constexpr void name(const ArchiveEntry& entry) {
        text(entry.folder);
        text("/");
        text(entry.file);
    }

    constexpr void text(std::string_view bytes) {
        for (const char byte : bytes) {
            *out_++ = byte;
        }
    }

    constexpr void number16(std::size_t number) {
        *out_++ = static_cast<char>(number & 0xFF);
        *out_++ = static_cast<char>(number >> 8 & 0xFF);
    }

    constexpr void number32(std::size_t number) {
        number16(number);
        number16(number >> 16);
    }

    char* out_;
};

}  // namespace detail

/// The archive with the folder `symbolicName` and in it a file manifest.json with the text
/// `manifest`. Both are string literals; their terminating zeros are left out.
template <std::size_t NameSize, std::size_t ManifestSize>
consteval auto manifestArchive(const char (&symbolicName)[NameSize],
                               const char (&manifest)[ManifestSize]) {
    const std::string_view name(symbolicName, NameSize - 1);
    const detail::ArchiveEntry folder{name, "", "", 040755};
    const detail::ArchiveEntry file{
        name, detail::manifestFileName, {manifest, ManifestSize - 1}, 0100644};
    const std::size_t centralOffset = folder.localSize() + file.localSize();

    std::array<char, detail::archiveSize(NameSize - 1, ManifestSize - 1)> archive{};
    detail::ArchiveWriter writer(archive.data());
    writer.local(folder);
    writer.local(file);
    writer.central(folder, 0);
    writer.central(file, folder.localSize());
    writer.end(2, folder.centralSize() + file.centralSize(), centralOffset);
    return archive;
}

}  // namespace framework
