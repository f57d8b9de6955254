// SPDX-License-Identifier: Apache-2.0
// The limit of a process's memory, set from within.
#pragma once

#include <sys/resource.h>

#include <cstddef>

#include "tests/support/process_state.h"

namespace test {

/// What counts towards the limit.
inline std::size_t countedMemory() {
    return memoryOf("self", "VmData");
}

/// Lets this process take so many bytes more than it has, and no others, while it lives.
class MoreMemory {
public:
    explicit MoreMemory(std::size_t bytes) {
        ::getrlimit(RLIMIT_DATA, &before_);
        rlimit limit = before_;
        limit.rlim_cur = countedMemory() + bytes;
        ::setrlimit(RLIMIT_DATA, &limit);
    }
    MoreMemory(const MoreMemory&) = delete;
    MoreMemory& operator=(const MoreMemory&) = delete;
    ~MoreMemory() { ::setrlimit(RLIMIT_DATA, &before_); }

private:
    rlimit before_{};
};

}  // namespace test
