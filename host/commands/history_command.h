// SPDX-License-Identifier: Apache-2.0
// The command `history`: the earlier versions of a document.
#pragma once

#include <cstddef>
#include <filesystem>
#include <string>

#include "host/guard/guard.h"

namespace host {

struct HistoryCommandOptions {
    std::filesystem::path bundle;
    std::string file;
    std::string contentType;   ///< To show a version as; empty: by its content.
    std::size_t shown = 0;     ///< The number of the version to show; 0: none.
    std::size_t restored = 0;  ///< The number of the version to restore; 0: none.
    GuardOptions guard;
};

/// Lists the earlier versions of a document on `output`, the newest first, a line each: its number
/// from 1, when it was replaced, in UTC, and its size in bytes. Or shows one, as the command `read`
/// does; or restores one, which becomes the newest version of all. Returns the exit status. Throws
/// std::runtime_error when that fails.
int runHistory(const HistoryCommandOptions& options, int output);

}  // namespace host
