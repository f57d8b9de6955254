// SPDX-License-Identifier: Apache-2.0
// Memory in which reading or writing past the end is noticed at once.
#pragma once

#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <stdexcept>
#include <string_view>

namespace test {

/// Memory right before a page that cannot be read or written.
class GuardedMemory {
public:
    GuardedMemory() {
        const auto page = static_cast<std::size_t>(::sysconf(_SC_PAGESIZE));
        void* const mapped =
            ::mmap(nullptr, 2 * page, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
        if (mapped == MAP_FAILED)
            throw std::runtime_error("cannot map memory");
        begin = static_cast<char*>(mapped);
        end = begin + page;
        if (::mprotect(end, page, PROT_NONE) != 0)
            throw std::runtime_error("cannot protect memory");
    }
    GuardedMemory(const GuardedMemory&) = delete;
    GuardedMemory& operator=(const GuardedMemory&) = delete;
    ~GuardedMemory() { ::munmap(begin, 2 * static_cast<std::size_t>(end - begin)); }

    /// Copies `content` to where it ends `gap` bytes before the end of the memory.
    std::string_view place(std::string_view content, std::size_t gap) const {
        char* const start = end - gap - content.size();
        std::copy(content.begin(), content.end(), start);
        return {start, content.size()};
    }

    char* begin;
    char* end;
};

}  // namespace test
