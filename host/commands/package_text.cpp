// SPDX-License-Identifier: Apache-2.0
#include "host/commands/package_text.h"

#include <simdjson.h>

#include <algorithm>
#include <utility>

#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/text/ascii.h"

namespace host {

namespace {

std::string_view withoutLeadingSpace(std::string_view text) {
    text.remove_prefix(static_cast<std::size_t>(
        std::find_if_not(text.begin(), text.end(), platform::text::isspace_ascii) - text.begin()));
    return text;
}

// Why `object` is not a package; empty when it is one.
std::string faultOf(json::Object& object) {
    if (object["parts"].is<json::Array>() && object["relationships"].is<json::Array>()) {
        return "";
    }
    if (object["exception"].is<std::string>()) {
        return "it is the answer to a read that failed: " + object["exception"].get<std::string>();
    }
    return "it lacks the arrays \"parts\" and \"relationships\"";
}

// Whether `text`, valid UTF-8 from some byte on, begins with a character that writing changes in
// the text of a part of an application/ type.
bool beginsWithReplaced(std::string_view text) {
    const auto first = static_cast<unsigned char>(text.front());
    const bool isAsciiControl = first < 0x20 || first == 0x7F;
    const bool isOtherControl = first == 0xC2 && static_cast<unsigned char>(text[1]) < 0xA0;
    return (isAsciiControl && first != '\t' && first != '\n' && first != '\r') || isOtherControl ||
           text.starts_with("\u200B") || text.starts_with("\uFFFE") || text.starts_with("\uFFFF");
}

// Whether `content` comes back byte for byte as that of a part of an application/ type. Binary
// parts may well be valid UTF-8: English in UTF-16 is, with a zero after each letter.
bool isPlainText(const std::string& content) {
    if (!simdjson::validate_utf8(content.data(), content.size())) {
        return false;
    }
    for (std::string_view rest = content; !rest.empty(); rest.remove_prefix(1)) {
        if (beginsWithReplaced(rest)) {
            return false;
        }
    }
    return true;
}

// Why `package` cannot be written as it is, naming the part. Empty when it can.
std::string refusalOf(json::Object& package) {
    if (const json::Value& broken = package[brokenPartsKey]; broken.is<json::Array>()) {
        return "the bytes of " + json::serialize(broken) +
               " were replaced where they are no UTF-8; read the document without --utf8";
    }
    for (json::Value& part : package["parts"].get<json::Array>()) {
        if (!part.is<json::Object>()) {
            return "a part is no JSON object";
        }
        auto& members = part.get<json::Object>();
        for (const char* key : {"partUri", "contentType", "content"}) {
            if (!members[key].is<std::string>()) {
                return std::string("a part lacks the text \"") + key + "\"";
            }
        }
        const auto& content = members["content"].get<std::string>();
        if (members["contentType"].get<std::string>().starts_with("application/") &&
            !isPlainText(content)) {
            return "the part " + members["partUri"].get<std::string>() +
                   " is not plain text, as that of a part of an application/ type has to be; spell "
                   "its type \"Application/...\" to have its bytes stored as they are";
        }
    }
    return "";
}

}  // namespace

PackageText findPackage(std::string_view text) {
    text = withoutLeadingSpace(text);
    if (text.empty()) {
        return {{}, "it is empty", {}};
    }
    json::Input input{text.data(), text.data() + text.size()};
    json::Object object;
    if (json::parseObject(input, object) != json::Status::success) {
        return {{}, "it is no JSON object, or only the beginning of one", {}};
    }
    const auto length = static_cast<std::size_t>(input.position - text.data());
    if (!withoutLeadingSpace(text.substr(length)).empty()) {
        return {{}, "more follows the first JSON object", {}};
    }
    std::string fault = faultOf(object);
    std::string refusal = fault.empty() ? refusalOf(object) : "";
    return {text.substr(0, length), std::move(fault), std::move(refusal)};
}

}  // namespace host
