// SPDX-License-Identifier: Apache-2.0
#include "serialization/serialization.h"

#include <cstddef>
#include <optional>
#include <utility>

#include "json/serialize.h"
#include "serialization/reading/result_keys.h"

namespace EditorServices {

using platform::DataBuffer;

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
    const std::string text = json::serialize(value);
    // A large document shall not be held three times.
    value = json::Value();
    messageService->publish(channel, DataBuffer::copyOf(text));
}

void Serialization::publishReadResult(const std::string& channel, json::Value result) const {
    const std::size_t maxPayload = messageService->maxPayload(channel);
    const std::optional<std::string> text = json::serialize(result, maxPayload);
    if (!text) {
        publish(channel, json::Object{{kExceptionKey,
                                       "The document is too large: its message would be longer "
                                       "than the " +
                                           std::to_string(maxPayload) + " bytes that can be sent"},
                                      {kStatusKey, false}});
        return;
    }
    // A large document shall not be held three times.
    result = json::Value();
    messageService->publish(channel, DataBuffer::copyOf(*text));
}

}  // namespace EditorServices
