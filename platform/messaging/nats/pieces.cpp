// SPDX-License-Identifier: Apache-2.0
#include "platform/messaging/nats/pieces.h"

#include <array>
#include <charconv>

namespace platform::messaging::nats {
namespace {

struct Form {
    std::string_view name;
    ClientWord::Kind kind;
    bool hasNumber;
};

constexpr std::array<Form, 5> forms{{{"yes", ClientWord::Kind::yes, false},
                                     {"offer", ClientWord::Kind::offer, true},
                                     {"piece", ClientWord::Kind::piece, true},
                                     {"room", ClientWord::Kind::room, true},
                                     {"stop", ClientWord::Kind::stop, false}}};

std::optional<std::uint64_t> parseNumber(std::string_view text) {
    std::uint64_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc() || end != text.data() + text.size()) {
        return std::nullopt;
    }
    return number;
}

}  // namespace

std::optional<ClientWord> parseClientWord(std::string_view header) {
    const std::size_t blank = header.find(' ');
    const std::string_view name = header.substr(0, blank);
    for (const Form& form : forms) {
        if (form.name != name || form.hasNumber != (blank != std::string_view::npos)) {
            continue;
        }
        if (!form.hasNumber) {
            return ClientWord{form.kind};
        }
        const std::optional<std::uint64_t> number = parseNumber(header.substr(blank + 1));
        return number ? std::optional(ClientWord{form.kind, *number}) : std::nullopt;
    }
    return std::nullopt;
}

Note stopNote(const ReturnAddress& address, std::string_view reason) {
    return {address.channel, "stop " + std::string(reason), {}, nullptr};
}

}  // namespace platform::messaging::nats
