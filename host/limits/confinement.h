// SPDX-License-Identifier: Apache-2.0
// Which files a thread may open, enforced by the kernel (Landlock).
#pragma once

#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "platform/posix/file_descriptor.h"

namespace host {

/// What confined threads may open; nothing else.
///
/// A grant is for the file or the folder that has the path when the grant is made, not for the
/// path: it follows a folder that is renamed, and does not cover what takes its name later. So
/// grant the folder of a file that programs replace by renaming, as they do with /etc/resolv.conf.
struct Grants {
    /// Folders below which files may be read, written, created, truncated, removed and renamed
    /// within their folder: what saving a document takes. Folders, links, devices and other special
    /// files cannot be created, and nothing can be moved from one folder to another.
    std::vector<std::filesystem::path> readWrite;

    /// Folders below which files may be read and folders listed, and single files to read.
    std::vector<std::filesystem::path> readOnly;
};

/// Why the running kernel cannot confine threads, as a text for the user; nothing when it can.
std::optional<std::string> whyConfinementIsUnavailable();

/// The version of the running kernel's confinement, 1 or more; 0 when it has none.
int confinementVersion();

/// Confines threads to the files that were granted.
///
/// It matters where a file is when it is opened, not which path leads there: symbolic links, "..",
/// /proc and renaming or relinking between a check and its use do not get out. A hard link or a
/// bind mount below a granted folder is below it, though. Descriptors that are open stay open, and
/// libraries have to be loaded before.
///
/// Handlers of messages run on threads that the message service starts when they are subscribed, so
/// they are confined if the thread that subscribes is.
///
/// Three things the kernel cannot prevent. Threads can still see that files outside exist, and read
/// their sizes, times and permissions, but no content and no list of a folder. Their permissions,
/// owners and times could be changed by path, which our program never does. And a pipe that the
/// process holds open can be opened again as /proc/self/fd/N. The bundle reads and writes no pipes,
/// and sockets and eventfd cannot be opened like that.
class Confinement {
public:
    /// Opens what is granted; without confining anything yet. `version` is that of a kernel whose
    /// confinement is wanted, no newer than the running one. Throws std::runtime_error naming what
    /// is not there, or what should be a folder and is not, and saying why when the kernel cannot
    /// confine.
    explicit Confinement(const Grants& grants, int version = confinementVersion());

    /// Confines the calling thread, and every thread and process that it starts from now on, for
    /// the rest of their lives. None of them can run another program then, nor gain privileges from
    /// one. A thread that is confined twice may open what both allow. The process's other threads
    /// are not affected. Throws std::system_error.
    void confineThisThread() const;

private:
    platform::FileDescriptor rules_;
};

}  // namespace host
