#include "host/document_kind.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <fstream>
#include <string>
#include <string_view>
#include <system_error>

// What is read of a zip archive; numbers are little-endian:
//
//     local header              "PK\3\4" ...                          the file begins with one
//     ...
//     central directory entry   "PK\1\2"                              one for each item
//         +28 (2 bytes)         length of the name
//         +30 (2)               length of the extra field
//         +32 (2)               length of the comment
//         +46                   name, extra field, comment
//     ...
//     end of central directory  "PK\5\6"                              within the last 65557 bytes
//         +12 (4)               size of the central directory
//         +16 (4)               its offset from the beginning of the file
//         +20 (2)               length of the archive's comment, which follows and ends the file
//
// The 64-bit forms are not looked at: an archive needs them from 65535 items or 4 GiB on.

namespace host {

namespace {

constexpr std::string_view localHeaderMark{"PK\3\4", 4};
constexpr std::string_view directoryEntryMark{"PK\1\2", 4};
constexpr std::string_view directoryEndMark{"PK\5\6", 4};
constexpr std::size_t directoryEntrySize = 46;
constexpr std::size_t directoryEndSize = 22;
constexpr std::size_t longestComment = 0xFFFF;
// Content types are themselves an item of the package, whole or in pieces below this name.
constexpr std::string_view contentTypesName = "[content_types].xml";

std::uint32_t numberAt(std::string_view bytes, std::size_t offset, std::size_t size) {
    std::uint32_t number = 0;
    for (std::size_t i = size; i-- > 0;) {
        number = number << 8 | static_cast<unsigned char>(bytes[offset + i]);
    }
    return number;
}

// The `size` bytes at `offset`, or what the file has of them.
std::string bytesAt(std::ifstream& file, std::uint64_t offset, std::size_t size) {
    std::string bytes(size, '\0');
    file.clear();
    file.seekg(static_cast<std::streamoff>(offset));
    file.read(bytes.data(), static_cast<std::streamsize>(size));
    bytes.resize(static_cast<std::size_t>(std::max<std::streamsize>(file.gcount(), 0)));
    return bytes;
}

bool isContentTypes(std::string_view name) {
    std::string lower(name);
    std::transform(lower.begin(), lower.end(), lower.begin(), [](char c) {
        return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
    });
    return lower == contentTypesName || lower.starts_with(std::string(contentTypesName) + "/");
}

bool listsContentTypes(std::string_view directory) {
    while (directory.size() >= directoryEntrySize && directory.starts_with(directoryEntryMark)) {
        const std::size_t nameSize = numberAt(directory, 28, 2);
        const std::size_t entrySize =
            directoryEntrySize + nameSize + numberAt(directory, 30, 2) + numberAt(directory, 32, 2);
        if (isContentTypes(directory.substr(directoryEntrySize, nameSize))) {
            return true;
        }
        directory.remove_prefix(std::min(entrySize, directory.size()));
    }
    return false;
}

}  // namespace

bool isDocumentPackage(const std::filesystem::path& file) {
    std::error_code error;
    if (!std::filesystem::is_regular_file(file, error)) {
        return false;
    }
    const std::uint64_t fileSize = std::filesystem::file_size(file, error);
    std::ifstream stream(file, std::ios::binary);
    if (error || bytesAt(stream, 0, localHeaderMark.size()) != localHeaderMark) {
        return false;
    }
    const std::size_t tailSize = static_cast<std::size_t>(
        std::min<std::uint64_t>(fileSize, directoryEndSize + longestComment));
    const std::string tail = bytesAt(stream, fileSize - tailSize, tailSize);
    const std::size_t end = tail.rfind(directoryEndMark);
    if (end == std::string::npos || tail.size() - end < directoryEndSize) {
        return false;
    }
    const std::uint64_t directorySize = numberAt(tail, end + 12, 4);
    const std::uint64_t directoryOffset = numberAt(tail, end + 16, 4);
    if (directoryOffset > fileSize || directorySize > fileSize - directoryOffset) {
        return false;
    }
    return listsContentTypes(
        bytesAt(stream, directoryOffset, static_cast<std::size_t>(directorySize)));
}

}  // namespace host
