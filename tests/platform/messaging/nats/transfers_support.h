// SPDX-License-Identifier: Apache-2.0
// What the tests of both directions of transfers share.
#pragma once

#include <cstddef>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "platform/messaging/nats/pieces.h"

namespace platform::messaging::nats {

/// Memory that a test counts.
class TestMemory {
public:
    explicit TestMemory(std::size_t size) : size_(size) {}

    Reserve reserve() {
        return [this](std::size_t bytes) -> Reservation {
            if (bytes > size_ - used_) {
                return nullptr;
            }
            used_ += bytes;
            return {this, [this, bytes](const void*) { used_ -= bytes; }};
        };
    }

    std::size_t size() const { return size_; }
    std::size_t used() const { return used_; }

private:
    const std::size_t size_;
    std::size_t used_ = 0;
};

inline ReturnAddress address(const std::string& id) {
    return {id, "/answers/" + id};
}

/// What `notes` say, each as "<subject>: <word>".
inline std::vector<std::string> said(const Notes& notes) {
    std::vector<std::string> lines;
    for (const Note& note : notes) {
        lines.push_back(note.subject + ": " + note.word);
    }
    return lines;
}

inline std::string randomBytes(std::size_t size) {
    std::mt19937 random(static_cast<unsigned>(size));
    std::string bytes(size, '\0');
    for (char& byte : bytes) {
        byte = static_cast<char>(random());
    }
    return bytes;
}

}  // namespace platform::messaging::nats
