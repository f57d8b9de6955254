// SPDX-License-Identifier: Apache-2.0
// Waits for conditions that cannot be waited for otherwise.
#pragma once

#include <chrono>
#include <functional>
#include <thread>

namespace test {

/// How long a test waits for what should happen at once.
inline constexpr std::chrono::seconds longestWait{60};

/// Waits until `condition` holds; returns whether it did within `longestWait`.
inline bool waitUntil(const std::function<bool()>& condition) {
    const auto deadline = std::chrono::steady_clock::now() + longestWait;
    while (!condition()) {
        if (std::chrono::steady_clock::now() > deadline) {
            return false;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    return true;
}

}  // namespace test
