// SPDX-License-Identifier: Apache-2.0
// A folder for the files of one run of the program, which nobody else may look into.
#pragma once

#include <filesystem>

namespace host {

/// Creates a folder for this user's eyes only, and removes it with all that is in it at the end of
/// its life. A process that is killed leaves it behind.
class PrivateFolder {
public:
    /// Below $XDG_RUNTIME_DIR where there is such a folder, which is in memory and goes with the
    /// user's session, else below the system's folder of temporary files. Throws std::system_error.
    PrivateFolder();

    PrivateFolder(const PrivateFolder&) = delete;
    PrivateFolder& operator=(const PrivateFolder&) = delete;
    ~PrivateFolder() { remove(); }

    /// Removes the folder before its time. Does nothing when it has been removed.
    void remove() const noexcept;

    const std::filesystem::path& path() const noexcept { return path_; }

private:
    std::filesystem::path path_;
};

}  // namespace host
