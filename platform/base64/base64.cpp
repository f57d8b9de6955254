// SPDX-License-Identifier: Apache-2.0
// Base64 around the kernels, which convert whole groups: the last group's padding, white space, and
// what is not base64.
#include "platform/base64/base64.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <exception>
#include <stdexcept>
#include <string>

#include "platform/base64/kernels.h"
#include "platform/text/ascii.h"

namespace platform {
namespace {

using base64::bytesPerGroup;
using base64::charactersPerGroup;

using Group = std::array<char, charactersPerGroup>;

bool isInAlphabet(char c) {
    return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '+' ||
           c == '/';
}

[[noreturn]] void fail(const std::string& what, std::size_t offset) {
    throw std::runtime_error("invalid base64: " + what + " at offset " + std::to_string(offset));
}

// Reads the characters of a group from `text`, from `at` on, over white space. Returns how many
// there are before the text ends, and moves `at` past the last of them, or to the end.
std::size_t readGroup(std::string_view text, std::size_t& at, Group& group) {
    std::size_t count = 0;
    for (; at < text.size() && count < group.size(); ++at) {
        if (isInAlphabet(text[at])) {
            group[count++] = text[at];
        } else if (!platform::text::isspace_ascii(text[at])) {
            fail("a character outside the alphabet", at);
        }
    }
    return count;
}

// Checks the text from its first '=' on, before which the last group has `leftOver` characters.
void checkPadding(std::string_view text, std::size_t start, std::size_t leftOver) {
    std::size_t count = 0;
    for (std::size_t i = start; i < text.size(); ++i) {
        if (text[i] == '=') {
            ++count;
        } else if (!platform::text::isspace_ascii(text[i])) {
            fail("data after the padding", i);
        }
    }
    const std::size_t missing = leftOver == 0 ? 0 : charactersPerGroup - leftOver;
    if (count != 0 && count != missing) {
        fail("wrong padding", start);
    }
}

// Decodes the last group, of which `count` characters are there, and returns how many bytes it has.
std::size_t decodeIncomplete(Group group, std::size_t count, std::size_t end, char* bytes) {
    if (count == 1) {
        fail("a single left-over character before the end", end);
    }
    std::fill(group.begin() + static_cast<std::ptrdiff_t>(count), group.end(), 'A');
    std::array<char, bytesPerGroup> decoded{};
    base64::plainKernels.decode(group.data(), 1, decoded.data());
    const std::size_t length = count - 1;
    if (std::any_of(decoded.begin() + static_cast<std::ptrdiff_t>(length), decoded.end(),
                    [](char byte) { return byte != 0; })) {
        fail("left-over bits that are not zero before the end", end);
    }
    std::copy_n(decoded.begin(), length, bytes);
    return length;
}

std::size_t encodedLength(std::size_t bytes) {
    return (bytes + bytesPerGroup - 1) / bytesPerGroup * charactersPerGroup;
}

// Writes the encodedLength characters of `bytes` to `text`.
void encode(std::string_view bytes, char* text) {
    const std::size_t groups = bytes.size() / bytesPerGroup;
    const std::string_view rest = bytes.substr(groups * bytesPerGroup);
    base64::kernels().encode(bytes.data(), groups, text);
    if (!rest.empty()) {
        std::array<char, bytesPerGroup> last{};
        std::copy(rest.begin(), rest.end(), last.begin());
        char* const end = text + encodedLength(bytes.size());
        base64::plainKernels.encode(last.data(), 1, end - charactersPerGroup);
        std::fill_n(end - (bytesPerGroup - rest.size()), bytesPerGroup - rest.size(), '=');
    }
}

}  // namespace

DataBuffer base64encode(const DataBuffer& bytes) {
    DataBuffer text(encodedLength(bytes.length()));
    encode(bytes.view(), text.data());
    text.setLength(text.capacity());
    return text;
}

// Encodes piece by piece, since a string fills its memory before anyone else can write to it, and
// what is appended from the processor's cache takes less time than a copy of the whole text.
void base64encode(std::string_view bytes, std::string& text) {
    constexpr std::size_t groups = 4096;
    try {
        text.reserve(text.size() + encodedLength(bytes.size()));
    } catch (const std::exception&) {
        throw std::runtime_error("Out of memory!");
    }
    std::array<char, groups * charactersPerGroup> encoded;
    for (; !bytes.empty(); bytes.remove_prefix(std::min(bytes.size(), groups * bytesPerGroup))) {
        const std::string_view piece = bytes.substr(0, groups * bytesPerGroup);
        encode(piece, encoded.data());
        text.append(encoded.data(), encodedLength(piece.size()));
    }
}

DataBuffer base64decode(std::string_view text) {
    const std::size_t end = std::min(text.find('='), text.size());
    DataBuffer bytes((end + charactersPerGroup - 1) / charactersPerGroup * bytesPerGroup);
    std::size_t length = 0;
    std::size_t leftOver = 0;  // characters of an incomplete group
    for (std::size_t at = 0; at < end;) {
        // Most text consists of whole groups only; white space between them is skipped one group at
        // a time.
        const std::size_t groups = base64::kernels().decode(
            text.data() + at, (end - at) / charactersPerGroup, bytes.data() + length);
        at += groups * charactersPerGroup;
        length += groups * bytesPerGroup;
        Group group{};
        const std::size_t count = readGroup(text.substr(0, end), at, group);
        if (count == group.size()) {
            base64::plainKernels.decode(group.data(), 1, bytes.data() + length);
            length += bytesPerGroup;
        } else if (count != 0) {
            leftOver = count;
            length += decodeIncomplete(group, count, end, bytes.data() + length);
        }
    }
    checkPadding(text, end, leftOver);
    bytes.setLength(length);
    return bytes;
}

}  // namespace platform
