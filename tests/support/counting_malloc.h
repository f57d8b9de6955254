// SPDX-License-Identifier: Apache-2.0
// A malloc that keeps account of what is allocated, in the program that links it and in the
// libraries that it loads.
#pragma once

#include <cstddef>
#include <vector>

namespace test {

/// Large enough that only whole documents, and parts of them, are counted one by one.
inline constexpr std::size_t largeAllocation = std::size_t{1} << 20U;

/// What was allocated between two moments.
struct Allocations {
    /// The sizes of those of largeAllocation bytes and more, in order; of the first 100 at most.
    std::vector<std::size_t> large;

    /// The most bytes that were in use at one time, beyond those in use at the beginning.
    std::size_t peak = 0;
};

/// Begins an account.
void beginAccount();

/// Ends it and returns what it has.
Allocations endAccount();

}  // namespace test
