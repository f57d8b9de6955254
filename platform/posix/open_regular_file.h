// SPDX-License-Identifier: Apache-2.0
// Opens files without hanging on a pipe that nobody ever opens at the other end, on a device, or on
// a file on which another program keeps a lease.
#pragma once

#include <sys/stat.h>
#include <sys/types.h>

#include <chrono>
#include <string>

#include "platform/posix/file_descriptor.h"

namespace platform {

/// How long to wait for a lease. By default, the kernel takes it away from its holder after 45
/// seconds.
constexpr std::chrono::milliseconds leasePatience = std::chrono::seconds(60);

/// Opens the file at `path` (UTF-8) with `flags` of open(2), to which it adds those that keep it
/// from hanging, and with `mode` if that creates the file. Where another program holds a lease on a
/// regular file, as file servers do, the kernel asks the holder to release it; this waits for that
/// as a blocking open does, but for `patience` at most. Returns no descriptor, with the reason in
/// errno, if the file cannot be opened; EWOULDBLOCK if the lease was not given up in time.
///
/// What is opened may be anything but a folder: a caller that needs a regular file checks
/// afterwards, and before, because opening a device can have effects.
FileDescriptor openWithoutHanging(const std::string& path, int flags, mode_t mode = 0,
                                  std::chrono::milliseconds patience = leasePatience);

/// An opened file, or what is known of a file that was not opened.
struct OpenedFile {
    FileDescriptor descriptor;  ///< none if the file was not opened
    struct stat status {};      ///< of the file, as far as it is known
    int error = 0;              ///< why it cannot be opened; 0 for what is not a regular file
};

/// Opens the regular file at `path` (UTF-8) to read it. What is not a regular file is neither
/// opened nor waited for. Leases are waited for as in openWithoutHanging.
OpenedFile openRegularFile(const std::string& path,
                           std::chrono::milliseconds patience = leasePatience);

}  // namespace platform
