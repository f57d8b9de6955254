// SPDX-License-Identifier: Apache-2.0
#include "platform/messaging/nats/subject.h"

#include <simdjson.h>

#include <algorithm>
#include <cstddef>
#include <stdexcept>

#include "platform/text/quoted.h"

namespace platform::messaging::nats {
namespace {

// A server closes a connection that sends a protocol line of more than 4096 bytes (its default
// max_control_line). Besides the subject, a line holds the operation, a subscription's number and
// the payload's size.
constexpr std::size_t longestSubject = 4000;

bool isBlankOrControl(char c) {
    return static_cast<unsigned char>(c) <= 0x20 || c == 0x7F;
}

// Why `channel` cannot be a subject; null when it can.
const char* flawOf(std::string_view channel) {
    if (channel.empty()) {
        return "it is empty";
    }
    if (channel.size() > longestSubject) {
        return "it is longer than 4000 bytes";
    }
    if (std::any_of(channel.begin(), channel.end(), isBlankOrControl)) {
        return "it has a blank or a control character";
    }
    if (!simdjson::validate_utf8(channel.data(), channel.size())) {
        return "it is not UTF-8";
    }
    for (std::size_t start = 0; start <= channel.size();) {
        const std::size_t end = std::min(channel.find('.', start), channel.size());
        const std::string_view token = channel.substr(start, end - start);
        if (token.empty()) {
            return "there is nothing before, after or between its dots";
        }
        if (token == "*" || token == ">") {
            return "it has a wildcard between its dots";
        }
        start = end + 1;
    }
    return nullptr;
}

}  // namespace

void requireSubject(std::string_view channel) {
    if (const char* flaw = flawOf(channel)) {
        throw std::invalid_argument("Channel \"" + text::printable(channel) +
                                    "\" is no NATS subject: " + flaw + ".");
    }
}

}  // namespace platform::messaging::nats
