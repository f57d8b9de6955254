// SPDX-License-Identifier: Apache-2.0
#include "host/limits/memory_limit.h"

#include <pthread.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <fstream>
#include <limits>
#include <string>

#include "platform/posix/system_error.h"

namespace host {

namespace {

// The limit in the file, or none: the file is missing, or says "max".
std::uint64_t limitIn(const std::string& path) {
    std::ifstream file(path);
    std::uint64_t bytes = 0;
    return file >> bytes ? bytes : std::numeric_limits<std::uint64_t>::max();
}

// The limit of the process's own control group (version 2) and of the groups around it.
std::uint64_t controlGroupLimit() {
    std::ifstream groups("/proc/self/cgroup");
    std::uint64_t least = std::numeric_limits<std::uint64_t>::max();
    for (std::string line; std::getline(groups, line);) {
        if (!line.starts_with("0::/")) {
            continue;
        }
        for (std::string group = line.substr(3); !group.empty(); group.erase(group.rfind('/'))) {
            least = std::min(least, limitIn("/sys/fs/cgroup" + group + "/memory.max"));
        }
    }
    return least;
}

// Gives threads stacks of the size that they need and no more: the limit counts all of what
// a stack may become, which by default is 8 MB for each of some twenty threads.
void keepStacksSmall() {
    constexpr std::size_t stackSize = std::size_t{1} << 20U;
    pthread_attr_t attributes;
    int error = ::pthread_getattr_default_np(&attributes);
    if (error == 0) {
        error = ::pthread_attr_setstacksize(&attributes, stackSize);
        if (error == 0) {
            error = ::pthread_setattr_default_np(&attributes);
        }
        ::pthread_attr_destroy(&attributes);
    }
    if (error != 0) {
        throw std::system_error(error, std::generic_category(), "cannot set the size of stacks");
    }
}

}  // namespace

std::uint64_t defaultMemoryLimit() {
    const auto pages = static_cast<std::uint64_t>(::sysconf(_SC_PHYS_PAGES));
    const auto pageSize = static_cast<std::uint64_t>(::sysconf(_SC_PAGESIZE));
    return std::min(pages * pageSize, controlGroupLimit()) / 4 * 3;
}

std::uint64_t limitMemory(std::uint64_t bytes) {
    keepStacksSmall();
    rlimit limit{};
    if (::getrlimit(RLIMIT_DATA, &limit) != 0) {
        platform::throwSystemError("cannot get the memory limit");
    }
    limit.rlim_cur = std::min<rlim_t>({bytes, limit.rlim_cur, limit.rlim_max});
    if (::setrlimit(RLIMIT_DATA, &limit) != 0) {
        platform::throwSystemError("cannot set the memory limit");
    }
    return limit.rlim_cur;
}

}  // namespace host
