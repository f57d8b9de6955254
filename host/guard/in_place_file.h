// SPDX-License-Identifier: Apache-2.0
// A file whose content is replaced in place, with the old kept until that has gone well.
#pragma once

#include <string>

#include "platform/posix/file_descriptor.h"
#include "platform/posix/file_in_memory.h"

namespace host {

/// An existing regular file and a copy of its content in memory.
class InPlaceFile {
public:
    /// Opens the file at `path`, links followed, for reading and writing, and copies its content. A
    /// lease that another program holds is waited for. Throws std::system_error when that fails
    /// or the process may not take so much memory, and std::runtime_error when it is not a regular
    /// file.
    explicit InPlaceFile(const std::string& path);

    int descriptor() const noexcept { return file_.get(); }

    /// The copy of the old content.
    const platform::FileDescriptor& copy() const noexcept { return copy_.descriptor(); }

    /// Writes the content of the open file `from` in place of the old, safe on disk. Throws
    /// std::system_error when that fails, after the old content has been put back.
    void replaceContent(int from) const;

private:
    void writeContentOf(int from) const;

    platform::FileDescriptor file_;
    platform::FileInMemory copy_{"old content"};
};

}  // namespace host
