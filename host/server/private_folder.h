// SPDX-License-Identifier: Apache-2.0
// A private folder for the files of one run of the program.
#pragma once

#include <filesystem>

#include "platform/posix/file_descriptor.h"

namespace host {

/// A folder that only this user can read, removed with all its content at the end of the object's
/// life. A process that is killed leaves it behind, and the next one that makes such a folder
/// removes it.
class PrivateFolder {
public:
    /// Below $XDG_RUNTIME_DIR where there is such a folder, which is in memory and lasts as long as
    /// the user's session, else below $TMPDIR or /tmp. Throws std::runtime_error naming the place
    /// when no folder can be made there, or it has no room for files.
    PrivateFolder();

    PrivateFolder(const PrivateFolder&) = delete;
    PrivateFolder& operator=(const PrivateFolder&) = delete;
    ~PrivateFolder() { remove(); }

    /// Removes the folder early. Does nothing when it has been removed.
    void remove() const noexcept;

    const std::filesystem::path& path() const noexcept { return path_; }

private:
    std::filesystem::path path_;
    platform::FileDescriptor lock_;  // Tells other processes that the folder is in use.
};

}  // namespace host
