// SPDX-License-Identifier: Apache-2.0
#include "tests/json/counting_allocator.h"

#include <cstdlib>
#include <new>

namespace json {

Memory memory;

}  // namespace json

using json::memory;

void* operator new(std::size_t size) {
    if (memory.untilFailure == 0)
        throw std::bad_alloc();
    if (memory.untilFailure != json::Memory::never)
        --memory.untilFailure;
    void* const block = std::malloc(size > 0 ? size : 1);
    if (block == nullptr)
        throw std::bad_alloc();
    ++memory.live;
    ++memory.made;
    return block;
}

void operator delete(void* block) noexcept {
    if (block != nullptr)
        --memory.live;
    std::free(block);
}

void operator delete(void* block, std::size_t) noexcept {
    operator delete(block);
}
