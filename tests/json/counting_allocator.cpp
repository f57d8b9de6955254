// SPDX-License-Identifier: Apache-2.0
#include "tests/json/counting_allocator.h"

#include <malloc.h>

#include <algorithm>
#include <cstdlib>
#include <new>

namespace json {

Memory memory;

}  // namespace json

using json::memory;

namespace {

/// What malloc uses for `block`, its own word included.
std::size_t sizeOf(void* block) {
    return ::malloc_usable_size(block) + sizeof(std::size_t);
}

}  // namespace

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
    memory.bytes += sizeOf(block);
    memory.peak = std::max(memory.peak, memory.bytes);
    return block;
}

void operator delete(void* block) noexcept {
    if (block != nullptr) {
        --memory.live;
        memory.bytes -= sizeOf(block);
    }
    std::free(block);
}

void operator delete(void* block, std::size_t) noexcept {
    operator delete(block);
}
