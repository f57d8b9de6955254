// SPDX-License-Identifier: Apache-2.0
#include "tests/support/counting_malloc.h"

#include <malloc.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>

extern "C" void* __libc_malloc(std::size_t size);
extern "C" void* __libc_calloc(std::size_t count, std::size_t size);
extern "C" void* __libc_realloc(void* memory, std::size_t size);
extern "C" void* __libc_memalign(std::size_t alignment, std::size_t size);
extern "C" void __libc_free(void* memory);

namespace {

constexpr std::size_t mostNoted = 100;

std::atomic<std::size_t> inUse = 0;
std::atomic<std::size_t> peak = 0;
std::atomic<bool> isNoting = false;
std::atomic<std::size_t> noted = 0;
std::array<std::atomic<std::size_t>, mostNoted> notedSizes;
std::size_t inUseAtBeginning = 0;

void* taken(void* memory, std::size_t size) {
    if (memory == nullptr) {
        return memory;
    }
    const std::size_t usable = ::malloc_usable_size(memory);
    const std::size_t now = inUse += usable;
    for (std::size_t before = peak; now > before && !peak.compare_exchange_weak(before, now);) {
    }
    if (size >= test::largeAllocation && isNoting) {
        if (const std::size_t place = noted++; place < mostNoted) {
            notedSizes[place] = size;
        }
    }
    return memory;
}

void givenBack(void* memory) {
    inUse -= memory == nullptr ? 0 : ::malloc_usable_size(memory);
}

}  // namespace

// Visible, or clang would keep them from the bundle, which is another object.

extern "C" [[gnu::visibility("default")]] void* malloc(std::size_t size) {
    return taken(__libc_malloc(size), size);
}

extern "C" [[gnu::visibility("default")]] void* calloc(std::size_t count, std::size_t size) {
    return taken(__libc_calloc(count, size), count * size);
}

extern "C" [[gnu::visibility("default")]] void* realloc(void* memory, std::size_t size) {
    const std::size_t before = memory == nullptr ? 0 : ::malloc_usable_size(memory);
    void* const moved = __libc_realloc(memory, size);
    if (moved == memory) {
        inUse -= before;
        return taken(moved, 0);  // no memory anew
    }
    taken(moved, size);
    if (moved != nullptr || size == 0) {
        inUse -= before;  // after the copy
    }
    return moved;
}

extern "C" [[gnu::visibility("default")]] void* aligned_alloc(std::size_t alignment,
                                                              std::size_t size) {
    return taken(__libc_memalign(alignment, size), size);
}

extern "C" [[gnu::visibility("default")]] void* memalign(std::size_t alignment, std::size_t size) {
    return taken(__libc_memalign(alignment, size), size);
}

extern "C" [[gnu::visibility("default")]] int posix_memalign(void** memory, std::size_t alignment,
                                                             std::size_t size) {
    *memory = taken(__libc_memalign(alignment, size), size);
    return *memory == nullptr ? ENOMEM : 0;
}

extern "C" [[gnu::visibility("default")]] void free(void* memory) {
    givenBack(memory);
    __libc_free(memory);
}

namespace test {

void beginAccount() {
    noted = 0;
    inUseAtBeginning = inUse;
    peak = inUseAtBeginning;
    isNoting = true;
}

Allocations endAccount() {
    isNoting = false;
    Allocations found;
    found.peak = peak - inUseAtBeginning;
    for (std::size_t i = 0; i < std::min<std::size_t>(noted, mostNoted); ++i) {
        found.large.push_back(notedSizes[i]);
    }
    return found;
}

}  // namespace test
