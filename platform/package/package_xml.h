// SPDX-License-Identifier: Apache-2.0
// The XML of the package itself, content types and relationships: small documents of one level,
// whose elements are identified by namespace and local name and whose attributes have no namespace.
//
// It is read strictly. Where one reader refuses and another one guesses, something could be hidden
// in a package.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string>
#include <string_view>

namespace platform::package {

constexpr std::string_view contentTypesNamespace =
    "http://schemas.openxmlformats.org/package/2006/content-types";
constexpr std::string_view relationshipsNamespace =
    "http://schemas.openxmlformats.org/package/2006/relationships";

/// Bytes of the content types or of one relationships part that are accepted: the content types of
/// as many parts as an archive may have, or the links of a worksheet full of them, are some 15 MB.
constexpr std::uint64_t maxPackageXmlBytes = std::uint64_t{32} << 20U;

/// An element while it is visited. Its texts are UTF-8 and valid during the visit.
class XmlElement {
public:
    /// `attributes` are names and values in turn, with a null pointer after the last.
    XmlElement(std::string_view localName, const char* const* attributes)
        : localName_(localName), attributes_(attributes) {}

    std::string_view localName() const noexcept { return localName_; }

    /// The value of the attribute `name`, which has no namespace; nothing if there is none.
    std::optional<std::string_view> attribute(std::string_view name) const;

    /// The same, but throws std::runtime_error naming element and attribute if there is none.
    std::string_view requiredAttribute(std::string_view name) const;

private:
    std::string_view localName_;
    const char* const* attributes_;
};

/// Parses `xml`, in UTF-8 or UTF-16, and calls `visit` for each child element of the root that is
/// in `namespaceUri`. Throws std::runtime_error when the bytes are not well-formed XML with
/// namespaces, are in another encoding, have a document type declaration, which packages may not
/// have, are nested deeper than any package's, or have another root than `root` in `namespaceUri`;
/// what `visit` throws passes through. `visit` may have been called before that is noticed. Takes
/// time in proportion to `xml`, and no memory for what was visited.
void forEachElement(std::span<const std::uint8_t> xml, std::string_view root,
                    std::string_view namespaceUri,
                    const std::function<void(const XmlElement& element)>& visit);

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
