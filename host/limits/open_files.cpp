// SPDX-License-Identifier: Apache-2.0
#include "host/limits/open_files.h"

#include <sys/resource.h>

#include <algorithm>

#include "platform/posix/system_error.h"

namespace host {

void raiseOpenFileLimit() {
    // More than all clients of the web page can use; the system may allow a billion.
    constexpr rlim_t enough = 16'384;
    rlimit limit{};
    if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) {
        platform::throwSystemError("cannot get the limit of files");
    }
    limit.rlim_cur = std::max(limit.rlim_cur, std::min(limit.rlim_max, enough));
    if (::setrlimit(RLIMIT_NOFILE, &limit) != 0) {
        platform::throwSystemError("cannot set the limit of files");
    }
}

}  // namespace host
