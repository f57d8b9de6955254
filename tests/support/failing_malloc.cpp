// SPDX-License-Identifier: Apache-2.0
#include "tests/support/failing_malloc.h"

#include <atomic>
#include <cerrno>
#include <limits>

namespace {

constexpr long noAllocation = std::numeric_limits<long>::max();

std::atomic<std::size_t> failingSize = 0;
std::atomic<std::size_t> smallestFailing = 0;

// Allocations [firstFailing, lastFailing] fail.
std::atomic<bool> isCounting = false;
std::atomic<long> allocations = 0;
std::atomic<long> firstFailing = noAllocation;
std::atomic<long> lastFailing = noAllocation;

thread_local int sparing = 0;

bool fails(std::size_t size) {
    if (size != 0 && size == failingSize) {
        return true;
    }
    if (smallestFailing != 0 && size >= smallestFailing) {
        return true;
    }
    if (!isCounting || sparing > 0) {
        return false;
    }
    const long index = allocations++;
    return index >= firstFailing && index <= lastFailing;
}

}  // namespace

extern "C" {

void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* block, std::size_t size);

// Visible, or clang would keep them from what the program loads.

[[gnu::visibility("default")]] void* malloc(std::size_t size) {
    if (fails(size)) {
        errno = ENOMEM;
        return nullptr;
    }
    return __libc_malloc(size);
}

[[gnu::visibility("default")]] void* calloc(std::size_t count, std::size_t size) {
    if (fails(count * size)) {
        errno = ENOMEM;
        return nullptr;
    }
    return __libc_calloc(count, size);
}

[[gnu::visibility("default")]] void* realloc(void* block, std::size_t size) {
    if (fails(size)) {
        errno = ENOMEM;
        return nullptr;
    }
    return __libc_realloc(block, size);
}

}  // extern "C"

namespace test {

void failAllocationsOf(std::size_t size) {
    failingSize = size;
}

void failAllocationsFrom(std::size_t size) {
    smallestFailing = size;
}

void failAllocation(long index, Failing which) {
    allocations = 0;
    firstFailing = index;
    lastFailing = which == Failing::one ? index : noAllocation;
    isCounting = true;
}

long stopFailing() {
    isCounting = false;
    return allocations;
}

SparedThread::SparedThread() {
    ++sparing;
}

SparedThread::~SparedThread() {
    --sparing;
}

}  // namespace test
