// SPDX-License-Identifier: Apache-2.0
// Reads document packages into the document JSON.

#include <cstddef>
#include <cstdint>
#include <exception>
#include <string_view>
#include <utility>

#include "platform/base64/base64.h"
#include "platform/filesystem/filesystem.h"
#include "platform/i18n/codecvt.h"
#include "platform/package/quillet_file_reader.h"
#include "serialization/reading/result_keys.h"
#include "serialization/serialization.h"

namespace EditorServices {

using platform::filesystem::exists;
using platform::i18n::codecvt_ustring_to_string;
using platform::i18n::to_string;
using platform::package::PackageSize;
using platform::package::QuilletFilePackage;
using platform::package::QuilletFileReader;

namespace {

/// The most bytes that reading a package of `size` takes beside the content of its parts and its
/// JSON: images are a third longer as data URIs, and parts and relationships are more than their
/// bytes.
std::uintmax_t memoryBesideContent(const PackageSize& size) {
    constexpr std::uintmax_t perPart = 3000;
    constexpr std::uintmax_t perByteOfRelationships = 25;
    return size.content / 3 + size.parts * perPart + size.relationships * perByteOfRelationships +
           size.compressed;
}

}  // namespace

json::Object Serialization::readPackageDocument(std::u16string path,
                                                std::size_t longestAnswer) const {
    json::Object result;
    try {
        if (!exists(path)) {
            // No "exception" here, unlike for a text file: which is how clients tell the two cases
            // apart.
            result[statusKey] = false;
            return result;
        }
        QuilletFileReader reader(std::move(path));
        const PackageSize size = reader.size();
        awaitMemory(size.content, memoryBesideContent(size), longestAnswer);
        result = packageToJson(reader.read());
        result[statusKey] = true;
    } catch (const std::exception& error) {
        result[exceptionKey] = error.what();
        result[statusKey] = false;
    }
    return result;
}

json::Object Serialization::packageToJson(QuilletFilePackage package) const {
    json::Object document;
    document[partsKey] = partsToJson(std::move(package).getParts());
    // NOLINTNEXTLINE(bugprone-use-after-move): only the parts have been taken.
    document[relationshipsKey] = relationshipsToJson(std::move(package).getRelationships());
    return document;
}

json::Array Serialization::partsToJson(std::vector<QuilletFilePackage::Part> parts) const {
    json::Array array;
    array.reserve(parts.size());
    for (QuilletFilePackage::Part& part : parts) {
        // Each part is moved out as it is converted, so that a large package is not held twice.
        array.push_back(partToJson(std::move(part)));
    }
    return array;
}

json::Object Serialization::partToJson(QuilletFilePackage::Part part) const {
    codecvt_ustring_to_string converter("UTF-8", true);
    const std::string type = to_string(part.contentType, converter);

    json::Object object;
    object[relationshipKey] = relationshipsToJson(part.relationships);
    object[contentKey] = encodePartContent(std::move(part.content), type);
    object[contentTypeKey] = type;
    object[partUriKey] = to_string(part.partUri, converter);
    return object;
}

json::Array Serialization::relationshipsToJson(
    const std::vector<QuilletFilePackage::Relationship>& relationships) const {
    json::Array array;
    array.reserve(relationships.size());
    for (const QuilletFilePackage::Relationship& relationship : relationships) {
        array.push_back(relationshipToJson(relationship));
    }
    return array;
}

json::Object Serialization::relationshipToJson(
    const QuilletFilePackage::Relationship& relationship) const {
    codecvt_ustring_to_string converter("UTF-8", true);
    json::Object object;
    object[relationshipIdKey] = to_string(relationship.relationshipId, converter);
    object[relationshipTypeKey] = to_string(relationship.relationshipType, converter);
    object[targetKey] = to_string(relationship.target, converter);
    // Always empty: clients decide by the target.
    object[targetModeKey] = "";
    return object;
}

std::string Serialization::encodePartContent(std::vector<std::uint8_t> bytes,
                                             const std::string& contentType) const {
    const std::string_view text(reinterpret_cast<const char*>(bytes.data()), bytes.size());
    if (!contentType.starts_with(imagePrefix)) {
        return std::string(text);
    }
    std::string dataUri = dataUriPrefix + contentType + ";base64,";
    if (text.starts_with(dataUri)) {
        // The part holds a data URI already; encoding it once more would hide the image.
        return std::string(text);
    }
    platform::base64encode(text, dataUri);
    return dataUri;
}

}  // namespace EditorServices
