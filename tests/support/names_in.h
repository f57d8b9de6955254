// SPDX-License-Identifier: Apache-2.0
// What is in a folder.
#pragma once

#include <filesystem>
#include <set>
#include <string>

namespace test {

/// The names of all that is in `folder`, in ascending order.
inline std::set<std::string> namesIn(const std::filesystem::path& folder) {
    std::set<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(folder)) {
        names.insert(entry.path().filename());
    }
    return names;
}

}  // namespace test
