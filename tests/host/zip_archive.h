// SPDX-License-Identifier: Apache-2.0
// Zip archives for the tests.
#pragma once

#include <string>
#include <vector>

#include "tests/platform/package/zip_builder.h"

namespace test {

/// The bytes of a zip archive with items of these names, and with a comment.
inline std::string zipArchive(const std::vector<std::string>& names,
                              const std::string& comment = "") {
    std::vector<test::ZipEntry> entries;
    for (const std::string& name : names) {
        entries.emplace_back(name, "<x/>");
    }
    test::ZipOptions options;
    options.comment = comment;
    return test::buildZip(entries, options);
}

}  // namespace test
