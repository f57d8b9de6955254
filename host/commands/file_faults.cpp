// SPDX-License-Identifier: Apache-2.0
#include "host/commands/file_faults.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <system_error>

#include "platform/posix/file_descriptor.h"

namespace host {

namespace {

std::string lastError() {
    return std::generic_category().message(errno);
}

bool may(const std::string& path, int access) {
    return ::faccessat(AT_FDCWD, path.c_str(), access, AT_EACCESS) == 0;
}

// What a file of this mode is when it is not a regular one, such as "is a folder".
std::string kindOf(mode_t mode) {
    return S_ISDIR(mode)    ? "is a folder"
           : S_ISFIFO(mode) ? "is a pipe"
           : S_ISSOCK(mode) ? "is a socket"
                            : "is a device";
}

// Why a file that does not exist cannot be created in its folder.
std::string whyNoNewFile(const std::string& path) {
    std::string folder = std::filesystem::path(path).parent_path();
    folder = folder.empty() ? "." : folder;
    struct stat status = {};
    if (::stat(folder.c_str(), &status) != 0) {
        return errno == ENOENT ? "the folder " + folder + " does not exist"
                               : "the folder " + folder + ": " + lastError();
    }
    if (!S_ISDIR(status.st_mode)) {
        return folder + " is not a folder";
    }
    return may(folder, W_OK | X_OK) ? "" : "the folder " + folder + ": " + lastError();
}

std::string whyNoSpace(const std::string& path) {
    struct statvfs disk = {};
    const std::string folder = std::filesystem::path(path).parent_path();
    const bool isFull =
        ::statvfs(folder.empty() ? "." : folder.c_str(), &disk) == 0 && disk.f_bavail == 0;
    return isFull ? "the disk is full" : "";
}

}  // namespace

std::string whyNotReadable(const std::string& path) {
    struct stat status = {};
    if (::stat(path.c_str(), &status) != 0) {
        return lastError();
    }
    if (!S_ISREG(status.st_mode)) {
        return kindOf(status.st_mode);
    }
    return platform::FileDescriptor(
               ::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY))
               ? ""
               : lastError();
}

std::string whyNotWritable(const std::string& path) {
    struct stat status = {};
    if (::stat(path.c_str(), &status) != 0) {
        const std::string reason = errno == ENOENT ? whyNoNewFile(path) : lastError();
        return reason.empty() ? whyNoSpace(path) : reason;
    }
    if (!S_ISREG(status.st_mode)) {
        return kindOf(status.st_mode);
    }
    return may(path, W_OK) ? whyNoSpace(path) : lastError();
}

}  // namespace host
