// SPDX-License-Identifier: Apache-2.0
// Large pages for large buffers. The system gives a process memory by pages of a few kilobytes, as
// it writes to them first, and takes longer for that than it takes to fill them with a document.
#pragma once

#include <sys/mman.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>

namespace platform {

/// Buffers from this size on, in bytes, come from the system and go back to it. Smaller ones are
/// kept by malloc, with the pages that they have.
inline constexpr std::size_t smallestLargeBuffer = std::size_t{12} << 20;

/// Asks the system to back a large buffer, to which nothing has been written yet, by large pages.
/// This is advice: the system may have none.
[[gnu::noinline]] inline void preferLargePages([[maybe_unused]] void* memory,
                                               [[maybe_unused]] std::size_t size) noexcept {
#ifdef MADV_HUGEPAGE
    if (size < smallestLargeBuffer) {
        return;
    }
    const auto page = static_cast<std::uintptr_t>(::getpagesize());
    const auto address = reinterpret_cast<std::uintptr_t>(memory);
    const std::uintptr_t begin = (address + page - 1) / page * page;
    const std::uintptr_t end = (address + size) / page * page;
    ::madvise(static_cast<char*>(memory) + (begin - address), end - begin, MADV_HUGEPAGE);
#endif
}

/// Gives a std::string or std::vector of bytes the memory for `capacity` bytes, if that is large,
/// on large pages.
template <typename Buffer>
void reserveLarge(Buffer& buffer, std::size_t capacity) {
    if (capacity >= smallestLargeBuffer && capacity > buffer.capacity()) {
        buffer.reserve(capacity);
        preferLargePages(buffer.data(), buffer.capacity());
    }
}

}  // namespace platform
