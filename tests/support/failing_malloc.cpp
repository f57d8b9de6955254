// SPDX-License-Identifier: Apache-2.0
#include "tests/support/failing_malloc.h"

#include <link.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <limits>

namespace {

constexpr long kNever = std::numeric_limits<long>::max();

// The allocations of `failingSize` bytes fail once `allocationsToSpare` of them were made.
std::atomic<std::size_t> failingSize = 0;
std::atomic<int> allocationsToSpare = 0;

// Allocations [firstFailing, lastFailing] fail.
std::atomic<bool> isCounting = false;
std::atomic<long> allocations = 0;
std::atomic<long> firstFailing = kNever;
std::atomic<long> lastFailing = kNever;

thread_local int sparing = 0;

// Where the spared libraries lie.
struct Range {
    std::uintptr_t begin = 0;
    std::uintptr_t end = 0;
};
std::array<Range, 8> sparedRanges;

bool isSpared(const void* caller) {
    const auto address = reinterpret_cast<std::uintptr_t>(caller);
    return std::any_of(sparedRanges.begin(), sparedRanges.end(), [&](const Range& range) {
        return address >= range.begin && address < range.end;
    });
}

bool fails(std::size_t size, const void* caller) {
    if (size != 0 && size == failingSize && allocationsToSpare-- <= 0) {
        return true;
    }
    if (!isCounting || sparing > 0 || isSpared(caller)) {
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
    if (fails(size, __builtin_return_address(0))) {
        errno = ENOMEM;
        return nullptr;
    }
    return __libc_malloc(size);
}

[[gnu::visibility("default")]] void* calloc(std::size_t count, std::size_t size) {
    if (fails(count * size, __builtin_return_address(0))) {
        errno = ENOMEM;
        return nullptr;
    }
    return __libc_calloc(count, size);
}

[[gnu::visibility("default")]] void* realloc(void* block, std::size_t size) {
    if (fails(size, __builtin_return_address(0))) {
        errno = ENOMEM;
        return nullptr;
    }
    return __libc_realloc(block, size);
}

}  // extern "C"

namespace test {

void failAllocationsOf(std::size_t size, int spared) {
    allocationsToSpare = spared;
    failingSize = size;
}

void failAllocation(long index, Failing which) {
    allocations = 0;
    firstFailing = index;
    lastFailing = which == Failing::one ? index : kNever;
    isCounting = true;
}

void spareLibraries(const char* name) {
    struct Search {
        const char* name;
        std::size_t found;
    } search{name, 0};
    sparedRanges = {};
    const auto visit = [](dl_phdr_info* library, std::size_t, void* data) {
        auto& sought = *static_cast<Search*>(data);
        if (std::strstr(library->dlpi_name, sought.name) != nullptr) {
            Range& range = sparedRanges.at(sought.found++);
            range.begin = library->dlpi_addr;
            for (int i = 0; i < library->dlpi_phnum; ++i) {
                const auto& segment = library->dlpi_phdr[i];
                range.end = std::max<std::uintptr_t>(
                    range.end, library->dlpi_addr + segment.p_vaddr + segment.p_memsz);
            }
        }
        return 0;
    };
    if (name != nullptr) {
        dl_iterate_phdr(visit, &search);
    }
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
