// SPDX-License-Identifier: Apache-2.0
#include "platform/package/relationships.h"

#include <stdexcept>
#include <unordered_set>

#include "platform/i18n/codecvt.h"
#include "platform/package/about.h"
#include "platform/package/package_xml.h"

namespace platform::package {
namespace {

using Relationship = QuilletFilePackage::Relationship;
using Ids = std::unordered_set<std::string>;

// Checks what reading and writing both demand of a relationship, and notes its id.
void check(const std::string& id, std::string_view type, Ids& ids) {
    if (id.empty()) {
        throw std::runtime_error("has a relationship without an id");
    }
    if (type.empty()) {
        throw std::runtime_error("has a relationship " + quoted(id) + " without a type");
    }
    if (!ids.insert(id).second) {
        throw std::runtime_error("has two relationships of the id " + quoted(id));
    }
}

}  // namespace

std::vector<Relationship> parseRelationships(std::span<const std::uint8_t> xml) {
    std::vector<Relationship> relationships;
    Ids ids;
    forEachElement(xml, "Relationships", relationshipsNamespace, [&](const XmlElement& element) {
        if (element.localName() != "Relationship") {
            return;
        }
        const std::string id(element.requiredAttribute("Id"));
        const std::string_view type = element.requiredAttribute("Type");
        check(id, type, ids);
        Relationship& relationship = relationships.emplace_back();
        relationship.relationshipId = i18n::to_ustring(id);
        relationship.relationshipType = i18n::to_ustring(type);
        relationship.target = i18n::to_ustring(element.requiredAttribute("Target"));
        relationship.targetMode = element.attribute("TargetMode") == "External" ? 0 : 1;
    });
    return relationships;
}

std::string relationshipsXml(
    const std::vector<Relationship>& relationships,
    const std::function<bool(const Relationship&, std::string_view)>& isExternal) {
    std::string xml = xmlStart("Relationships", relationshipsNamespace);
    Ids ids;
    for (const Relationship& relationship : relationships) {
        const std::string id = i18n::to_string(relationship.relationshipId);
        const std::string type = i18n::to_string(relationship.relationshipType);
        const std::string target = i18n::to_string(relationship.target);
        check(id, type, ids);
        xml.append("<Relationship");
        appendAttribute(xml, "Id", id);
        appendAttribute(xml, "Type", type);
        appendAttribute(xml, "Target", target);
        if (isExternal(relationship, target)) {
            appendAttribute(xml, "TargetMode", "External");
        }
        xml.append("/>");
    }
    return xml.append("</Relationships>");
}

}  // namespace platform::package
