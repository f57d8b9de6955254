// SPDX-License-Identifier: Apache-2.0
#include "host/limits/freed_memory.h"

#include <malloc.h>

namespace host {

void keepFreedMemory() {
    // What is larger comes from the system and goes back to it every time. The C library would take
    // more, but of large documents too much would then be kept while others are made.
    constexpr int largestKept = 12 << 20;
    ::mallopt(M_MMAP_THRESHOLD, largestKept);
    ::mallopt(M_TRIM_THRESHOLD, static_cast<int>(keptMemory));
}

void returnFreedMemory() {
    ::malloc_trim(0);
}

}  // namespace host
