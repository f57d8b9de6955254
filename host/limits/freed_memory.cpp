// SPDX-License-Identifier: Apache-2.0
#include "host/limits/freed_memory.h"

#include <malloc.h>

namespace host {

void keepFreedMemory() {
    // Larger blocks come from the system and go back to it every time. The C library would allow
    // more, but would then keep too much of large documents while others are made.
    constexpr int largestKept = 12 << 20;
    ::mallopt(M_MMAP_THRESHOLD, largestKept);
    ::mallopt(M_TRIM_THRESHOLD, static_cast<int>(keptMemory));
    // Small blocks are joined with their neighbours as they are freed. By default they go into a
    // list, to be joined later in a pass over all memory that costs more than the rest of
    // destroying a JSON tree.
    ::mallopt(M_MXFAST, 0);
}

void returnFreedMemory() {
    ::malloc_trim(0);
}

}  // namespace host
