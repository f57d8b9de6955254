// SPDX-License-Identifier: Apache-2.0
#include "host/limits/open_files.h"

#include <sys/resource.h>

#include <algorithm>
#include <cerrno>
#include <system_error>

namespace host {

void raiseOpenFileLimit() {
    // More than all clients of the web page can use. What the system allows may be a billion.
    constexpr rlim_t enough = 16'384;
    rlimit limit{};
    if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) {
        throw std::system_error(errno, std::generic_category(), "cannot get the limit of files");
    }
    limit.rlim_cur = std::max(limit.rlim_cur, std::min(limit.rlim_max, enough));
    if (::setrlimit(RLIMIT_NOFILE, &limit) != 0) {
        throw std::system_error(errno, std::generic_category(), "cannot set the limit of files");
    }
}

}  // namespace host
