// SPDX-License-Identifier: Apache-2.0
// A document package in memory: its parts, and the relationships of the package as a whole.
#pragma once

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

namespace platform::package {

/// The content of a package file that QuilletFileReader reads and QuilletFileWriter writes.
class QuilletFilePackage {
public:
    struct Relationship {
        std::u16string relationshipType;  ///< the URI of its type
        std::u16string target;            ///< the reference as it stands in the file, unresolved
        std::u16string relationshipId;    ///< unique among the relationships of one source
        std::uint8_t targetMode = 1;      ///< 1 for an internal target, 0 for an external one
    };

    struct Part {
        std::vector<std::uint8_t> content;
        std::u16string contentType;  ///< the media type, with its parameters
        std::u16string partUri;      ///< the name in the package, such as /word/document.xml
        std::vector<Relationship> relationships;  ///< those whose source is this part
    };

    /// An empty package.
    QuilletFilePackage() = default;

    /// Moves the contents out of both vectors, which are left empty.
    QuilletFilePackage(std::vector<Part>& parts, std::vector<Relationship>& relationships)
        : parts_(std::exchange(parts, {})), relationships_(std::exchange(relationships, {})) {}

    /// The parts in the order of the file: a copy, or the parts themselves if the package is given
    /// up (`std::move(package).getParts()`).
    std::vector<Part> getParts() const& { return parts_; }
    std::vector<Part> getParts() && { return std::exchange(parts_, {}); }

    /// The package-level relationships, copied or moved like the parts.
    std::vector<Relationship> getRelationships() const& { return relationships_; }
    std::vector<Relationship> getRelationships() && { return std::exchange(relationships_, {}); }

    /// The same without a copy, valid until the package is changed or destroyed.
    const std::vector<Part>& parts() const noexcept { return parts_; }
    const std::vector<Relationship>& relationships() const noexcept { return relationships_; }

private:
    std::vector<Part> parts_;
    std::vector<Relationship> relationships_;
};

}  // namespace platform::package
