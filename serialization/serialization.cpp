// SPDX-License-Identifier: Apache-2.0
#include "serialization/serialization.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <stdexcept>
#include <utility>

#include "json/serialize.h"
#include "serialization/reading/result_keys.h"

namespace EditorServices {

using platform::DataBuffer;

namespace {

std::string tooLarge(std::size_t longestAnswer) {
    return "The document is too large: its message would be longer than the " +
           std::to_string(longestAnswer) + " bytes that can be sent";
}

/// The JSON text of `value`, which is not kept beside it; nothing when it is longer than
/// `maxLength` bytes. Throws std::runtime_error "Out of memory!".
std::optional<DataBuffer> messageOf(json::Value value, std::size_t maxLength) {
    DataBuffer message;
    const bool isWhole = json::serialize(value, maxLength, [&message](std::size_t size) {
        message.resize(size);
        return message.data();
    });
    return isWhole ? std::optional(std::move(message)) : std::nullopt;
}

}  // namespace

Serialization::Serialization() {
    initializeMessageService();
}

bool Serialization::isNonCharacter(char16_t unit) const noexcept {
    return static_cast<std::int32_t>(unit) >= firstNonCharacter;
}

bool Serialization::isZeroWidthSpace(char16_t unit) const noexcept {
    return unit == zeroWidthSpace;
}

bool Serialization::isDisallowedControl(char16_t unit) const noexcept {
    return isControl(unit) && unit != u'\t' && unit != u'\n' && unit != u'\r';
}

bool Serialization::isControl(char16_t unit) const noexcept {
    return unit <= 0x1F || (unit >= 0x7F && unit <= 0x9F);
}

void Serialization::publish(const std::string& channel, json::Value value) const {
    std::optional<DataBuffer> message = messageOf(std::move(value), anyLength);
    messageService->publish(channel, std::move(message).value());
}

void Serialization::publishReadResult(const std::string& channel, json::Value result,
                                      std::size_t longestAnswer) const {
    std::optional<DataBuffer> message = messageOf(std::move(result), longestAnswer);
    if (!message) {
        publish(channel, json::Object{{exceptionKey, tooLarge(longestAnswer)}, {statusKey, false}});
        return;
    }
    messageService->publish(channel, std::move(*message));
}

// Reading a text takes up to three times its bytes beside them, for UTF-16 and the charset's own
// form. Its JSON may have six bytes for each of its own; while that grows, it takes two and a half
// times what it has in the end.
void Serialization::awaitMemory(std::uintmax_t bytes, std::uintmax_t more,
                                std::size_t longestAnswer) const {
    if (bytes > longestAnswer) {
        throw std::runtime_error(tooLarge(longestAnswer));
    }
    if (messageService != nullptr) {
        const std::uintmax_t json = std::min<std::uintmax_t>(6 * bytes, longestAnswer);
        messageService->awaitMemory(bytes + std::max(3 * bytes, json / 2 * 5) + more);
    }
}

}  // namespace EditorServices
