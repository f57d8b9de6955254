// SPDX-License-Identifier: Apache-2.0
// What is in a folder, a page at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace host {

struct FolderEntry {
    std::string name;
    std::string kind;        // "file", "folder" or "other"; of a link, that of what it leads to
    std::uint64_t size = 0;  // in bytes
    std::int64_t time = 0;   // of the last change of its content, in milliseconds since 1970
};

struct FolderPage {
    std::vector<FolderEntry> entries;  // in the order of their names' bytes
    bool isLast = true;
};

/// The first `most` entries of the folder at `path` whose names come after `after`. Names that are
/// not UTF-8, which no request can hold, and the temporary files of saves are left out. Throws
/// std::system_error. All names of the folder are read for each page, but only the entries of the
/// page are examined.
FolderPage listFolder(const std::string& path, const std::string& after, std::size_t most);

}  // namespace host
