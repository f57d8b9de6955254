// SPDX-License-Identifier: Apache-2.0
#include "host/bus/bundle_location.h"

#include <array>
#include <stdexcept>
#include <string>
#include <system_error>

namespace host {

namespace {

std::filesystem::path programFolder() {
    return std::filesystem::read_symlink("/proc/self/exe").parent_path();
}

}  // namespace

std::filesystem::path findBundle() {
    // From the program's folder, the bundle's folder in a build tree and in an installation.
    const std::array<std::filesystem::path, 2> bundleFolders = {INSTALLED_LIBRARY_FOLDER,
                                                                INSTALLED_BUNDLE_FOLDER};
    std::string places;
    for (const std::filesystem::path& folder : bundleFolders) {
        std::filesystem::path bundle =
            (programFolder() / folder / BUNDLE_FILE_NAME).lexically_normal();
        std::error_code ignored;
        if (std::filesystem::exists(bundle, ignored)) {
            return bundle;
        }
        if (places.find(bundle.string()) == std::string::npos) {
            places += (places.empty() ? "" : " nor ") + bundle.string();
        }
    }
    throw std::runtime_error("there is no bundle at " + places + "; name one with --bundle");
}

std::filesystem::path findWebFolder() {
    const std::filesystem::path folder =
        (programFolder() / INSTALLED_WEB_FOLDER).lexically_normal();
    std::error_code ignored;
    if (!std::filesystem::exists(folder / "index.html", ignored)) {
        throw std::runtime_error("there is no web page in " + folder.string() +
                                 "; name a folder with --web, or serve none with --no-web");
    }
    return std::filesystem::canonical(folder);
}

}  // namespace host
