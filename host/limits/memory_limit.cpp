// SPDX-License-Identifier: Apache-2.0
#include "host/limits/memory_limit.h"

#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <fstream>
#include <limits>
#include <string>
#include <system_error>

namespace host {

namespace {

// The limit in the file, or none: the file is missing, or says "max".
std::uint64_t limitIn(const std::string& path) {
    std::ifstream file(path);
    std::uint64_t bytes = 0;
    return file >> bytes ? bytes : std::numeric_limits<std::uint64_t>::max();
}

// The limit of the process's own control group (version 2) and of those that it is in.
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

}  // namespace

std::uint64_t defaultMemoryLimit() {
    const auto pages = static_cast<std::uint64_t>(::sysconf(_SC_PHYS_PAGES));
    const auto pageSize = static_cast<std::uint64_t>(::sysconf(_SC_PAGESIZE));
    return std::min(pages * pageSize, controlGroupLimit()) / 4 * 3;
}

std::uint64_t limitMemory(std::uint64_t bytes) {
    rlimit limit{};
    if (::getrlimit(RLIMIT_DATA, &limit) != 0) {
        throw std::system_error(errno, std::generic_category(), "cannot get the memory limit");
    }
    limit.rlim_cur = std::min<rlim_t>({bytes, limit.rlim_cur, limit.rlim_max});
    if (::setrlimit(RLIMIT_DATA, &limit) != 0) {
        throw std::system_error(errno, std::generic_category(), "cannot set the memory limit");
    }
    return limit.rlim_cur;
}

}  // namespace host
