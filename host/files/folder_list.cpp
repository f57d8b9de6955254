// SPDX-License-Identifier: Apache-2.0
#include "host/files/folder_list.h"

#include <dirent.h>
#include <fcntl.h>
#include <simdjson.h>
#include <sys/stat.h>

#include <iterator>
#include <memory>
#include <set>
#include <string_view>
#include <utility>

#include "platform/posix/atomic_file.h"
#include "platform/posix/file_descriptor.h"
#include "platform/posix/system_error.h"

namespace host {

namespace {

struct CloseFolder {
    void operator()(DIR* folder) const noexcept { ::closedir(folder); }
};

using Folder = std::unique_ptr<DIR, CloseFolder>;

Folder open(const std::string& path) {
    platform::FileDescriptor file(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    Folder folder(file ? ::fdopendir(file.get()) : nullptr);
    if (!folder) {
        platform::throwSystemError("The folder cannot be opened");
    }
    static_cast<void>(file.release());  // It is the folder's now.
    return folder;
}

bool isShown(std::string_view name) {
    return name != "." && name != ".." && !platform::AtomicFile::isTemporaryName(name) &&
           simdjson::validate_utf8(name.data(), name.size());
}

FolderEntry describe(int folder, std::string name) {
    FolderEntry entry{std::move(name), "other", 0, 0};
    struct stat status {};
    if (::fstatat(folder, entry.name.c_str(), &status, 0) != 0) {
        return entry;  // gone, or a link that leads nowhere
    }
    if (S_ISREG(status.st_mode)) {
        entry.kind = "file";
        entry.size = static_cast<std::uint64_t>(status.st_size);
    } else if (S_ISDIR(status.st_mode)) {
        entry.kind = "folder";
    }
    entry.time = std::int64_t{status.st_mtim.tv_sec} * 1000 + status.st_mtim.tv_nsec / 1'000'000;
    return entry;
}

}  // namespace

FolderPage listFolder(const std::string& path, const std::string& after, std::size_t most) {
    const Folder folder = open(path);
    FolderPage page;
    // Only the names of the page are kept: those of a huge folder would take all memory.
    std::set<std::string> names;
    while (const dirent* const entry = ::readdir(folder.get())) {
        if (entry->d_name <= after || !isShown(entry->d_name)) {
            continue;
        }
        names.emplace(entry->d_name);
        if (names.size() > most) {
            names.erase(std::prev(names.end()));
            page.isLast = false;
        }
    }
    while (!names.empty()) {
        page.entries.push_back(
            describe(::dirfd(folder.get()), std::move(names.extract(names.begin()).value())));
    }
    return page;
}

}  // namespace host
