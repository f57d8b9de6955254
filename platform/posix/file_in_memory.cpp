// SPDX-License-Identifier: Apache-2.0
#include "platform/posix/file_in_memory.h"

#include <sys/mman.h>

#include <utility>

#include "platform/posix/system_error.h"

namespace platform {

FileInMemory::FileInMemory(const char* name) : file_(::memfd_create(name, MFD_CLOEXEC)) {
    if (!file_) {
        throwSystemError("cannot be kept in memory");
    }
}

FileInMemory::FileInMemory(FileInMemory&& other) noexcept
    : file_(std::move(other.file_)),
      counted_(std::exchange(other.counted_, nullptr)),
      size_(std::exchange(other.size_, 0)) {}

FileInMemory::~FileInMemory() {
    if (counted_ != nullptr) {
        ::munmap(counted_, size_);
    }
}

// What counts are private pages that could be written.
void FileInMemory::reserve(std::size_t size) {
    if (size <= size_) {
        return;
    }
    void* const pages = counted_ == nullptr ? ::mmap(nullptr, size, PROT_READ | PROT_WRITE,
                                                     MAP_PRIVATE | MAP_ANONYMOUS, -1, 0)
                                            : ::mremap(counted_, size_, size, MREMAP_MAYMOVE);
    if (pages == MAP_FAILED) {
        throwSystemError("cannot be kept in memory");
    }
    counted_ = pages;
    size_ = size;
}

std::string FileInMemory::path() const {
    return "/proc/self/fd/" + std::to_string(file_.get());
}

}  // namespace platform
