// SPDX-License-Identifier: Apache-2.0
// Relationships parts: the XML form of QuilletFilePackage::Relationship.
#pragma once

#include <cstdint>
#include <functional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "platform/package/quillet_file_package.h"

namespace platform::package {

constexpr std::string_view relationshipsMediaType =
    "application/vnd.openxmlformats-package.relationships+xml";

/// Reads a relationships part. Targets are kept as they stand. Throws std::runtime_error with the
/// reason when it is invalid, or has two relationships with one id.
std::vector<QuilletFilePackage::Relationship> parseRelationships(std::span<const std::uint8_t> xml);

/// The relationships part for `relationships`. Those of which `isExternal` is true are written as
/// external. Throws std::runtime_error naming the relationship when it has no id or no type, its id
/// is that of another, or it has text that is not valid UTF-16 or that XML cannot hold.
std::string relationshipsXml(
    const std::vector<QuilletFilePackage::Relationship>& relationships,
    const std::function<bool(const QuilletFilePackage::Relationship& relationship,
                             std::string_view target)>& isExternal);

}  // namespace platform::package
