// SPDX-License-Identifier: Apache-2.0
// Uses Landlock through its three system calls, for which the C library has no functions.
//
// Each version of the kernel's interface knows some access rights to files. A domain handles all
// that the running kernel knows, which denies them everywhere, and gives back a few below the
// granted folders:
//
//   version  kernel  rights that it adds
//   1        5.13    execute, read, write, list, remove and make each kind of file
//   2        5.19    refer: rename and link between folders, which version 1 always denies
//   3        6.2     truncate, when by path; truncating by opening needs the right to write
//   5        6.10    ioctl on devices
//
// Version 1 is enough: what the later ones add is either denied by it or not done by the bundle,
// which truncates no file but one that it opens for writing, and calls no ioctl on one. (Version 4
// is about network ports, later ones about signals and sockets.)

#include "host/limits/confinement.h"

#include <fcntl.h>
#include <linux/landlock.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <stdexcept>
#include <system_error>

#include "platform/posix/system_error.h"

namespace host {
namespace {

// What older systems' header lacks.
constexpr std::uint64_t truncateAccess = 1U << 14U;
constexpr std::uint64_t deviceControlAccess = 1U << 15U;

constexpr std::uint64_t allOfVersion1 = 2 * LANDLOCK_ACCESS_FS_MAKE_SYM - 1;

constexpr std::uint64_t readAccess = LANDLOCK_ACCESS_FS_READ_FILE | LANDLOCK_ACCESS_FS_READ_DIR;
constexpr std::uint64_t writeAccess = LANDLOCK_ACCESS_FS_WRITE_FILE | LANDLOCK_ACCESS_FS_MAKE_REG |
                                      LANDLOCK_ACCESS_FS_REMOVE_FILE | truncateAccess;

// The rights that a kernel of `version` knows and can therefore deny.
constexpr std::uint64_t knownTo(int version) {
    std::uint64_t access = allOfVersion1;
    access |= version >= 2 ? LANDLOCK_ACCESS_FS_REFER : 0;
    access |= version >= 3 ? truncateAccess : 0;
    access |= version >= 5 ? deviceControlAccess : 0;
    return access;
}

// Below 1, with the reason in errno, if the kernel has none.
int versionOfKernel() {
    return static_cast<int>(
        ::syscall(SYS_landlock_create_ruleset, nullptr, 0, LANDLOCK_CREATE_RULESET_VERSION));
}

platform::FileDescriptor makeRules(std::uint64_t handledAccess) {
    landlock_ruleset_attr attributes{};
    attributes.handled_access_fs = handledAccess;
    platform::FileDescriptor rules(static_cast<int>(
        ::syscall(SYS_landlock_create_ruleset, &attributes, sizeof attributes, 0)));
    if (rules.get() < 0) {
        platform::throwSystemError("files cannot be confined");
    }
    return rules;
}

[[noreturn]] void failToGrant(const std::filesystem::path& path, int error) {
    throw std::system_error(error, std::generic_category(), path.string() + " cannot be granted");
}

// A descriptor that refers to a file or folder, with symbolic links followed, without opening its
// content.
platform::FileDescriptor pointAt(const std::filesystem::path& path) {
    platform::FileDescriptor file(::open(path.c_str(), O_PATH | O_CLOEXEC));
    if (file.get() < 0) {
        failToGrant(path, errno);
    }
    return file;
}

bool isFolder(const platform::FileDescriptor& file) {
    struct stat status {};
    return ::fstat(file.get(), &status) == 0 && S_ISDIR(status.st_mode);
}

void grant(const platform::FileDescriptor& rules, const std::filesystem::path& path,
           const platform::FileDescriptor& file, std::uint64_t access) {
    landlock_path_beneath_attr rule{};
    rule.allowed_access = access;
    rule.parent_fd = file.get();
    if (::syscall(SYS_landlock_add_rule, rules.get(), LANDLOCK_RULE_PATH_BENEATH, &rule, 0) != 0) {
        failToGrant(path, errno);
    }
}

}  // namespace

std::optional<std::string> whyConfinementIsUnavailable() {
    if (versionOfKernel() >= 1) {
        return std::nullopt;
    }
    switch (errno) {
        case ENOSYS:
            return "the kernel is too old or was built without Landlock, which Linux has from 5.13";
        case EOPNOTSUPP:
            return "Landlock is switched off; the kernel's parameter lsm= has to name it";
        default:
            return "Landlock cannot be used: " + std::generic_category().message(errno);
    }
}

int confinementVersion() {
    return std::max(versionOfKernel(), 0);
}

Confinement::Confinement(const Grants& grants, int version) {
    if (const auto reason = whyConfinementIsUnavailable()) {
        throw std::runtime_error("files cannot be confined: " + *reason);
    }
    const std::uint64_t known = knownTo(version);
    rules_ = makeRules(known);
    for (const std::filesystem::path& path : grants.readWrite) {
        const platform::FileDescriptor folder = pointAt(path);
        if (!isFolder(folder)) {
            failToGrant(path, ENOTDIR);
        }
        grant(rules_, path, folder, (readAccess | writeAccess) & known);
    }
    for (const std::filesystem::path& path : grants.readOnly) {
        const platform::FileDescriptor file = pointAt(path);
        grant(rules_, path, file, isFolder(file) ? readAccess : LANDLOCK_ACCESS_FS_READ_FILE);
    }
}

void Confinement::confineThisThread() const {
    // Without it a confined thread could run a program that has more rights than its user.
    if (::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0 ||
        ::syscall(SYS_landlock_restrict_self, rules_.get(), 0) != 0) {
        platform::throwSystemError("a thread cannot be confined");
    }
}

}  // namespace host
