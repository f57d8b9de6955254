// SPDX-License-Identifier: Apache-2.0
#include "host/commands/document_kind.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <fstream>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>

// What is read of a zip archive; numbers are little-endian:
//
//     local header              "PK\3\4"                              the file begins with one
//         +26 (2 bytes)         length of the name
//         +30                   name
//     ...
//     central directory entry   "PK\1\2"                              one for each item
//         +28 (2 bytes)         length of the name
//         +30 (2)               length of the extra field
//         +32 (2)               length of the comment
//         +46                   name, extra field, comment
//     ...
//     64-bit end                "PK\6\6"                              only in large archives
//         +40 (8)               size of the central directory
//         +48 (8)               its offset from the beginning of the file
//     64-bit end's locator      "PK\6\7"                              with the above; 20 bytes
//         +8 (8)                offset of the 64-bit end
//     end of central directory  "PK\5\6"                              within the last 65557 bytes
//         +12 (4)               size of the central directory
//         +16 (4)               its offset from the beginning of the file
//         +20 (2)               length of the archive's comment, which follows and ends the file

namespace host {

namespace {

constexpr std::string_view localHeaderMark{"PK\3\4", 4};
constexpr std::string_view directoryEntryMark{"PK\1\2", 4};
constexpr std::string_view directoryEndMark{"PK\5\6", 4};
constexpr std::string_view largeEndMark{"PK\6\6", 4};
constexpr std::string_view locatorMark{"PK\6\7", 4};
constexpr std::size_t localHeaderSize = 30;
constexpr std::size_t directoryEntrySize = 46;
constexpr std::size_t directoryEndSize = 22;
constexpr std::size_t largeEndSize = 56;
constexpr std::size_t locatorSize = 20;
// What is looked at of a directory; documents have a hundredth of it.
constexpr std::uint64_t mostOfADirectory = std::uint64_t{16} * 1024 * 1024;
constexpr std::size_t longestComment = 0xFFFF;
// Content types are themselves an item of the package, whole or in pieces below this name.
constexpr std::string_view contentTypesName = "[content_types].xml";

std::uint64_t numberAt(std::string_view bytes, std::size_t offset, std::size_t size) {
    std::uint64_t number = 0;
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
        const auto nameSize = numberAt(directory, 28, 2);
        const std::uint64_t entrySize =
            directoryEntrySize + nameSize + numberAt(directory, 30, 2) + numberAt(directory, 32, 2);
        if (isContentTypes(directory.substr(directoryEntrySize, nameSize))) {
            return true;
        }
        directory.remove_prefix(std::min<std::uint64_t>(entrySize, directory.size()));
    }
    return false;
}

// Whether an archive that begins with `header` begins as producers of packages begin theirs. That
// tells what it is even when its end, and the directory with it, is missing.
bool beginsAsAPackage(std::string_view header) {
    if (header.size() < localHeaderSize) {
        return false;
    }
    const auto nameSize = numberAt(header, 26, 2);
    const std::string_view name = header.substr(localHeaderSize, nameSize);
    return name.size() == nameSize && (isContentTypes(name) || name == "_rels/.rels");
}

struct Directory {
    std::uint64_t offset;
    std::uint64_t size;
};

// Where the directory is, by the end of the archive, which `tail` holds and which is at `offset` in
// the file; nothing when there is no such end.
std::optional<Directory> findDirectory(std::ifstream& file, std::string_view tail,
                                       std::uint64_t offset) {
    const std::size_t end = tail.rfind(directoryEndMark);
    if (end == std::string::npos || tail.size() - end < directoryEndSize) {
        return std::nullopt;
    }
    if (offset + end >= locatorSize) {
        const std::string locator = bytesAt(file, offset + end - locatorSize, locatorSize);
        if (locator.starts_with(locatorMark)) {
            const std::string large = bytesAt(file, numberAt(locator, 8, 8), largeEndSize);
            if (large.starts_with(largeEndMark) && large.size() == largeEndSize) {
                return Directory{numberAt(large, 48, 8), numberAt(large, 40, 8)};
            }
        }
    }
    return Directory{numberAt(tail, end + 16, 4), numberAt(tail, end + 12, 4)};
}

}  // namespace

bool isDocumentPackage(const std::filesystem::path& file) {
    std::error_code error;
    if (!std::filesystem::is_regular_file(file, error)) {
        return false;
    }
    const std::uint64_t fileSize = std::filesystem::file_size(file, error);
    if (error || fileSize < localHeaderSize) {
        // Some files of the system have no size, and reading them can wait for ever.
        return false;
    }
    std::ifstream stream(file, std::ios::binary);
    const std::string header = bytesAt(stream, 0, localHeaderSize + 64);
    if (!header.starts_with(localHeaderMark)) {
        return false;
    }
    if (beginsAsAPackage(header)) {
        return true;
    }
    const std::size_t tailSize = static_cast<std::size_t>(
        std::min<std::uint64_t>(fileSize, directoryEndSize + longestComment));
    const std::string tail = bytesAt(stream, fileSize - tailSize, tailSize);
    const std::optional<Directory> directory = findDirectory(stream, tail, fileSize - tailSize);
    if (!directory || directory->offset > fileSize ||
        directory->size > fileSize - directory->offset) {
        return false;
    }
    return listsContentTypes(
        bytesAt(stream, directory->offset,
                static_cast<std::size_t>(std::min(directory->size, mostOfADirectory))));
}

}  // namespace host
