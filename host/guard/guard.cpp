// SPDX-License-Identifier: Apache-2.0
#include "host/guard/guard.h"

#include <spdlog/spdlog.h>

#include <cstdlib>
#include <stdexcept>
#include <string>

namespace host {

namespace {

namespace fs = std::filesystem;

std::string environment(const char* name) {
    const char* const value = std::getenv(name);
    return value == nullptr ? "" : value;
}

// The folder in which the system has programs keep their own data; empty when it names none.
fs::path usersFolder() {
    if (const std::string service = environment("STATE_DIRECTORY"); !service.empty()) {
        return service;
    }
    if (const std::string states = environment("XDG_STATE_HOME"); !states.empty()) {
        return fs::path(states) / "serialization_host";
    }
    if (const std::string home = environment("HOME"); !home.empty()) {
        return fs::path(home) / ".local/state/serialization_host";
    }
    return {};
}

void prepare(const fs::path& folder, const std::vector<fs::path>& roots) {
    if (folder.empty()) {
        throw std::runtime_error("there is no folder for them");
    }
    for (const fs::path& root : roots) {
        if (History::isBelow(History::nameOf(folder), History::nameOf(root))) {
            throw std::runtime_error(folder.string() + " is in the folder " + root.string() +
                                     ", which clients may use");
        }
    }
    // A folder that was there may be used by others, too. What is made in it is private.
    if (fs::create_directories(folder)) {
        fs::permissions(folder, fs::perms::owner_all);
    }
}

}  // namespace

Guard makeGuard(const GuardOptions& options, const std::vector<fs::path>& roots) {
    if (!options.isOn) {
        return {};
    }
    const fs::path folder = options.folder.empty() ? usersFolder() : options.folder;
    Guard guard;
    try {
        prepare(folder, roots);
    } catch (const std::exception& error) {
        if (!options.folder.empty()) {
            throw;
        }
        spdlog::warn(
            "no earlier versions are kept, and other workers not waited for: {}; "
            "--history DIR names a folder",
            error.what());
        guard.saves = std::make_shared<Saves>(fs::path(), nullptr);
        return guard;
    }
    if (options.keepsVersions) {
        guard.history =
            std::make_shared<History>(HistoryOptions{folder / "versions", roots, options.versions});
    }
    guard.saves = std::make_shared<Saves>(folder / "locks", guard.history);
    return guard;
}

}  // namespace host
