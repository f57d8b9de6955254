// SPDX-License-Identifier: Apache-2.0
#include "host/guard/file_content.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <system_error>
#include <vector>

namespace host {

namespace {

constexpr std::size_t blockSize = std::size_t{256} * 1024;

// Reads up to a whole block; fewer bytes at the end of the file only, and less than none when it
// cannot be read.
ssize_t readBlock(int file, off_t offset, std::vector<char>& block) {
    block.resize(blockSize);
    std::size_t length = 0;
    while (length < blockSize) {
        const ssize_t count = ::pread(file, block.data() + length, blockSize - length,
                                      offset + static_cast<off_t>(length));
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count < 0) {
            return -1;
        }
        if (count == 0) {
            break;
        }
        length += static_cast<std::size_t>(count);
    }
    block.resize(length);
    return static_cast<ssize_t>(length);
}

void writeBlock(int file, off_t offset, std::string_view bytes) {
    while (!bytes.empty()) {
        const ssize_t count = ::pwrite(file, bytes.data(), bytes.size(), offset);
        if (count < 0 && errno != EINTR) {
            throw std::system_error(errno, std::generic_category(), "cannot be written");
        }
        if (count > 0) {
            bytes.remove_prefix(static_cast<std::size_t>(count));
            offset += count;
        }
    }
}

bool hasSize(int file, std::size_t size) {
    struct stat status {};
    return ::fstat(file, &status) == 0 && static_cast<std::size_t>(status.st_size) == size;
}

}  // namespace

bool hasContent(int file, std::string_view bytes) {
    if (!hasSize(file, bytes.size())) {
        return false;
    }
    std::vector<char> block;
    for (std::size_t offset = 0; offset < bytes.size(); offset += block.size()) {
        if (readBlock(file, static_cast<off_t>(offset), block) <= 0 ||
            !bytes.substr(offset).starts_with(std::string_view(block.data(), block.size()))) {
            return false;
        }
    }
    return true;
}

bool haveSameContent(int one, int other) {
    std::vector<char> block;
    std::vector<char> otherBlock;
    for (off_t offset = 0;; offset += static_cast<off_t>(block.size())) {
        if (readBlock(one, offset, block) < 0 || readBlock(other, offset, otherBlock) < 0 ||
            block != otherBlock) {
            return false;
        }
        if (block.size() < blockSize) {
            return true;
        }
    }
}

std::string readContent(int file) {
    std::string content;
    std::vector<char> block;
    do {
        if (readBlock(file, static_cast<off_t>(content.size()), block) < 0) {
            throw std::system_error(errno, std::generic_category(), "cannot be read");
        }
        content.append(block.data(), block.size());
    } while (block.size() == blockSize);
    return content;
}

void copyContent(int from, int to) {
    std::vector<char> block;
    for (off_t offset = 0;; offset += static_cast<off_t>(block.size())) {
        if (readBlock(from, offset, block) < 0) {
            throw std::system_error(errno, std::generic_category(), "cannot be read");
        }
        writeBlock(to, offset, {block.data(), block.size()});
        if (block.size() < blockSize) {
            return;
        }
    }
}

}  // namespace host
