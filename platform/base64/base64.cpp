// SPDX-License-Identifier: Apache-2.0
// Base64 around the kernels, which convert whole groups: the last group's padding, white space, and
// what is not base64.
#include "platform/base64/base64.h"

#include <algorithm>
#include <array>
#include <cstddef>
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

}  // namespace

DataBuffer base64encode(const DataBuffer& bytes) {
    const std::size_t groups = bytes.length() / bytesPerGroup;
    const std::size_t leftOver = bytes.length() % bytesPerGroup;
    DataBuffer text((groups + (leftOver == 0 ? 0 : 1)) * charactersPerGroup);
    base64::kernels().encode(bytes.data(), groups, text.data());
    if (leftOver != 0) {
        std::array<char, bytesPerGroup> last{};
        std::copy_n(bytes.data() + groups * bytesPerGroup, leftOver, last.begin());
        char* const end = text.data() + text.capacity();
        base64::plainKernels.encode(last.data(), 1, end - charactersPerGroup);
        std::fill_n(end - (bytesPerGroup - leftOver), bytesPerGroup - leftOver, '=');
    }
    text.setLength(text.capacity());
    return text;
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
