// SPDX-License-Identifier: Apache-2.0
// A malloc that fails when told to, for programs that link failing_malloc.cpp. The libraries that
// such a program loads call it too.
#pragma once

#include <cstddef>

namespace test {

/// Makes the allocations of `size` bytes fail; none for size 0.
void failAllocationsOf(std::size_t size);

/// Makes the allocations of `size` bytes and more fail; none for size 0.
void failAllocationsFrom(std::size_t size);

/// Which allocations fail.
enum class Failing { one, allFromThere };

/// Makes the allocation `index`, counted from 0 and from this call on, fail, or it and all that
/// follow. Threads with a SparedThread neither fail nor count.
void failAllocation(long index, Failing which);

/// Ends what failAllocation began, and returns how many allocations it counted.
long stopFailing();

/// Keeps the calling thread's allocations from failing and from being counted, while it lives.
class SparedThread {
public:
    SparedThread();
    SparedThread(const SparedThread&) = delete;
    SparedThread& operator=(const SparedThread&) = delete;
    ~SparedThread();
};

}  // namespace test
