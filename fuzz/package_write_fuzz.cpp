// SPDX-License-Identifier: Apache-2.0
// Packages of any parts and relationships: each is refused, or written so that it reads back the
// same, but for what writing settles (external relationships, the case of the top-level type).
//
// An input is lines of fields with tabs between them. A line of two or three fields makes a part:
// name, media type, content. One of four makes a relationship of the part before it, or of the
// package: id, type, target, mode.
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "platform/i18n/codecvt.h"
#include "platform/package/quillet_file_package.h"
#include "platform/package/quillet_file_reader.h"
#include "platform/package/quillet_file_writer.h"
#include "tests/support/temporary_directory.h"

namespace {

using platform::package::QuilletFilePackage;
using Part = QuilletFilePackage::Part;
using Relationship = QuilletFilePackage::Relationship;

std::vector<std::string_view> split(std::string_view text, char separator) {
    std::vector<std::string_view> pieces;
    for (;;) {
        const std::size_t end = text.find(separator);
        pieces.push_back(text.substr(0, end));
        if (end == std::string_view::npos) {
            return pieces;
        }
        text.remove_prefix(end + 1);
    }
}

// Bytes that are no UTF-8 become unpaired surrogates, which the writer has to refuse.
std::u16string text(std::string_view bytes) {
    try {
        return platform::i18n::to_ustring(bytes);
    } catch (const std::runtime_error&) {
        std::u16string result;
        for (const char byte : bytes) {
            result += static_cast<char16_t>(byte < 0 ? 0xD800 + static_cast<unsigned char>(byte)
                                                     : static_cast<unsigned char>(byte));
        }
        return result;
    }
}

QuilletFilePackage packageOf(std::string_view input) {
    std::vector<Part> parts;
    std::vector<Relationship> relationships;
    for (const std::string_view line : split(input, '\n')) {
        const auto fields = split(line, '\t');
        if (fields.size() == 2 || fields.size() == 3) {
            Part& part = parts.emplace_back();
            part.partUri = text(fields[0]);
            part.contentType = text(fields[1]);
            const std::string_view content = fields.size() == 3 ? fields[2] : std::string_view();
            part.content.assign(content.begin(), content.end());
        } else if (fields.size() == 4) {
            auto& owner = parts.empty() ? relationships : parts.back().relationships;
            owner.push_back({text(fields[1]), text(fields[2]), text(fields[0]),
                             static_cast<std::uint8_t>(fields[3].empty() ? 1 : 0)});
        }
    }
    return {parts, relationships};
}

void require(bool holds) {
    if (!holds) {
        std::abort();
    }
}

// Equal but for the mode, which a relationship that leads to no part loses.
void requireSame(const std::vector<Relationship>& read, const std::vector<Relationship>& written) {
    require(std::equal(read.begin(), read.end(), written.begin(), written.end(),
                       [](const Relationship& r, const Relationship& w) {
                           return r.relationshipId == w.relationshipId && r.target == w.target &&
                                  r.relationshipType == w.relationshipType &&
                                  r.targetMode <= w.targetMode;
                       }));
}

void requireSame(const QuilletFilePackage& read, const QuilletFilePackage& written) {
    requireSame(read.getRelationships(), written.getRelationships());
    const std::vector<Part> readParts = read.getParts();
    const std::vector<Part> writtenParts = written.getParts();
    require(readParts.size() == writtenParts.size());
    for (std::size_t i = 0; i < readParts.size(); ++i) {
        require(readParts[i].partUri == writtenParts[i].partUri);
        require(readParts[i].content == writtenParts[i].content);
        require(readParts[i].contentType.size() == writtenParts[i].contentType.size());
        requireSame(readParts[i].relationships, writtenParts[i].relationships);
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    static const test::TemporaryDirectory folder(test::folderInMemory());
    const std::u16string path = platform::i18n::to_ustring((folder / "package").string());
    const QuilletFilePackage package = packageOf({reinterpret_cast<const char*>(data), size});
    try {
        platform::package::QuilletFileWriter writer(path, {});
        writer.write(package);
        writer.close(false);
    } catch (const std::runtime_error&) {
        return 0;
    }
    requireSame(platform::package::QuilletFileReader(path).read(), package);
    return 0;
}
