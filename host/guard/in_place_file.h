// SPDX-License-Identifier: Apache-2.0
// A file that is written in place, with its old content kept until that has gone well.
#pragma once

#include <string>
#include <utility>

#include "platform/posix/file_descriptor.h"

namespace host {

/// An existing regular file and a copy of its content in memory.
class InPlaceFile {
public:
    /// Opens the file at `path`, links followed, for reading and writing, and copies its content.
    /// Throws std::system_error when that fails, and std::runtime_error when it is no regular file.
    explicit InPlaceFile(const std::string& path);

    int descriptor() const noexcept { return file_.get(); }

    /// A path that leads to the file even if another is put at its own.
    std::string path() const;

    /// Makes the file's content safe on disk. Throws std::system_error.
    void sync() const;

    /// Writes the content of the open file `from` in the place of the old, safe on disk. Throws
    /// std::system_error when that fails, after the old content has been put back.
    void replaceContent(int from) const;

    /// Puts the old content back and makes it safe on disk. Throws std::system_error.
    void putBack() const;

    /// The copy of the old content, which is not to be put back any more.
    platform::FileDescriptor releaseCopy() noexcept { return std::move(copy_); }

private:
    void writeContentOf(int from) const;

    platform::FileDescriptor file_;
    platform::FileDescriptor copy_;
};

}  // namespace host
