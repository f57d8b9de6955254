// SPDX-License-Identifier: Apache-2.0
// The XML of the package itself, content types and relationships: small documents of one level,
// whose elements are told by namespace and local name and whose attributes have no namespace.
#pragma once

#include <cstdint>
#include <functional>
#include <pugixml.hpp>
#include <string>
#include <string_view>
#include <vector>

namespace platform::package {

constexpr std::string_view kContentTypesNamespace =
    "http://schemas.openxmlformats.org/package/2006/content-types";
constexpr std::string_view kRelationshipsNamespace =
    "http://schemas.openxmlformats.org/package/2006/relationships";

/// Parses `bytes` (in any Unicode encoding) and calls `visit` for each child element of the root
/// that is in `namespaceUri`, with its local name. Throws std::runtime_error when the bytes are not
/// well-formed XML, have a document type declaration, which packages may not have, or another root
/// than `root` in `namespaceUri`; what `visit` throws passes through.
void forEachElement(
    std::vector<std::uint8_t> bytes, std::string_view root, std::string_view namespaceUri,
    const std::function<void(std::string_view localName, const pugi::xml_node& element)>& visit);

/// The value of the attribute `name` of `element`. Throws std::runtime_error naming the attribute
/// when there is none.
std::string_view requiredAttribute(const pugi::xml_node& element, const char* name);

/// The start of a document whose root is `root` in `namespaceUri`: declaration and root tag.
std::string xmlStart(std::string_view root, std::string_view namespaceUri);

/// Throws std::runtime_error when `text`, in UTF-8, has a character that XML cannot hold.
void requireXmlCharacters(std::string_view text);

/// Appends ` name="value"` with `value`, in UTF-8, escaped. Throws what requireXmlCharacters
/// throws.
void appendAttribute(std::string& xml, std::string_view name, std::string_view value);

/// Appends `text`, in UTF-8, escaped; throws as appendAttribute does.
void appendEscaped(std::string& xml, std::string_view text);

}  // namespace platform::package
