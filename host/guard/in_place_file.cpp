// SPDX-License-Identifier: Apache-2.0
#include "host/guard/in_place_file.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <stdexcept>
#include <system_error>

#include "host/guard/file_content.h"

namespace host {

namespace {

[[noreturn]] void failForSystem(const char* what) {
    throw std::system_error(errno, std::generic_category(), what);
}

}  // namespace

InPlaceFile::InPlaceFile(const std::string& path)
    : file_(::open(path.c_str(), O_RDWR | O_NONBLOCK | O_NOCTTY | O_CLOEXEC)) {
    struct stat status {};
    if (!file_ || ::fstat(file_.get(), &status) != 0) {
        failForSystem("cannot be opened");
    }
    if (!S_ISREG(status.st_mode)) {
        throw std::runtime_error("is not a regular file");
    }
    copy_ = platform::FileDescriptor(::memfd_create("old content", MFD_CLOEXEC));
    if (!copy_) {
        failForSystem("cannot be kept while it is written");
    }
    copyContent(file_.get(), copy_.get());
}

std::string InPlaceFile::path() const {
    return "/proc/self/fd/" + std::to_string(file_.get());
}

void InPlaceFile::sync() const {
    if (::fsync(file_.get()) != 0) {
        failForSystem("cannot be saved");
    }
}

void InPlaceFile::replaceContent(int from) const {
    try {
        writeContentOf(from);
    } catch (const std::system_error&) {
        putBack();
        throw;
    }
}

void InPlaceFile::putBack() const {
    writeContentOf(copy_.get());
}

void InPlaceFile::writeContentOf(int from) const {
    if (::ftruncate(file_.get(), 0) != 0) {
        failForSystem("cannot be written");
    }
    copyContent(from, file_.get());
    sync();
}

}  // namespace host
