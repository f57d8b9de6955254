// SPDX-License-Identifier: Apache-2.0
// The process with a lock (flock) on a folder owns it, and the system releases the lock however
// that process ends. Between making a folder and locking it, another process can find it unlocked
// and remove it; the maker then finds it locked by the other, or gone, and makes a new one.
// (systemd-tmpfiles, which removes what is old from /tmp, leaves locked folders alone too.)
#include "host/server/private_folder.h"

#include <fcntl.h>
#include <stdlib.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <stdexcept>
#include <string>
#include <string_view>
#include <system_error>

namespace host {

namespace {

namespace fs = std::filesystem;

using platform::FileDescriptor;

constexpr std::string_view namePrefix = "serialization_host.";

fs::path parentFolder() {
    std::error_code ignored;
    const char* runtime = std::getenv("XDG_RUNTIME_DIR");
    if (runtime != nullptr && fs::path(runtime).is_absolute() &&
        fs::is_directory(runtime, ignored)) {
        return runtime;
    }
    const char* temporary = std::getenv("TMPDIR");
    return temporary == nullptr || *temporary == '\0' ? "/tmp" : temporary;
}

[[noreturn]] void fail(const fs::path& parent, int error) {
    throw std::runtime_error("cannot keep files in " + parent.string() + ": " +
                             std::generic_category().message(error) +
                             "; XDG_RUNTIME_DIR or TMPDIR can name another folder");
}

// The lock of `folder`; none if another process has it, or the folder is gone or another user's.
FileDescriptor lock(const fs::path& folder) {
    FileDescriptor opened(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    struct stat status {};
    const bool isLocked = opened && ::flock(opened.get(), LOCK_EX | LOCK_NB) == 0 &&
                          ::fstat(opened.get(), &status) == 0 && status.st_nlink > 0 &&
                          status.st_uid == ::geteuid();
    return isLocked ? std::move(opened) : FileDescriptor();
}

void removeLeftovers(const fs::path& parent) {
    std::error_code ignored;
    for (const auto& entry : fs::directory_iterator(parent, ignored)) {
        if (entry.path().filename().string().starts_with(namePrefix) && lock(entry.path())) {
            fs::remove_all(entry.path(), ignored);
        }
    }
}

// A message server that cannot write its files gives no useful error.
void requireRoom(const fs::path& folder) {
    constexpr off_t enough = off_t{64} * 1024;
    const FileDescriptor file(::open(folder.c_str(), O_WRONLY | O_TMPFILE | O_CLOEXEC, S_IRUSR));
    const int error = file ? ::posix_fallocate(file.get(), 0, enough) : errno;
    // Some file systems have no files without a name; there, a lack of room shows only later.
    if (error != 0 && error != EOPNOTSUPP && error != EISDIR) {
        fail(folder.parent_path(), error);
    }
}

}  // namespace

PrivateFolder::PrivateFolder() {
    const fs::path parent = parentFolder();
    removeLeftovers(parent);
    do {
        std::string name = (parent / (std::string(namePrefix) + "XXXXXX")).string();
        if (::mkdtemp(name.data()) == nullptr) {
            fail(parent, errno);
        }
        path_ = name;
        lock_ = lock(path_);
    } while (!lock_);
    try {
        requireRoom(path_);
    } catch (...) {
        remove();
        throw;
    }
}

void PrivateFolder::remove() const noexcept {
    std::error_code ignored;
    fs::remove_all(path_, ignored);
}

}  // namespace host
