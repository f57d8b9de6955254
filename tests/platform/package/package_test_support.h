// SPDX-License-Identifier: Apache-2.0
// What the package tests share: a folder of their own, files, and small packages.
#pragma once

#include <cstdint>
#include <filesystem>
#include <set>
#include <string>
#include <vector>

#include "platform/i18n/codecvt.h"
#include "platform/package/quillet_file_package.h"
#include "tests/platform/package/zip_builder.h"
#include "tests/support/names_in.h"
#include "tests/support/temporary_directory.h"

namespace test {

using platform::package::QuilletFilePackage;
using Part = QuilletFilePackage::Part;
using Relationship = QuilletFilePackage::Relationship;

/// A folder of its own for each test, with paths in UTF-16, as packages take them.
class TemporaryFolder {
public:
    const std::filesystem::path& path() const { return directory_.path(); }

    /// Writes a file of the folder and returns its path.
    std::u16string file(const std::string& name, const std::string& bytes) const {
        test::writeFile(directory_ / name, bytes);
        return at(name);
    }

    std::u16string at(const std::string& name) const {
        return platform::i18n::to_ustring((directory_ / name).string());
    }

    std::string bytesOf(const std::string& name) const { return test::readFile(directory_ / name); }

    /// The names of all files in the folder, sorted.
    std::set<std::string> names() const { return test::namesIn(path()); }

private:
    test::TemporaryDirectory directory_;
};

inline std::string textOf(const std::vector<std::uint8_t>& bytes) {
    return {bytes.begin(), bytes.end()};
}

inline std::vector<std::uint8_t> bytesOf(const std::string& text) {
    return {text.begin(), text.end()};
}

inline std::string typesXml(const std::string& elements) {
    return "<?xml version=\"1.0\"?>"
           "<Types xmlns=\"http://schemas.openxmlformats.org/package/2006/content-types\">" +
           elements + "</Types>";
}

inline std::string relationshipsXmlOf(const std::string& elements) {
    return "<Relationships "
           "xmlns=\"http://schemas.openxmlformats.org/package/2006/relationships\">" +
           elements + "</Relationships>";
}

/// Content types that make every .xml and .txt and .png entry a part.
inline ZipEntry usualTypes() {
    return {"[Content_Types].xml",
            typesXml("<Default Extension='xml' ContentType='application/xml'/>"
                     "<Default Extension='txt' ContentType='text/plain'/>"
                     "<Default Extension='png' ContentType='image/png'/>")};
}

/// An archive of `entries` after usualTypes().
inline std::string usualPackage(std::vector<ZipEntry> entries, const ZipOptions& options = {}) {
    entries.insert(entries.begin(), usualTypes());
    return buildZip(entries, options);
}

}  // namespace test
