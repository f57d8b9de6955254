// SPDX-License-Identifier: Apache-2.0
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
using platform::i18n::comesBackUnchanged;
using platform::i18n::to_string;
using platform::i18n::to_ustring;
using platform::package::QuilletFilePackage;
using platform::package::QuilletFileWriter;

namespace {

std::vector<std::uint8_t> toBytes(std::string_view text) {
    return {text.begin(), text.end()};
}

void append(std::vector<std::uint8_t>& bytes, std::string_view text) {
    bytes.insert(bytes.end(), text.begin(), text.end());
}

/// Whether a character that begins with `byte` in UTF-8 may be one that a package's text must not
/// contain: a control code, or of U+0080 to U+00BF, U+2000 to U+2FFF or U+F000 to U+FFFF.
/// Without branches, because only so do compilers make vector instructions of it.
constexpr bool isSuspect(char byte) {
    const auto value = static_cast<unsigned char>(byte);
    return ((value < 0x20) & (value != '\t') & (value != '\n') & (value != '\r')) |
           (value == 0x7F) | (value == 0xC2) | (value == 0xE2) | (value == 0xEF);
}

/// The place of the first suspect byte of `text` from `from` on; its size if there is none. Whole
/// blocks without one, as nearly all are, take the compiler's vector instructions.
std::size_t findSuspect(std::string_view text, std::size_t from) {
    constexpr std::size_t blockSize = 64;
    for (; text.size() - from >= blockSize; from += blockSize) {
        unsigned char found = 0;
        for (std::size_t i = 0; i < blockSize; ++i) {
            found |= static_cast<unsigned char>(isSuspect(text[from + i]));
        }
        if (found != 0) {
            break;
        }
    }
    while (from < text.size() && !isSuspect(text[from])) {
        ++from;
    }
    return from;
}

struct Character {
    char16_t unit;
    std::size_t length;  // in bytes
};

/// The character that begins with the suspect byte at `at` of valid UTF-8.
Character characterAt(std::string_view text, std::size_t at) {
    const auto bits = [&](std::size_t i, unsigned mask) {
        return static_cast<unsigned char>(text[at + i]) & mask;
    };
    if (bits(0, 0x80U) == 0) {
        return {static_cast<char16_t>(bits(0, 0x7FU)), 1};
    }
    if (bits(0, 0x20U) == 0) {
        return {static_cast<char16_t>(bits(0, 0x1FU) << 6U | bits(1, 0x3FU)), 2};
    }
    return {static_cast<char16_t>(bits(0, 0x0FU) << 12U | bits(1, 0x3FU) << 6U | bits(2, 0x3FU)),
            3};
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
        std::string().swap(content);  // so that the image is not held three times
        return toBytes(decoded.view());
    }
    return toBytes(content);
}

// The rule is about UTF-16 code units, but those that it replaces are few and easily told by their
// UTF-8, and the way to UTF-16 and back takes many times longer than to look for them.
std::vector<std::uint8_t> Serialization::cleanTextToUtf8(std::string text) const {
    if (!comesBackUnchanged(text, "UTF-8")) {
        static_cast<void>(to_ustring(text));  // throws, and says where
    }
    const std::string replacement = to_string(std::u16string_view(&replacementChar, 1));
    std::vector<std::uint8_t> cleaned;
    cleaned.reserve(text.size());
    std::size_t done = 0;
    for (std::size_t at = findSuspect(text, 0); at < text.size(); at = findSuspect(text, at)) {
        const auto [unit, length] = characterAt(text, at);
        if (isDisallowedControl(unit) || isNonCharacter(unit) || isZeroWidthSpace(unit)) {
            append(cleaned, std::string_view(text).substr(done, at - done));
            append(cleaned, replacement);
            done = at + length;
        }
        at += length;
    }
    append(cleaned, std::string_view(text).substr(done));
    return cleaned;
}

}  // namespace EditorServices
