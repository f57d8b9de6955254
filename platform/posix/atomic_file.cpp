// SPDX-License-Identifier: Apache-2.0
#include "platform/posix/atomic_file.h"

#include <fcntl.h>
#include <sys/random.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <optional>
#include <stdexcept>
#include <utility>
#include <vector>

#include "platform/posix/open_regular_file.h"
#include "platform/posix/system_error.h"

namespace platform {
namespace {

constexpr std::size_t bufferSize = 65'536;
constexpr std::size_t maxAttributeSize = 65'536;  // of a value, and of the list of all names
constexpr const char* accessControlList = "system.posix_acl_access";

// Repeats `call` as long as a signal interrupts it.
template <class Call>
auto uninterrupted(Call call) {
    auto result = call();
    while (result < 0 && errno == EINTR) {
        result = call();
    }
    return result;
}

// The folder of `path`, with a slash at its end; empty for the current one.
std::string folderOf(const std::string& path) {
    return path.substr(0, path.rfind('/') + 1);
}

// The path at the end of the symbolic links that begin at `path`, where there may be nothing. The
// system follows the links in the folders on the way.
std::string followLinks(std::string path) {
    constexpr int maxLinks = 40;  // as the system itself
    for (int i = 0; i < maxLinks; ++i) {
        std::array<char, PATH_MAX> buffer{};
        const ssize_t length = ::readlink(path.c_str(), buffer.data(), buffer.size());
        if (length < 0 && (errno == EINVAL || errno == ENOENT)) {
            return path;
        }
        if (length < 0) {
            throwSystemError("cannot be found");
        }
        const std::string link(buffer.data(), static_cast<std::size_t>(length));
        path = link.starts_with('/') ? link : folderOf(path).append(link);
    }
    errno = ELOOP;
    throwSystemError("cannot be found");
}

constexpr std::string_view nameBegin = ".~saving-";
constexpr std::string_view nameEnd = ".tmp";
constexpr std::size_t nameDigits = 16;

// A name that no other save uses, short enough for every file system.
std::string randomName() {
    std::uint64_t number = 0;
    if (uninterrupted([&] { return ::getrandom(&number, sizeof number, 0); }) != sizeof number) {
        throwSystemError("cannot be saved: no random name for a temporary file");
    }
    std::array<char, nameDigits + 1> digits{};
    std::snprintf(digits.data(), digits.size(), "%016llx", static_cast<unsigned long long>(number));
    return std::string(nameBegin).append(digits.data()).append(nameEnd);
}

// A path that leads to the file of `descriptor`, wherever that file is now. Unlike the descriptor
// of a file that was opened without reading it, it can be asked for extended attributes.
std::string pathTo(const FileDescriptor& descriptor) {
    return "/proc/self/fd/" + std::to_string(descriptor.get());
}

// The value of the extended attribute `name` of the file at `path`, or nothing, with the reason in
// errno, if it cannot be read.
std::optional<std::string> attributeOf(const std::string& path, const char* name) {
    std::string value(maxAttributeSize, '\0');
    const ssize_t size = ::getxattr(path.c_str(), name, value.data(), value.size());
    if (size < 0) {
        return std::nullopt;
    }
    value.resize(static_cast<std::size_t>(size));
    return value;
}

// The names of the extended attributes of the file at `path`; none where there is no such file.
std::vector<std::string> attributeNamesOf(const std::string& path) {
    std::string list(maxAttributeSize, '\0');
    const ssize_t size = ::listxattr(path.c_str(), list.data(), list.size());
    list.resize(static_cast<std::size_t>(std::max<ssize_t>(size, 0)));
    std::vector<std::string> names;
    for (std::size_t at = 0; at < list.size(); at += names.back().size() + 1) {
        names.emplace_back(list.c_str() + at);
    }
    return names;
}

// Whether an attribute is copied: the users' own, and the label that access depends on. Others
// describe the old content, such as its signature.
bool isLasting(const std::string& attributeName) {
    return attributeName.starts_with("user.") || attributeName == "security.selinux";
}

}  // namespace

AtomicFile::AtomicFile(const std::string& path) {
    const std::string targetPath = followLinks(path);
    const std::string folder = folderOf(targetPath);
    targetName_ = targetPath.substr(folder.size());
    if (targetName_.empty() || targetName_ == "." || targetName_ == "..") {
        throw std::runtime_error(path.empty() ? "has no name" : "is a folder");
    }
    buffer_.reserve(bufferSize);
    openFolder(folder.empty() ? "." : folder);
    examineTarget();
    createTemporary();
}

AtomicFile::~AtomicFile() {
    if (!temporaryName_.empty()) {
        ::unlinkat(folder_.get(), temporaryName_.c_str(), 0);
    }
}

// The folder is held open so that everything happens in it even if it is renamed meanwhile. A
// folder that may be written but not listed cannot be opened for syncing.
void AtomicFile::openFolder(const std::string& folder) {
    folder_ = FileDescriptor(
        uninterrupted([&] { return ::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC); }));
    if (!folder_ && errno == EACCES) {
        folderCanSync_ = false;
        folder_ = FileDescriptor(uninterrupted(
            [&] { return ::open(folder.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC); }));
    }
    if (!folder_) {
        throwSystemError("cannot be saved: its folder cannot be opened");
    }
}

