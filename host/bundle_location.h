// Where the host finds its bundle.
#pragma once

#include <filesystem>

namespace host {

/// The bundle that belongs to the program: the one in the library folder beside the program's own,
/// in a build tree and where it is installed. Throws std::runtime_error that names the places
/// looked at when there is none.
std::filesystem::path findBundle();

}  // namespace host
