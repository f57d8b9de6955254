#include "host/freed_memory.h"

#include <malloc.h>

namespace host {

void keepFreedMemory() {
    // The largest that the C library takes. What is larger comes from the system and goes back to
    // it every time.
    constexpr int largestKept = 32 << 20;
    ::mallopt(M_MMAP_THRESHOLD, largestKept);
    ::mallopt(M_TRIM_THRESHOLD, static_cast<int>(keptMemory));
}

}  // namespace host
