// SPDX-License-Identifier: Apache-2.0
#include "host/server/private_folder.h"

#include <stdlib.h>

#include <cerrno>
#include <cstdlib>
#include <string>
#include <system_error>

namespace host {

namespace {

std::filesystem::path parentFolder() {
    const char* runtime = std::getenv("XDG_RUNTIME_DIR");
    std::error_code ignored;
    if (runtime != nullptr && std::filesystem::path(runtime).is_absolute() &&
        std::filesystem::is_directory(runtime, ignored)) {
        return runtime;
    }
    return std::filesystem::temp_directory_path();
}

}  // namespace

PrivateFolder::PrivateFolder() {
    std::string name = (parentFolder() / "serialization_host.XXXXXX").string();
    if (::mkdtemp(name.data()) == nullptr) {
        throw std::system_error(errno, std::generic_category(), "cannot create a folder " + name);
    }
    path_ = name;
}

void PrivateFolder::remove() const noexcept {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
}

}  // namespace host
