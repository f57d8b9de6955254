// SPDX-License-Identifier: Apache-2.0
#include "host/guard/leftovers.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <cstddef>
#include <ctime>
#include <exception>
#include <filesystem>
#include <memory>

#include "platform/posix/atomic_file.h"
#include "platform/posix/file_descriptor.h"

namespace host {

namespace {

constexpr std::chrono::hours pause{1};
constexpr std::time_t oldestInSeconds = 24L * 60 * 60;
constexpr std::size_t mostFolders = 10'000;

struct CloseFolder {
    void operator()(DIR* folder) const noexcept { ::closedir(folder); }
};

void removeOldFrom(platform::FileDescriptor folder) {
    const std::unique_ptr<DIR, CloseFolder> entries(::fdopendir(folder.get()));
    if (!entries) {
        return;
    }
    const int descriptor = folder.release();  // which is the entries' now
    const std::time_t newest = std::time(nullptr) - oldestInSeconds;
    while (const dirent* const entry = ::readdir(entries.get())) {
        if (!platform::AtomicFile::isTemporaryName(entry->d_name)) {
            continue;
        }
        struct stat status {};
        if (::fstatat(descriptor, entry->d_name, &status, AT_SYMLINK_NOFOLLOW) == 0 &&
            S_ISREG(status.st_mode) && status.st_mtime < newest) {
            ::unlinkat(descriptor, entry->d_name, 0);
        }
    }
}

}  // namespace

bool Leftovers::isDue(dev_t device, ino_t folder) {
    const Clock::time_point now = Clock::now();
    const std::lock_guard lock(mutex_);
    if (lookedThrough_.size() >= mostFolders) {
        lookedThrough_.clear();
    }
    const auto [known, isNew] = lookedThrough_.try_emplace({device, folder}, now);
    const bool isDue = isNew || now - known->second >= pause;
    if (isDue) {
        known->second = now;
    }
    return isDue;
}

void Leftovers::removeBeside(const std::string& path) noexcept {
    try {
        const std::filesystem::path folder = std::filesystem::path(path).parent_path();
        platform::FileDescriptor opened(
            ::open(folder.empty() ? "." : folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
        struct stat status {};
        if (opened && ::fstat(opened.get(), &status) == 0 && isDue(status.st_dev, status.st_ino)) {
            removeOldFrom(std::move(opened));
        }
    } catch (const std::exception&) {
        // A later save looks for them again.
        return;
    }
}

}  // namespace host
