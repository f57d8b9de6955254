// SPDX-License-Identifier: Apache-2.0
// Reads packages made of any entries. Their checksums are right, so that the fuzzer gets past them.
//
// An input is lines of which each makes one entry: its name, a tab, and its content, in which \1
// stands for a line feed. A name that begins with \2 is deflated.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "package_round_trip.h"
#include "tests/platform/package/zip_builder.h"

namespace {

test::ZipEntry entryOf(std::string_view line) {
    const std::size_t tab = std::min(line.find('\t'), line.size());
    const bool isDeflated = line.starts_with('\2');
    std::string name(line.substr(isDeflated ? 1 : 0, tab - (isDeflated ? 1 : 0)));
    std::string content(line.substr(std::min(tab + 1, line.size())));
    std::replace(content.begin(), content.end(), '\1', '\n');
    name.resize(std::min<std::size_t>(name.size(), 0xFFFF));
    return {name, content, isDeflated};
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    std::string_view rest(reinterpret_cast<const char*>(data), size);
    std::vector<test::ZipEntry> entries;
    while (!rest.empty()) {
        const std::size_t end = std::min(rest.find('\n'), rest.size());
        entries.push_back(entryOf(rest.substr(0, end)));
        rest.remove_prefix(std::min(end + 1, rest.size()));
    }
    const std::string archive = test::buildZip(entries);
    fuzzing::readAndWriteBack(archive);
    return 0;
}