// The target is held by a descriptor, so that everything that the new file takes over comes from
// one file, even if another one takes its path meanwhile. The descriptor opens it neither for
// reading, which may not be allowed, nor for writing. Replacing a file needs no permission to write
// it, so that permission is checked.
void AtomicFile::examineTarget() {
    FileDescriptor target(uninterrupted([&] {
        return ::openat(folder_.get(), targetName_.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC);
    }));
    if (!target && errno == ENOENT) {
        return;
    }
    struct stat status {};
    if (!target || ::fstat(target.get(), &status) != 0) {
        throwSystemError("cannot be examined");
    }
    if (!S_ISREG(status.st_mode)) {
        throw std::runtime_error(S_ISDIR(status.st_mode) ? "is a folder" : "is not a regular file");
    }
    if (::faccessat(AT_FDCWD, pathTo(target).c_str(), W_OK, AT_EACCESS) != 0) {
        throwSystemError("may not be written");
    }
    target_ = std::move(target);
    targetStatus_ = status;
}

// The new content of an existing document stays private until its permissions have been set; a new
// document gets the process's usual permissions.
void AtomicFile::createTemporary() {
    constexpr int attempts = 100;
    const mode_t mode = target_ ? 0600 : 0666;
    for (int i = 0; i < attempts && !temporary_; ++i) {
        std::string name = randomName();
        temporary_ = FileDescriptor(uninterrupted([&] {
            return ::openat(folder_.get(), name.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC,
                            mode);
        }));
        if (temporary_) {
            temporaryName_ = std::move(name);
        } else if (errno != EEXIST) {
            break;
        }
    }
    if (!temporary_) {
        throwSystemError("cannot be saved: no file can be created in its folder");
    }
}

bool AtomicFile::isTemporaryName(std::string_view name) {
    if (name.size() != nameBegin.size() + nameDigits + nameEnd.size() ||
        !name.starts_with(nameBegin) || !name.ends_with(nameEnd)) {
        return false;
    }
    return name.substr(nameBegin.size(), nameDigits).find_first_not_of("0123456789abcdef") ==
           std::string_view::npos;
}

bool AtomicFile::canStandForTarget() const {
    if (!target_) {
        return true;
    }
    struct statx status {};
    const bool isMountPoint =
        ::statx(target_.get(), "", AT_EMPTY_PATH, STATX_BASIC_STATS, &status) == 0 &&
        (status.stx_attributes & STATX_ATTR_MOUNT_ROOT) != 0;
    return targetStatus_.st_nlink == 1 && !isMountPoint &&
           ::fchown(temporary_.get(), targetStatus_.st_uid, targetStatus_.st_gid) == 0;
}

FileDescriptor AtomicFile::openTarget() const {
    FileDescriptor file =
        openWithoutHanging(pathTo(folder_) + "/" + targetName_, O_RDONLY | O_NOFOLLOW);
    struct stat status {};
    if (!file || ::fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode)) {
        return {};
    }
    return file;
}

std::string AtomicFile::contentPath() const {
    return pathTo(temporary_);
}

std::string AtomicFile::temporaryPath() const {
    return pathTo(folder_) + "/" + temporaryName_;
}

