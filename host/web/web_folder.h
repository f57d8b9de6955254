// SPDX-License-Identifier: Apache-2.0
// The files of a folder, for a web server.
#pragma once

#include <filesystem>
#include <optional>
#include <string>
#include <string_view>

#include "platform/posix/file_descriptor.h"

namespace host {

/// A folder whose files are found by the paths of URLs. Files outside of it are never found, nor
/// any that is reached through a symbolic link or has a name that begins with a dot.
class WebFolder {
public:
    struct File {
        platform::FileDescriptor content;
        std::string type;  ///< Its media type, by the ending of its name.
    };

    /// Opens `folder`. Throws std::runtime_error naming it when there is none.
    explicit WebFolder(const std::filesystem::path& folder);

    /// The file at `path`, the decoded path of a URL, which begins with a slash; for one that ends
    /// with a slash, the file index.html in that folder. Nothing when there is no such file.
    std::optional<File> open(std::string_view path) const;

private:
    platform::FileDescriptor folder_;
};

}  // namespace host
