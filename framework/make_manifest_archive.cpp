// SPDX-License-Identifier: Apache-2.0
// Makes the archive in which a bundle's file carries its manifest: a zip archive with the folder
// <bundle>/ and the file <bundle>/manifest.json. It holds no times and no owners, unlike those that
// other programs make, so that equal sources make equal bundles.
//
//     make_manifest_archive <bundle's symbolic name> <manifest> <archive>

#include <cstdint>
#include <exception>
#include <fstream>
#include <iostream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

#include "platform/package/zip/reusable_entries.h"
#include "platform/package/zip/writer.h"
#include "platform/posix/atomic_file.h"

namespace {

namespace zip = platform::package::zip;

std::vector<std::uint8_t> contentOf(const std::string& path) {
    std::ifstream file(path, std::ios_base::binary);
    std::vector<std::uint8_t> content{std::istreambuf_iterator<char>(file), {}};
    if (!file) {
        throw std::runtime_error("cannot be read");
    }
    return content;
}

void makeArchive(const std::string& bundle, const std::string& manifest,
                 const std::string& archive) {
    platform::AtomicFile file(archive);
    zip::ReusableEntries nothing{std::string()};
    zip::Writer writer(file, nothing);
    writer.add(bundle + "/", {}, false);
    writer.add(bundle + "/manifest.json", contentOf(manifest), false);
    writer.finish();
    file.commit();
}

}  // namespace

int main(int argc, char** argv) {
    const std::vector<std::string> arguments(argv + 1, argv + argc);
    try {
        makeArchive(arguments.at(0), arguments.at(1), arguments.at(2));
        return 0;
    } catch (const std::exception& error) {
        std::cerr << "make_manifest_archive: " << error.what() << "\n";
        return 1;
    }
}
