// SPDX-License-Identifier: Apache-2.0
#include "platform/package/package_xml.h"

#include <algorithm>
#include <cstddef>
#include <map>
#include <new>
#include <stdexcept>

namespace platform::package {
namespace {

struct QualifiedName {
    std::string_view prefix;
    std::string_view localName;
};

QualifiedName qualifiedName(const pugi::xml_node& element) {
    const std::string_view name = element.name();
    const std::size_t colon = name.find(':');
    if (colon == std::string_view::npos) {
        return {{}, name};
    }
    return {name.substr(0, colon), name.substr(colon + 1)};
}

// Namespaces by the prefixes that are bound to them; the empty prefix is that of the default one.
using Namespaces = std::map<std::string_view, std::string_view>;

Namespaces declaredBy(const pugi::xml_node& element) {
    constexpr std::string_view declaration = "xmlns";
    Namespaces namespaces;
    for (const pugi::xml_attribute& attribute : element.attributes()) {
        const std::string_view name = attribute.name();
        if (name == declaration) {
            namespaces.emplace(std::string_view(), attribute.value());
        } else if (name.starts_with("xmlns:")) {
            namespaces.emplace(name.substr(declaration.size() + 1), attribute.value());
        }
    }
    return namespaces;
}

// The namespace of `element`, whose own declarations hide `inherited` ones.
std::string_view namespaceOf(const pugi::xml_node& element, const Namespaces& inherited) {
    const std::string_view prefix = qualifiedName(element).prefix;
    const Namespaces own = declaredBy(element);
    for (const Namespaces* namespaces : {&own, &inherited}) {
        if (const auto found = namespaces->find(prefix); found != namespaces->end()) {
            return found->second;
        }
    }
    return {};
}

void parse(pugi::xml_document& document, std::vector<std::uint8_t>& bytes) {
    const pugi::xml_parse_result result = document.load_buffer_inplace(
        bytes.data(), bytes.size(), pugi::parse_default | pugi::parse_doctype);
    if (result.status == pugi::status_out_of_memory) {
        throw std::bad_alloc();
    }
    if (!result) {
        throw std::runtime_error(std::string("is not well-formed XML: ") + result.description() +
                                 " at offset " + std::to_string(result.offset));
    }
    for (const pugi::xml_node& node : document.children()) {
        if (node.type() == pugi::node_doctype) {
            throw std::runtime_error("has a document type declaration, which is not allowed");
        }
    }
}

}  // namespace

void forEachElement(std::vector<std::uint8_t> bytes, std::string_view root,
                    std::string_view namespaceUri,
                    const std::function<void(std::string_view, const pugi::xml_node&)>& visit) {
    pugi::xml_document document;
    parse(document, bytes);
    const pugi::xml_node rootElement = document.document_element();
    const Namespaces namespaces = declaredBy(rootElement);
    if (qualifiedName(rootElement).localName != root ||
        namespaceOf(rootElement, namespaces) != namespaceUri) {
        throw std::runtime_error("has another root element than " + std::string(root));
    }
    for (const pugi::xml_node& child : rootElement.children()) {
        if (child.type() == pugi::node_element && namespaceOf(child, namespaces) == namespaceUri) {
            visit(qualifiedName(child).localName, child);
        }
    }
}

std::string_view requiredAttribute(const pugi::xml_node& element, const char* name) {
    const pugi::xml_attribute attribute = element.attribute(name);
    if (!attribute) {
        throw std::runtime_error(std::string("has a ") + element.name() + " without " + name);
    }
    return attribute.value();
}

std::string xmlStart(std::string_view root, std::string_view namespaceUri) {
    std::string xml = "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"yes\"?>\n<";
    xml.append(root);
    appendAttribute(xml, "xmlns", namespaceUri);
    return xml.append(">");
}

void appendAttribute(std::string& xml, std::string_view name, std::string_view value) {
    xml.append(" ").append(name).append("=\"");
    appendEscaped(xml, value);
    xml.append("\"");
}

void requireXmlCharacters(std::string_view text) {
    const auto isForbidden = [](char c) {
        return static_cast<unsigned char>(c) < 0x20 && c != '\t' && c != '\n' && c != '\r';
    };
    if (text.find("\xEF\xBF\xBE") != std::string_view::npos ||
        text.find("\xEF\xBF\xBF") != std::string_view::npos ||
        std::any_of(text.begin(), text.end(), isForbidden)) {
        throw std::runtime_error("has a character that XML cannot hold");
    }
}

void appendEscaped(std::string& xml, std::string_view text) {
    requireXmlCharacters(text);
    for (const char c : text) {
        switch (c) {
            case '&':
                xml += "&amp;";
                break;
            case '<':
                xml += "&lt;";
                break;
            case '>':
                xml += "&gt;";
                break;
            case '"':
                xml += "&quot;";
                break;
            case '\t':
                xml += "&#9;";
                break;
            case '\n':
                xml += "&#10;";
                break;
            case '\r':
                xml += "&#13;";
                break;
            default:
                xml += c;
        }
    }
}

}  // namespace platform::package
