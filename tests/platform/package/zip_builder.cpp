// SPDX-License-Identifier: Apache-2.0
#include "tests/platform/package/zip_builder.h"

#include <libdeflate.h>

#include <cstddef>
#include <stdexcept>

namespace test {
namespace {

std::string littleEndian(std::uint64_t value, int count) {
    std::string bytes;
    for (int i = 0; i < count; ++i) {
        bytes += static_cast<char>(value >> (8 * i));
    }
    return bytes;
}

constexpr std::uint64_t allOnes = 0xFFFFFFFF;

struct Header {
    std::uint16_t flags;
    std::uint16_t method;
    std::uint32_t checksum;
    std::uint64_t compressedSize;
    std::uint64_t size;
};

std::string middle(const Header& header) {
    return bytes16(header.flags) + bytes16(header.method) + bytes16(0) + bytes16(0x21) +
           bytes32(header.checksum) + bytes32(header.compressedSize) + bytes32(header.size);
}

std::string localHeader(const ZipEntry& entry, Header header) {
    const std::string name = entry.localName.value_or(entry.name);
    if (entry.hasDataDescriptor) {
        header.checksum = 0;
        header.compressedSize = 0;
        header.size = 0;
    }
    return "PK\3\4" + bytes16(20) + middle(header) + bytes16(name.size()) + bytes16(0) + name;
}

std::string dataDescriptor(const Header& header) {
    return "PK\7\10" + bytes32(header.checksum) + bytes32(header.compressedSize) +
           bytes32(header.size);
}

std::string directoryEntry(const ZipEntry& entry, Header header, std::uint64_t offset) {
    std::string extra = entry.extra;
    if (entry.isZip64) {
        extra += bytes16(1) + bytes16(24) + bytes64(header.size) + bytes64(header.compressedSize) +
                 bytes64(offset);
        header.size = header.compressedSize = offset = allOnes;
    }
    return "PK\1\2" + bytes16(20) + bytes16(20) + middle(header) + bytes16(entry.name.size()) +
           bytes16(extra.size()) + bytes16(0) + bytes16(0) + bytes16(0) + bytes32(0) +
           bytes32(offset) + entry.name + extra;
}

}  // namespace

std::string bytes16(std::uint64_t value) {
    return littleEndian(value, 2);
}

std::string bytes32(std::uint64_t value) {
    return littleEndian(value, 4);
}

std::string bytes64(std::uint64_t value) {
    return littleEndian(value, 8);
}

std::string deflate(const std::string& data, int level) {
    libdeflate_compressor* compressor = libdeflate_alloc_compressor(level);
    std::string deflated(libdeflate_deflate_compress_bound(compressor, data.size()), '\0');
    deflated.resize(libdeflate_deflate_compress(compressor, data.data(), data.size(),
                                                deflated.data(), deflated.size()));
    libdeflate_free_compressor(compressor);
    return deflated;
}

std::uint32_t checksum(const std::string& data) {
    return libdeflate_crc32(0, data.data(), data.size());
}

std::string buildZip(const std::vector<ZipEntry>& entries, const ZipOptions& options) {
    std::string archive = options.prefix;
    std::string directory;
    for (const ZipEntry& entry : entries) {
        const std::string data = entry.deflated ? deflate(entry.data) : entry.data;
        const std::uint16_t flags =
            static_cast<std::uint16_t>(entry.flags | (entry.hasDataDescriptor ? 8 : 0));
        const std::uint16_t method = entry.deflated ? 8 : 0;
        const Header header{
            flags, entry.method.value_or(method), entry.checksum.value_or(checksum(entry.data)),
            entry.compressedSize.value_or(data.size()), entry.size.value_or(entry.data.size())};
        directory += directoryEntry(entry, header, entry.offset.value_or(archive.size()));
        archive += localHeader(entry, header) + data;
        if (entry.hasDataDescriptor) {
            archive += dataDescriptor(header);
        }
    }
    const std::uint64_t count = options.entryCount.value_or(entries.size());
    const std::uint64_t size = options.directorySize.value_or(directory.size());
    const std::uint64_t offset = options.directoryOffset.value_or(archive.size());
    archive += directory;
    if (options.isZip64) {
        const std::uint64_t end = options.zip64EndOffset.value_or(archive.size());
        archive += "PK\6\6" + bytes64(44) + bytes16(45) + bytes16(45) + bytes32(0) + bytes32(0) +
                   bytes64(count) + bytes64(count) + bytes64(size) + bytes64(offset);
        archive += "PK\6\7" + bytes32(0) + bytes64(end) + bytes32(1);
        archive += "PK\5\6" + bytes16(0) + bytes16(0) + bytes16(0xFFFF) + bytes16(0xFFFF) +
                   bytes32(allOnes) + bytes32(allOnes);
    } else {
        archive += "PK\5\6" + bytes16(options.disk) + bytes16(options.disk) + bytes16(count) +
                   bytes16(count) + bytes32(size) + bytes32(offset);
    }
    return archive + bytes16(options.comment.size()) + options.comment + options.suffix;
}

}  // namespace test
