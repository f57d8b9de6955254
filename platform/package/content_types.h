// SPDX-License-Identifier: Apache-2.0
// The content types of a package: which media type each part has, by its name or else by its
// extension.
#pragma once

#include <cstdint>
#include <map>
#include <span>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace platform::package {

class ContentTypes {
public:
    /// Reads [Content_Types].xml. Throws std::runtime_error with the reason when it is invalid, or
    /// gives one part or one extension two types.
    static ContentTypes parse(std::span<const std::uint8_t> xml);

    /// The media type of the part `name`, compared without case: that of the package, or else the
    /// usual one of an image of that extension; null if it has none. Valid as long as this object.
    const std::string* find(std::string_view name) const;

private:
    std::map<std::string, std::string> byExtension_;       // in lower case, without the dot
    std::unordered_map<std::string, std::string> byName_;  // by partNameKey
};

/// Builds [Content_Types].xml for the parts that are added. An extension gets a default when that
/// takes no more elements than naming its parts one by one: for its most frequent type, of several
/// the first added. "xml", which stands for nearly every type, gets one only for application/xml
/// itself.
class ContentTypesBuilder {
public:
    /// Adds the part `name` of `mediaType`, both in UTF-8.
    void add(std::string_view name, std::string_view mediaType);

    /// Gives relationships parts their type. They are not added one by one.
    void addRelationships();

    /// The document. Throws std::runtime_error naming the part when a name or a type has a
    /// character that XML cannot hold.
    std::string xml() const;

private:
    struct Named {
        std::string name;
        std::string extension;
        std::string mediaType;
    };

    std::map<std::string, std::string> defaults() const;

    std::vector<Named> parts_;
    bool hasRelationships_ = false;
};

}  // namespace platform::package
