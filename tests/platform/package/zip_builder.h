// SPDX-License-Identifier: Apache-2.0
// Builds zip archives in memory for the tests, honest ones and ones that lie in any field.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace test {

struct ZipEntry {
    ZipEntry(std::string entryName = {}, std::string content = {}, bool isDeflated = false)
        : name(std::move(entryName)), data(std::move(content)), deflated(isDeflated) {}

    std::string name;
    std::string data;
    bool deflated;

    // What the headers say, where that is not the truth.
    std::optional<std::uint32_t> checksum;
    std::optional<std::uint64_t> size;
    std::optional<std::uint64_t> compressedSize;
    std::optional<std::uint16_t> method;
    std::optional<std::uint64_t> offset;
    std::uint16_t flags = 0;
    std::string extra;                     // of the directory's entry
    std::optional<std::string> localName;  // of the local header
    bool hasDataDescriptor = false;
    bool isZip64 = false;
};

struct ZipOptions {
    std::string prefix;   // before the first entry, and counted in the offsets
    std::string comment;  // of the archive
    std::string suffix;   // after the end of the archive
    bool isZip64 = false;
    std::uint16_t disk = 0;
    std::optional<std::uint64_t> entryCount;
    std::optional<std::uint64_t> directorySize;
    std::optional<std::uint64_t> directoryOffset;
    std::optional<std::uint64_t> zip64EndOffset;
};

std::string buildZip(const std::vector<ZipEntry>& entries, const ZipOptions& options = {});

/// `data` as a raw deflate stream, made at `level` of libdeflate's.
std::string deflate(const std::string& data, int level = 9);

/// The CRC-32 of `data`.
std::uint32_t checksum(const std::string& data);

/// Little-endian numbers.
std::string bytes16(std::uint64_t value);
std::string bytes32(std::uint64_t value);
std::string bytes64(std::uint64_t value);

}  // namespace test
