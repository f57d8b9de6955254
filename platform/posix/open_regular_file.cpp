// SPDX-License-Identifier: Apache-2.0
#include "platform/posix/open_regular_file.h"

#include <fcntl.h>

#include <algorithm>
#include <cerrno>
#include <thread>
#include <utility>

namespace platform {
namespace {

constexpr std::chrono::milliseconds shortestWait(1);
constexpr std::chrono::milliseconds longestWait(50);

// Opens the file at `path` once the lease on it is gone. Meanwhile a descriptor that opens nothing
// refers to the file, which is then opened through it: so it is the same regular file that was
// examined, whatever has taken its path. Trying again and again is only milliseconds slower than a
// blocking open, and it ends on systems where the kernel never takes a lease away.
FileDescriptor openWhenLeaseIsGone(const std::string& path, int flags,
                                   std::chrono::milliseconds patience) {
    const auto end = std::chrono::steady_clock::now() + patience;
    const FileDescriptor held(::open(path.c_str(), O_PATH | O_CLOEXEC | (flags & O_NOFOLLOW)));
    struct stat status {};
    if (!held || ::fstat(held.get(), &status) != 0) {
        return {};
    }
    if (!S_ISREG(status.st_mode)) {
        errno = EWOULDBLOCK;
        return {};
    }
    const std::string name = "/proc/self/fd/" + std::to_string(held.get());
    for (auto wait = shortestWait;; wait = std::min(2 * wait, longestWait)) {
        FileDescriptor file(::open(name.c_str(), flags & ~O_NOFOLLOW));
        if (file || errno != EWOULDBLOCK || std::chrono::steady_clock::now() >= end) {
            return file;
        }
        std::this_thread::sleep_for(wait);
    }
}

}  // namespace

FileDescriptor openWithoutHanging(const std::string& path, int flags, mode_t mode,
                                  std::chrono::milliseconds patience) {
    flags |= O_CLOEXEC | O_NONBLOCK | O_NOCTTY;
    FileDescriptor file(::open(path.c_str(), flags, mode));
    if (!file && errno == EWOULDBLOCK) {
        // The file exists now, and may be gone when it is opened.
        return openWhenLeaseIsGone(path, flags & ~(O_CREAT | O_EXCL), patience);
    }
    return file;
}

OpenedFile openRegularFile(const std::string& path, std::chrono::milliseconds patience) {
    OpenedFile opened;
    if (::stat(path.c_str(), &opened.status) != 0) {
        opened.error = errno;
        return opened;
    }
    if (!S_ISREG(opened.status.st_mode)) {
        return opened;
    }
    FileDescriptor file = openWithoutHanging(path, O_RDONLY, 0, patience);
    if (!file || ::fstat(file.get(), &opened.status) != 0) {
        opened.error = errno;
    } else if (S_ISREG(opened.status.st_mode)) {
        opened.descriptor = std::move(file);
    }
    return opened;
}

}  // namespace platform
