// SPDX-License-Identifier: Apache-2.0
// Opens files without hanging: on a pipe to whose other end nobody may ever come, on a device, or
// on a file of which another program holds a lease and does not let go.
#pragma once

#include <sys/stat.h>
#include <sys/types.h>

#include <chrono>
#include <string>

#include "platform/posix/file_descriptor.h"

namespace platform {

/// How long a lease is waited for. The kernel takes one away from its holder 45 seconds after the
/// file is asked for, unless it is configured otherwise.
constexpr std::chrono::milliseconds leasePatience = std::chrono::seconds(60);

/// Opens the file at `path` (UTF-8) with `flags` of open(2), to which it adds what keeps it from
/// hanging, and with `mode` if that creates the file. Where another program holds a lease of a
/// regular file, as file servers do, the holder is told and waited for, as a blocking open does,
/// but for `patience` at most. Returns no descriptor, with the reason in errno, if the file cannot
/// be opened; EWOULDBLOCK if the lease was not given up in time.
///
/// What is opened may be anything but a folder: whoever needs a regular file looks afterwards, and
/// before, because opening a device can have effects.
FileDescriptor openWithoutHanging(const std::string& path, int flags, mode_t mode = 0,
                                  std::chrono::milliseconds patience = leasePatience);

/// A file that was opened, or what is known of one that was not.
struct OpenedFile {
    FileDescriptor descriptor;  ///< none if the file was not opened
    struct stat status {};      ///< of the file, as far as it could be asked for
    int error = 0;              ///< why it cannot be opened; 0 for what is no regular file
};

/// Opens the regular file at `path` (UTF-8) to read it. What is no regular file is not opened, and
/// not waited for. Leases are waited for as openWithoutHanging does.
OpenedFile openRegularFile(const std::string& path,
                           std::chrono::milliseconds patience = leasePatience);

}  // namespace platform
