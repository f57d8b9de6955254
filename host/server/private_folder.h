// SPDX-License-Identifier: Apache-2.0
// A folder for the files of one run of the program, which nobody else may look into.
#pragma once

#include <filesystem>

#include "platform/posix/file_descriptor.h"

namespace host {

/// Creates a folder for this user's eyes only, and removes it with all that is in it at the end of
/// its life. A process that is killed leaves it behind, and the next one that makes such a folder
/// removes it.
class PrivateFolder {
public:
    /// Below $XDG_RUNTIME_DIR where there is such a folder, which is in memory and goes with the
    /// user's session, else below $TMPDIR or /tmp. Throws std::runtime_error naming the place when
    /// it takes no folder, or has no room for files.
    PrivateFolder();

    PrivateFolder(const PrivateFolder&) = delete;
    PrivateFolder& operator=(const PrivateFolder&) = delete;
    ~PrivateFolder() { remove(); }

    /// Removes the folder before its time. Does nothing when it has been removed.
    void remove() const noexcept;

    const std::filesystem::path& path() const noexcept { return path_; }

private:
    std::filesystem::path path_;
    platform::FileDescriptor lock_;  // Tells other processes that the folder is in use.
};

}  // namespace host
