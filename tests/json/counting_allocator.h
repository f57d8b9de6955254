// SPDX-License-Identifier: Apache-2.0
// An operator new, for the whole of a test program, that counts and can be told to fail.
#pragma once

#include <cstddef>

namespace json {

struct Memory {
    static constexpr std::size_t never = static_cast<std::size_t>(-1);

    std::size_t live = 0;              // allocations that are not freed
    std::size_t made = 0;              // allocations so far
    std::size_t untilFailure = never;  // allocations that still succeed
    std::size_t bytes = 0;             // of the live allocations, with what malloc adds
    std::size_t peak = 0;              // the most of them at one time
};

extern Memory memory;

}  // namespace json
