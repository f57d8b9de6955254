// SPDX-License-Identifier: Apache-2.0
#include "host/guard/in_place_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstddef>
#include <stdexcept>

#include "host/guard/file_content.h"
#include "platform/posix/open_regular_file.h"
#include "platform/posix/system_error.h"

namespace host {

namespace {

using platform::throwSystemError;

// Has the disk set aside room for `size` bytes of `file`, where it can do that.
void reserveRoom(int file, off_t size) {
    int result = -1;
    do {
        result = size == 0 ? 0 : ::fallocate(file, FALLOC_FL_KEEP_SIZE, 0, size);
    } while (result != 0 && errno == EINTR);
    if (result != 0 && errno != EOPNOTSUPP && errno != ENOSYS) {
        throwSystemError("cannot be written");
    }
}

}  // namespace

InPlaceFile::InPlaceFile(const std::string& path)
    : file_(platform::openWithoutHanging(path, O_RDWR)) {
    struct stat status {};
    if (!file_ || ::fstat(file_.get(), &status) != 0) {
        throwSystemError("cannot be opened");
    }
    if (!S_ISREG(status.st_mode)) {
        throw std::runtime_error("is not a regular file");
    }
    copy_.reserve(static_cast<std::size_t>(status.st_size));
    copyContent(file_.get(), copy().get());
}

void InPlaceFile::replaceContent(int from) const {
    try {
        writeContentOf(from);
    } catch (...) {
        writeContentOf(copy().get());
        throw;
    }
}

void InPlaceFile::writeContentOf(int from) const {
    const auto size = static_cast<off_t>(sizeOf(from));
    reserveRoom(file_.get(), size);
    copyContent(from, file_.get());
    if (::ftruncate(file_.get(), size) != 0) {
        throwSystemError("cannot be written");
    }
    if (::fsync(file_.get()) != 0) {
        throwSystemError("cannot be saved");
    }
}

}  // namespace host
