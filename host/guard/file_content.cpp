// SPDX-License-Identifier: Apache-2.0
#include "host/guard/file_content.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <vector>

#include "json/parser.h"
#include "json/string_kernels.h"
#include "platform/posix/system_error.h"

namespace host {

namespace {

constexpr std::size_t blockSize = std::size_t{64} * 1024;

// Reads up to `size` bytes; fewer only at the end of the file, and a negative number when it cannot
// be read.
ssize_t readBlock(int file, off_t offset, std::vector<char>& block, std::size_t size = blockSize) {
    block.resize(size);
    std::size_t length = 0;
    while (length < size) {
        const ssize_t count = ::pread(file, block.data() + length, size - length,
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
            platform::throwSystemError("cannot be written");
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

// Whether `file` has `bytes`, which are no more than a block, at `offset`.
bool hasBlock(int file, off_t offset, std::string_view bytes, std::vector<char>& block) {
    return readBlock(file, offset, block, bytes.size()) >= 0 &&
           bytes == std::string_view(block.data(), block.size());
}

// Moves past the "\u" escape at `in`, or two that are one character, and writes what it stands for
// to `out`. Stays where it is malformed.
const char* unescapeUnit(const char* in, const char* end, char*& out) {
    constexpr std::ptrdiff_t length = 6;
    for (const std::ptrdiff_t taken : {length, 2 * length}) {
        if (end - in < taken) {
            return in;
        }
        const std::string literal = '"' + std::string(in, in + taken) + '"';
        json::Input input{literal.data(), literal.data() + literal.size()};
        std::string character;
        if (json::parseString(input, character) == json::Status::success) {
            out = std::copy(character.begin(), character.end(), out);
            return in + taken;
        }
    }
    return in;
}

// Decodes a block of string content from `in` on into `text`. Returns where it stopped, which is
// `in` where the content is malformed.
const char* unescapeBlock(const char* in, const char* end, std::string& text) {
    constexpr std::ptrdiff_t longestCharacter = 8;
    text.resize(blockSize);
    char* out = text.data();
    char* const outEnd = out + text.size();
    while (in != end && outEnd - out > longestCharacter) {
        const char* const last = in + std::min(end - in, outEnd - out);
        const json::detail::Copied copied =
            json::detail::stringKernels().unescape(in, last, out, outEnd);
        in = copied.in;
        out = copied.out;
        if (in == last) {
            continue;
        }
        const bool isAtUnit = end - in >= 2 && in[1] == 'u' && outEnd - out > longestCharacter;
        const char* const next = isAtUnit ? unescapeUnit(in, end, out) : in;
        if (next == in) {
            break;  // an escape that the block's end cut off, or none
        }
        in = next;
    }
    text.resize(static_cast<std::size_t>(out - text.data()));
    return in;
}

}  // namespace

std::size_t sizeOf(int file) {
    struct stat status {};
    if (::fstat(file, &status) != 0) {
        platform::throwSystemError("cannot be examined");
    }
    return static_cast<std::size_t>(status.st_size);
}

bool hasContent(int file, std::string_view bytes) {
    std::vector<char> block;
    off_t offset = 0;
    for (std::string_view left = bytes; !left.empty();) {
        const std::string_view next = left.substr(0, blockSize);
        if (!hasBlock(file, offset, next, block)) {
            return false;
        }
        offset += static_cast<off_t>(next.size());
        left.remove_prefix(next.size());
    }
    return hasSize(file, bytes.size());
}

bool hasContentOf(int file, std::string_view literal) {
    if (literal.size() < 2) {
        return false;
    }
    const char* in = literal.data() + 1;
    const char* const end = literal.data() + literal.size() - 1;
    std::string expected;
    std::vector<char> block;
    off_t offset = 0;
    while (in != end) {
        const char* const before = in;
        in = unescapeBlock(in, end, expected);
        if (in == before || !hasBlock(file, offset, expected, block)) {
            return false;
        }
        offset += static_cast<off_t>(expected.size());
    }
    return hasSize(file, static_cast<std::size_t>(offset));
}

bool haveSameContent(int one, int other) {
    struct stat status {};
    if (::fstat(one, &status) == 0 && !hasSize(other, static_cast<std::size_t>(status.st_size))) {
        return false;
    }
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
            platform::throwSystemError("cannot be read");
        }
        content.append(block.data(), block.size());
    } while (block.size() == blockSize);
    return content;
}

void copyContent(int from, int to) {
    std::vector<char> block;
    for (off_t offset = 0;; offset += static_cast<off_t>(block.size())) {
        if (readBlock(from, offset, block) < 0) {
            platform::throwSystemError("cannot be read");
        }
        writeBlock(to, offset, {block.data(), block.size()});
        if (block.size() < blockSize) {
            return;
        }
    }
}

}  // namespace host
