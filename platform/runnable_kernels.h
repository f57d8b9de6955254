// SPDX-License-Identifier: Apache-2.0
// Chooses among inner loops that are written for several instruction sets.
#pragma once

#include <array>
#include <cstddef>
#include <span>

namespace platform {

/// Up to `most` sets of loops that this machine can run. Takes no memory from the heap, which may
/// be exhausted when they are first asked for.
template <class Kernels, std::size_t most>
class RunnableKernels {
public:
    /// Adds a set that is faster than those before it.
    void add(const Kernels& added) { kernels_[count_++] = &added; }

    /// All of them, the slowest first.
    std::span<const Kernels* const> all() const { return {kernels_.data(), count_}; }

private:
    std::array<const Kernels*, most> kernels_{};
    std::size_t count_ = 0;
};

}  // namespace platform
