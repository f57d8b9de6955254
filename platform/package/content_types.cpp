// SPDX-License-Identifier: Apache-2.0
#include "platform/package/content_types.h"

#include <algorithm>
#include <cstddef>
#include <stdexcept>
#include <utility>

#include "platform/package/about.h"
#include "platform/package/package_xml.h"
#include "platform/package/part_name.h"
#include "platform/package/relationships.h"
#include "platform/text/case.h"

namespace platform::package {
namespace {

constexpr std::string_view relationshipsExtension = "rels";
constexpr std::string_view xmlMediaType = "application/xml";

// The types of images where a package gives them none. Some producers forget them, and office
// programs show the images all the same.
constexpr std::pair<std::string_view, std::string_view> imageTypes[] = {
    {"bmp", "image/bmp"},     {"emf", "image/x-emf"}, {"gif", "image/gif"},
    {"jpeg", "image/jpeg"},   {"jpg", "image/jpeg"},  {"png", "image/png"},
    {"svg", "image/svg+xml"}, {"tif", "image/tiff"},  {"tiff", "image/tiff"},
    {"wmf", "image/x-wmf"}};

// Enters a type under `key`. Repeating a type is harmless, two different types are an error. Media
// types compare without case.
template <class Map>
void enter(Map& types, std::string key, std::string_view mediaType) {
    if (mediaType.empty()) {
        throw std::runtime_error("has an empty content type for " + quoted(key));
    }
    const auto [place, isNew] = types.try_emplace(std::move(key), mediaType);
    if (!isNew && !text::equalIgnoringCase(place->second, mediaType)) {
        throw std::runtime_error("has two content types for " + quoted(place->first));
    }
}

// Whether `extension` may get a default: with other characters, readers would compare its escapes.
bool canHaveDefault(std::string_view extension) {
    return !extension.empty() && std::all_of(extension.begin(), extension.end(), [](char c) {
        return (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '-' || c == '_';
    });
}

void appendDefault(std::string& xml, std::string_view extension, std::string_view mediaType) {
    xml.append("<Default");
    appendAttribute(xml, "Extension", extension);
    appendAttribute(xml, "ContentType", mediaType);
    xml.append("/>");
}

}  // namespace

ContentTypes ContentTypes::parse(std::span<const std::uint8_t> xml) {
    ContentTypes types;
    forEachElement(xml, "Types", contentTypesNamespace, [&](const XmlElement& element) {
        if (element.localName() == "Default") {
            enter(types.byExtension_, partNameKey(element.requiredAttribute("Extension")),
                  element.requiredAttribute("ContentType"));
        } else if (element.localName() == "Override") {
            enter(types.byName_, partNameKey(element.requiredAttribute("PartName")),
                  element.requiredAttribute("ContentType"));
        }
    });
    for (const auto& [extension, mediaType] : imageTypes) {
        types.byExtension_.try_emplace(std::string(extension), mediaType);
    }
    return types;
}

const std::string* ContentTypes::find(std::string_view name) const {
    if (const auto named = byName_.find(partNameKey(name)); named != byName_.end()) {
        return &named->second;
    }
    const auto extension = byExtension_.find(partNameKey(extensionOf(name)));
    return extension == byExtension_.end() ? nullptr : &extension->second;
}

void ContentTypesBuilder::add(std::string_view name, std::string_view mediaType) {
    parts_.push_back({std::string(name), extensionOf(name), std::string(mediaType)});
}

void ContentTypesBuilder::addRelationships() {
    hasRelationships_ = true;
}

std::map<std::string, std::string> ContentTypesBuilder::defaults() const {
    std::map<std::pair<std::string, std::string>, std::size_t> counts;
    for (const Named& part : parts_) {
        ++counts[{part.extension, part.mediaType}];
    }
    std::map<std::string, std::string> result;
    for (const Named& part : parts_) {
        const bool isXml = part.extension == "xml";
        if (!canHaveDefault(part.extension) || part.extension == relationshipsExtension ||
            (isXml && part.mediaType != xmlMediaType)) {
            continue;
        }
        const auto [current, isNew] = result.try_emplace(part.extension, part.mediaType);
        if (!isNew &&
            counts[{part.extension, part.mediaType}] > counts[{part.extension, current->second}]) {
            current->second = part.mediaType;
        }
    }
    if (hasRelationships_) {
        result.emplace(relationshipsExtension, relationshipsMediaType);
    }
    return result;
}

std::string ContentTypesBuilder::xml() const {
    const std::map<std::string, std::string> byExtension = defaults();
    std::string xml = xmlStart("Types", contentTypesNamespace);
    for (const auto& [extension, mediaType] : byExtension) {
        appendDefault(xml, extension, mediaType);
    }
    for (const Named& part : parts_) {
        const auto standard = byExtension.find(part.extension);
        if (standard != byExtension.end() && standard->second == part.mediaType) {
            continue;
        }
        xml.append("<Override");
        appendAttribute(xml, "PartName", part.name);
        appendAttribute(xml, "ContentType", part.mediaType);
        xml.append("/>");
    }
    return xml.append("</Types>");
}

}  // namespace platform::package