void AtomicFile::startSync() const noexcept {
    ::sync_file_range(temporary_.get(), 0, 0, SYNC_FILE_RANGE_WRITE);  // may fail: commit() syncs
}

void AtomicFile::write(std::string_view bytes) {
    if (buffer_.size() + bytes.size() > bufferSize) {
        flush();
    }
    if (bytes.size() >= bufferSize) {
        writeAll(bytes);
    } else {
        buffer_.append(bytes);
    }
}

void AtomicFile::flush() {
    writeAll(buffer_);
    buffer_.clear();
}

void AtomicFile::writeAll(std::string_view bytes) {
    while (!bytes.empty()) {
        const ssize_t count =
            uninterrupted([&] { return ::write(temporary_.get(), bytes.data(), bytes.size()); });
        if (count < 0) {
            throwSystemError("cannot be saved");
        }
        bytes.remove_prefix(static_cast<std::size_t>(count));
    }
}

void AtomicFile::commit() {
    flush();
    if (target_) {
        takeOverAccess();
    }
    if (uninterrupted([&] { return ::fsync(temporary_.get()); }) != 0) {
        throwSystemError("cannot be saved");
    }
    if (::close(temporary_.release()) != 0) {
        throwSystemError("cannot be saved");
    }
    if (::renameat(folder_.get(), temporaryName_.c_str(), folder_.get(), targetName_.c_str()) !=
        0) {
        throwSystemError("cannot be replaced");
    }
    temporaryName_.clear();
    syncFolder();
}

// The permissions come last: changing the owner can clear some of them, and the group's permissions
// are those of the access control list's mask where there is a list.
void AtomicFile::takeOverAccess() {
    const mode_t mode = takeOverOwner();
    takeOverAttributes();
    takeOverAccessControlList();
    if (::fchmod(temporary_.get(), mode) != 0) {
        throwSystemError("cannot be saved with its permissions");
    }
}

// Returns the permissions that are safe with the owner and the group that the file got.
mode_t AtomicFile::takeOverOwner() {
    const auto change = [this](uid_t owner, gid_t group) {
        if (::fchown(temporary_.get(), owner, group) == 0) {
            return true;
        }
        const bool isUnknownHere =
            errno == EINVAL;  // for example an owner from outside a container
        if (errno != EPERM && !isUnknownHere) {
            throwSystemError("cannot be saved with its owner");
        }
        return false;
    };
    const mode_t mode = targetStatus_.st_mode;
    if (change(targetStatus_.st_uid, targetStatus_.st_gid)) {
        return mode & 07777U;
    }
    if (change(static_cast<uid_t>(-1), targetStatus_.st_gid)) {
        return mode & 01777U;
    }
    const mode_t forAll = mode & (mode >> 3U) & 07U;
    return (mode & 01707U) | forAll << 3U;
}

// Attributes are copied as far as the system permits.
void AtomicFile::takeOverAttributes() {
    for (const std::string& name : attributeNamesOf(pathTo(target_))) {
        const auto value =
            isLasting(name) ? attributeOf(pathTo(target_), name.c_str()) : std::nullopt;
        if (value) {
            ::fsetxattr(temporary_.get(), name.c_str(), value->data(), value->size(), 0);
        }
    }
}

// Without its list, or with one inherited from the folder, people could read the document who
// should not.
void AtomicFile::takeOverAccessControlList() {
    const auto hasNone = [] { return errno == ENODATA || errno == ENOTSUP; };
    bool done = false;
    if (const auto list = attributeOf(pathTo(target_), accessControlList)) {
        done = ::fsetxattr(temporary_.get(), accessControlList, list->data(), list->size(), 0) == 0;
    } else if (hasNone()) {
        done = ::fremovexattr(temporary_.get(), accessControlList) == 0 || hasNone();
    }
    if (!done) {
        throwSystemError("cannot be saved with its access control list");
    }
}

void AtomicFile::syncFolder() {
    if (!folderCanSync_) {
        return;
    }
    // Some file systems cannot sync folders, and say so.
    if (uninterrupted([&] { return ::fsync(folder_.get()); }) != 0 && errno != EINVAL) {
        throwSystemError("has been replaced, but that may not be safe on disk");
    }
}

}  // namespace platform
