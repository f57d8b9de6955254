// SPDX-License-Identifier: Apache-2.0
// A message as tests expect it.
#pragma once

#include <ostream>
#include <string>

namespace test {

struct Message {
    std::string channel;
    std::string payload;
    bool operator==(const Message&) const = default;
};

inline void PrintTo(const Message& message, std::ostream* out) {
    *out << message.channel << ' ' << message.payload;
}

}  // namespace test
