// SPDX-License-Identifier: Apache-2.0
// Part names: which are valid, which are the same, and what the names with a meaning of their own
// say. All names here are UTF-8 and begin with "/".
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace platform::package {

/// The part that says which content type each part has.
constexpr std::string_view contentTypesName = "/[Content_Types].xml";

/// The source of package-level relationships, which is the package and not a part.
constexpr std::string_view packageRoot = "/";

/// The key under which two names of the same part are equal: percent escapes resolved, ASCII
/// letters in lower case.
std::string partNameKey(std::string_view name);

/// Why `name` cannot be a part name, as the end of a sentence ("it has an empty segment"); empty
/// for a valid name. Besides what the format allows, white space, brackets and similar characters
/// and those outside ASCII are accepted: producers write them, and they are unambiguous.
std::string_view partNameProblem(std::string_view name);

/// The extension in ASCII lower case: what follows the last "." of the last segment. Empty if none.
std::string extensionOf(std::string_view name);

/// The source of the relationships that a part named `name` holds ("/word/_rels/document.xml.rels"
/// holds those of "/word/document.xml", "/_rels/.rels" those of packageRoot), or nothing if `name`
/// is not the name of a relationships part.
std::optional<std::string> relationshipsSource(std::string_view name);

/// The name of the part that holds the relationships of `source`.
std::string relationshipsPartName(std::string_view source);

/// One piece of a part that is stored interleaved ("/word/document.xml/[0].piece").
struct Piece {
    std::string_view partName;
    std::uint64_t number;
    bool isLast;
};

/// The piece that `name` names, or nothing if it names a whole part.
std::optional<Piece> pieceNamed(std::string_view name);

/// Whether `name` lies in the folder in which producers leave space to grow and deleted items.
bool isTrash(std::string_view name);

/// The key (partNameKey) of the part to which `target` leads from `source`, whether it exists or
/// not; nothing if it cannot lead to a part: an absolute URI, another host, or the package itself.
std::optional<std::string> targetPartKey(std::string_view source, std::string_view target);

}  // namespace platform::package
