// SPDX-License-Identifier: Apache-2.0
// Files that take memory and no disk. The system does not count them towards the limit of a
// process's memory, so that copying a large file into one could take all memory of the machine.
#pragma once

#include <cstddef>
#include <string>

#include "platform/posix/file_descriptor.h"

namespace platform {

/// A file in memory whose bytes count towards the limit of the process's memory. Move-only.
class FileInMemory {
public:
    /// An empty file. `name` is for those who list open files. Throws std::system_error.
    explicit FileInMemory(const char* name);
    FileInMemory(FileInMemory&& other) noexcept;
    FileInMemory& operator=(FileInMemory&& other) = delete;
    FileInMemory(const FileInMemory&) = delete;
    FileInMemory& operator=(const FileInMemory&) = delete;
    ~FileInMemory();

    /// Has at least `size` bytes counted. Call it before the file is that long. Throws
    /// std::system_error when the process may not take so much. Takes no memory itself.
    void reserve(std::size_t size);

    const FileDescriptor& descriptor() const noexcept { return file_; }

    /// A path by which this process, and the threads that are confined to some folders, can open
    /// it.
    std::string path() const;

private:
    FileDescriptor file_;
    void* counted_ = nullptr;  // pages that are never touched
    std::size_t size_ = 0;     // of counted_
};

}  // namespace platform
