// SPDX-License-Identifier: Apache-2.0
// Where the host finds its bundle and its web page.
#pragma once

#include <filesystem>

namespace host {

/// The bundle that belongs to the program: the one in the library folder beside the program's own,
/// in a build tree and where it is installed. Throws std::runtime_error naming the places searched
/// when there is none.
std::filesystem::path findBundle();

/// The folder of the web page that belongs to the program. Throws std::runtime_error naming the
/// place searched when there is none.
std::filesystem::path findWebFolder();

}  // namespace host
