// SPDX-License-Identifier: Apache-2.0
// Replaces files so that a reader sees the old content or the new one, whatever fails in between.
// All system calls of a save are made here.
#pragma once

#include <sys/stat.h>

#include <string>
#include <string_view>

#include "platform/posix/file_descriptor.h"

namespace platform {

/// The new content of one file. It is collected in a temporary file in the same folder, which
/// replaces the target when it is committed and is removed otherwise.
///
/// A symbolic link is followed: the file at its end is replaced, or created if there is none. The
/// new file has the permissions, the owner and group, the access control list and the user's
/// extended attributes of the old one. Where the process may not give files away, its own user
/// becomes the owner, and nobody gains permissions. Other hard links keep the old content.
class AtomicFile {
public:
    /// Creates the temporary file for `path` (UTF-8). Throws std::runtime_error when the target is
    /// not a regular file or may not be written, even if it could be replaced, and when its folder
    /// takes no new file.
    explicit AtomicFile(const std::string& path);

    AtomicFile(const AtomicFile&) = delete;
    AtomicFile& operator=(const AtomicFile&) = delete;

    /// Removes the temporary file if there was no commit.
    ~AtomicFile();

    /// Whether `name` is one that temporary files have.
    static bool isTemporaryName(std::string_view name);

    /// Whether there is a file to be replaced.
    bool hasTarget() const noexcept { return static_cast<bool>(target_); }

    /// Whether a new file can fully replace the target: it has no other hard links, is not a mount
    /// point, and the process may give files to its owner. True without a target.
    bool canStandForTarget() const;

    /// What is at the target's name now, opened to be read; none where there is no regular file, or
    /// it may not be read. Waits for a lease that another program holds.
    FileDescriptor openTarget() const;

    /// The temporary file, open for reading and writing until the commit.
    int content() const noexcept { return temporary_.get(); }

    /// A path by which others can write the new content until the commit, wherever the folder is by
    /// then. Opening it gives the temporary file.
    std::string contentPath() const;

    /// The same for programs that replace the temporary file by renaming another.
    std::string temporaryPath() const;

    /// Whether the new content has replaced the old.
    bool isCommitted() const noexcept { return temporaryName_.empty(); }

    /// Starts writing the content of the temporary file to the disk, so that commit() has less to
    /// wait for. Returns at once.
    void startSync() const noexcept;

    /// Appends to the new content. Throws std::system_error when that fails, after which commit
    /// must not be called.
    void write(std::string_view bytes);

    /// Replaces the old content by the new, safe on disk when it returns. Throws std::system_error
    /// when something fails; the old content is then still there, unless only the last step failed,
    /// which makes the replacement itself safe. Must be called once.
    void commit();

private:
    void openFolder(const std::string& folder);
    void examineTarget();
    void createTemporary();
    void flush();
    void writeAll(std::string_view bytes);
    void takeOverAccess();
    mode_t takeOverOwner();
    void takeOverAttributes();
    void takeOverAccessControlList();
    void syncFolder();

    FileDescriptor folder_;
    bool folderCanSync_ = true;
    std::string targetName_;       // in folder_, links followed
    FileDescriptor target_;        // the file to be replaced, if there is one; only points at it
    struct stat targetStatus_ {};  // of target_
    std::string temporaryName_;    // in folder_; empty once it is gone
    FileDescriptor temporary_;
    std::string buffer_;
};

}  // namespace platform
