// Turns the document JSON back into a package and writes it.

#include <exception>
#include <string_view>
#include <utility>

#include "platform/base64/base64.h"
#include "platform/i18n/codecvt.h"
#include "platform/package/quillet_file_writer.h"
#include "serialization/serialization.h"

namespace EditorServices {

using platform::DataBuffer;
using platform::i18n::codecvt_string_to_ustring;
using platform::i18n::codecvt_ustring_to_string;
using platform::i18n::to_string;
using platform::i18n::to_ustring;
using platform::package::QuilletFilePackage;
using platform::package::QuilletFileWriter;

namespace {

std::vector<std::uint8_t> toBytes(std::string_view text) {
    return {text.begin(), text.end()};
}

}  // namespace

bool Serialization::writePackageDocument(std::u16string path, json::Object document) const {
    // Taken outside the try block: a document without these arrays is a faulty request, which gets
    // no answer, while a fault inside an element is a failed write, which gets one.
    json::Array parts = std::move(document[partsKey].get<json::Array>());
    json::Array relationships = std::move(document[relationshipsKey].get<json::Array>());
    if (path.empty()) {
        return false;
    }
    try {
        QuilletFileWriter writer(std::move(path), {});
        auto packageParts = partsFromJson(std::move(parts));
        auto packageRelationships = relationshipsFromJson(std::move(relationships), true);
        const QuilletFilePackage package(packageParts, packageRelationships);
        writer.write(package);
        writer.close(false);
        return true;
    } catch (const std::exception&) {
        return false;
    }
}

std::vector<QuilletFilePackage::Part> Serialization::partsFromJson(json::Array array) const {
    std::vector<QuilletFilePackage::Part> parts;
    parts.reserve(array.size());
    for (json::Value& element : array) {
        // Each element is given away as it is converted, so that a large package is not held twice.
        json::Object object = std::move(element.get<json::Object>());
        QuilletFilePackage::Part part;
        part.partUri = to_ustring(object[partUriKey].get<std::string>());
        const std::string& contentType = object[contentTypeKey].get<std::string>();
        part.contentType = to_ustring(contentType);
        part.content =
            decodePartContent(std::move(object[contentKey].get<std::string>()), contentType);
        // Null is the only way to say "none" other than an empty array; the key may not be missing.
        json::Value& relationships = object[relationshipKey];
        if (!relationships.is<json::Null>()) {
            part.relationships =
                relationshipsFromJson(std::move(relationships.get<json::Array>()), true);
        }
        parts.push_back(std::move(part));
    }
    return parts;
}

std::vector<QuilletFilePackage::Relationship> Serialization::relationshipsFromJson(
    json::Array array, bool allowInternal) const {
    std::vector<QuilletFilePackage::Relationship> relationships;
    relationships.reserve(array.size());
    for (json::Value& element : array) {
        json::Object object = std::move(element.get<json::Object>());
        QuilletFilePackage::Relationship relationship;
        relationship.relationshipType = to_ustring(object[relationshipTypeKey].get<std::string>());
        relationship.target = to_ustring(object[targetKey].get<std::string>());
        relationship.relationshipId = to_ustring(object[relationshipIdKey].get<std::string>());
        std::string mode;
        if (const auto found = object.find(targetModeKey); found != object.end()) {
            mode = found->second.get<std::string>();
        }
        // Whatever does not begin with the word is internal, the empty text that reading gives
        // included.
        const bool internal = to_ustring(mode).find(u"External") != 0;
        relationship.targetMode = internal && allowInternal;
        relationships.push_back(std::move(relationship));
    }
    return relationships;
}

std::vector<std::uint8_t> Serialization::decodePartContent(std::string content,
                                                           const std::string& contentType) const {
    if (contentType.starts_with(applicationPrefix)) {
        return cleanTextToUtf8(std::move(content));
    }
    if (contentType.starts_with(imagePrefix) && content.starts_with(dataUriPrefix)) {
        // Without a comma the sum is 0, and all of it is taken for base64.
        const std::size_t body = content.find(',') + 1;
        const DataBuffer decoded = platform::base64decode(std::string_view(content).substr(body));
        return toBytes(decoded.view());
    }
    return toBytes(content);
}

std::vector<std::uint8_t> Serialization::cleanTextToUtf8(std::string text) const {
    codecvt_string_to_ustring decoder("UTF-8", true);
    std::u16string units = to_ustring(text, decoder);
    for (char16_t& unit : units) {
        if (isDisallowedControl(unit) || isNonCharacter(unit) || isZeroWidthSpace(unit)) {
            unit = replacementChar;
        }
    }
    codecvt_ustring_to_string encoder("UTF-8", true);
    return toBytes(to_string(units, encoder));
}

}  // namespace EditorServices
