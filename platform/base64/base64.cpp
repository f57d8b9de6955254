// Base64 on OpenSSL's block functions. They convert whole groups (three bytes, four characters),
// take lengths as int, and write behind what they report: the encoder a terminating zero, the
// decoder the last group's zeros. The decoder moreover drops white space and '-' at the ends of a
// block and reads '=' anywhere as a zero bit. So text goes to it in chunks of a fixed size from
// which white space and padding have been taken, and the number of bytes that come back is checked.
#include "platform/base64/base64.h"

#include <openssl/evp.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <stdexcept>
#include <string>

#include "platform/i18n/ascii.h"

namespace platform {
namespace {

constexpr std::size_t kBytesPerGroup = 3;
constexpr std::size_t kCharactersPerGroup = 4;
constexpr std::size_t kGroupsPerChunk = 8'192;
constexpr std::size_t kBytesPerChunk = kGroupsPerChunk * kBytesPerGroup;

using Chunk = std::array<char, kGroupsPerChunk * kCharactersPerGroup>;

unsigned char* asBytes(char* data) {
    return reinterpret_cast<unsigned char*>(data);
}

const unsigned char* asBytes(const char* data) {
    return reinterpret_cast<const unsigned char*>(data);
}

bool isInAlphabet(char c) {
    return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '+' ||
           c == '/';
}

[[noreturn]] void fail(const std::string& what, std::size_t offset) {
    throw std::runtime_error("invalid base64: " + what + " at offset " + std::to_string(offset));
}

[[noreturn]] void failAtFirstStranger(std::string_view text, std::size_t offset) {
    while (isInAlphabet(text[offset]) || i18n::isspace_ascii(text[offset])) {
        ++offset;
    }
    fail("a character outside the alphabet", offset);
}

// Decodes `groups`, which are at most a chunk. Returns whether they are nothing but whole groups of
// the alphabet's characters; if not, what is behind `bytes` is undefined.
bool decodeGroups(std::string_view groups, char* bytes) {
    return EVP_DecodeBlock(asBytes(bytes), asBytes(groups.data()),
                           static_cast<int>(groups.size())) ==
           static_cast<int>(groups.size() / kCharactersPerGroup * kBytesPerGroup);
}

// Copies what is no white space from `text`, from `at` on, until `chunk` is full or the text ends.
// Returns how much that is, and moves `at` behind it.
std::size_t gather(std::string_view text, std::size_t& at, Chunk& chunk) {
    std::size_t filled = 0;
    for (; at < text.size() && filled < chunk.size(); ++at) {
        chunk[filled] = text[at];
        filled += i18n::isspace_ascii(text[at]) ? 0 : 1;
    }
    return filled;
}

// Checks the text from its first '=' on, before which the last group has `leftOver` characters.
void checkPadding(std::string_view text, std::size_t start, std::size_t leftOver) {
    std::size_t count = 0;
    for (std::size_t i = start; i < text.size(); ++i) {
        if (text[i] == '=') {
            ++count;
        } else if (!i18n::isspace_ascii(text[i])) {
            fail("data behind the padding", i);
        }
    }
    const std::size_t missing = leftOver == 0 ? 0 : kCharactersPerGroup - leftOver;
    if (count != 0 && count != missing) {
        fail("wrong padding", start);
    }
}

}  // namespace

DataBuffer base64encode(const DataBuffer& bytes) {
    if (bytes.empty()) {
        return {};
    }
    const std::size_t groups = (bytes.length() + kBytesPerGroup - 1) / kBytesPerGroup;
    DataBuffer text(groups * kCharactersPerGroup + 1);  // one for the encoder's zero
    std::size_t length = 0;
    for (std::size_t at = 0; at < bytes.length(); at += kBytesPerChunk) {
        const std::size_t count = std::min(kBytesPerChunk, bytes.length() - at);
        length += static_cast<std::size_t>(EVP_EncodeBlock(
            asBytes(text.data() + length), asBytes(bytes.data() + at), static_cast<int>(count)));
    }
    text.setLength(length);
    return text;
}

DataBuffer base64decode(std::string_view text) {
    const std::size_t end = std::min(text.find('='), text.size());
    DataBuffer bytes((end + kCharactersPerGroup - 1) / kCharactersPerGroup * kBytesPerGroup);
    Chunk chunk{};
    std::size_t length = 0;
    std::size_t leftOver = 0;  // characters of an incomplete group, which only the last chunk has
    for (std::size_t at = 0; at < end;) {
        // Most text is nothing but groups and is decoded from where it stands.
        const std::size_t whole =
            std::min(chunk.size(), (end - at) / kCharactersPerGroup * kCharactersPerGroup);
        if (whole != 0 && decodeGroups(text.substr(at, whole), bytes.data() + length)) {
            at += whole;
            length += whole / kCharactersPerGroup * kBytesPerGroup;
            continue;
        }
        const std::size_t chunkStart = at;
        const std::size_t filled = gather(text.substr(0, end), at, chunk);
        leftOver = filled % kCharactersPerGroup;
        if (leftOver == 1) {
            fail("a single left-over character before the end", end);
        }
        const std::size_t added = leftOver == 0 ? 0 : kCharactersPerGroup - leftOver;
        std::fill_n(chunk.begin() + static_cast<std::ptrdiff_t>(filled), added, 'A');
        if (!decodeGroups({chunk.data(), filled + added}, bytes.data() + length)) {
            failAtFirstStranger(text, chunkStart);
        }
        length += (filled + added) / kCharactersPerGroup * kBytesPerGroup;
        for (std::size_t i = 0; i < added; ++i) {
            if (bytes.data()[--length] != 0) {
                fail("left-over bits that are not zero before the end", end);
            }
        }
    }
    checkPadding(text, end, leftOver);
    bytes.setLength(length);
    return bytes;
}

}  // namespace platform
