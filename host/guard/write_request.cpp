// SPDX-License-Identifier: Apache-2.0
#include "host/guard/write_request.h"

#include <limits.h>
#include <simdjson.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <map>
#include <utility>

#include "json/parser.h"
#include "json/serialize.h"
#include "json/string_kernels.h"

namespace host {

namespace {

constexpr std::string_view packageContentType = "text/xml";

// Moves past the string that begins at the input, without looking at its escapes.
bool skipString(json::Input& input) {
    input.position = json::detail::stringKernels().measure(input.position + 1, input.end).end;
    return input.position != input.end && ++input.position != input.end;
}

// Moves past a value, to the comma or brace after it.
bool skipValue(json::Input& input) {
    std::size_t depth = 0;
    while (input.position != input.end) {
        const char c = *input.position;
        if (depth == 0 && (c == ',' || c == '}')) {
            return true;
        }
        if (c == '"') {
            if (!skipString(input)) {
                return false;
            }
            continue;
        }
        if (c == '{' || c == '[') {
            ++depth;
        } else if (c == '}' || c == ']') {
            if (depth == 0) {
                return false;
            }
            --depth;
        }
        ++input.position;
    }
    return false;
}

bool skipOver(json::Input& input, char expected) {
    if (json::skipWhitespace(input) != json::Status::success || input.position == input.end ||
        *input.position != expected) {
        return false;
    }
    ++input.position;
    return json::skipWhitespace(input) == json::Status::success;
}

// The members that matter here; a request may have any number of others.
constexpr std::array<std::string_view, 6> names = {"rtcId",   "contentType", "filePath",
                                                   "content", "encoding",    "baseVersion"};

using Members = std::map<std::string, std::string_view>;

// The texts of the values of an object's members, the first of each name. Nothing where the object
// cannot be split into members.
std::optional<Members> membersOf(std::string_view object) {
    json::Input input{object.data(), object.data() + object.size()};
    if (!object.starts_with('{') || !skipOver(input, '{')) {
        return std::nullopt;
    }
    Members members;
    for (;;) {
        std::string key;
        if (json::parseString(input, key) != json::Status::success || !skipOver(input, ':')) {
            return std::nullopt;
        }
        const char* const begin = input.position;
        if (!skipValue(input)) {
            return std::nullopt;
        }
        if (std::find(names.begin(), names.end(), key) != names.end()) {
            members.emplace(std::move(key), std::string_view(begin, input.position));
        }
        if (*input.position == '}') {
            return members;
        }
        if (!skipOver(input, ',')) {
            return std::nullopt;
        }
    }
}

std::string_view textOf(const Members& members, const std::string& key) {
    const auto found = members.find(key);
    return found == members.end() ? std::string_view() : found->second;
}

// Reads a member that is a string. The text of that string, without what may follow it up to the
// next member; nothing where it is none.
std::optional<std::string_view> readString(const Members& members, const std::string& key,
                                           std::string& target) {
    const std::string_view text = textOf(members, key);
    json::Input input{text.data(), text.data() + text.size()};
    if (json::parseString(input, target) != json::Status::success) {
        return std::nullopt;
    }
    return std::string_view(text.data(), input.position);
}

// Whether the bundle accepts `path` as one.
bool isPath(std::string_view path) {
    return path.size() < PATH_MAX && path.find('\0') == std::string_view::npos &&
           simdjson::validate_utf8(path.data(), path.size());
}

}  // namespace

std::optional<WriteRequest> readWriteRequest(std::string_view payload) {
    const std::optional<Members> members = membersOf(payload);
    WriteRequest request;
    std::string contentType;
    if (!members || !readString(*members, "rtcId", request.rtcId) ||
        !readString(*members, "contentType", contentType)) {
        return std::nullopt;
    }
    const auto filePathText = readString(*members, "filePath", request.filePath);
    if (!filePathText || !isPath(request.filePath)) {
        return std::nullopt;
    }
    request.filePathText = *filePathText;
    request.isPackage = contentType == packageContentType;
    const std::string_view content = textOf(*members, "content");
    if (!content.starts_with(request.isPackage ? '{' : '"')) {
        return std::nullopt;
    }
    if (!request.isPackage) {
        request.text = content.substr(0, content.rfind('"') + 1);
        if (!readString(*members, "encoding", request.encoding)) {
            return std::nullopt;
        }
    }
    if (const std::string_view text = textOf(*members, "baseVersion"); !text.empty()) {
        json::Input input{text.data(), text.data() + text.size()};
        if (json::parseValue(input, request.baseVersion) != json::Status::success) {
            return std::nullopt;
        }
    }
    return request;
}

std::string withFilePath(std::string_view payload, const std::string& filePath) {
    std::string result = "{\"filePath\":" + json::serialize(json::Value(filePath)) + ",";
    result.reserve(result.size() + payload.size());
    result.append(payload.substr(1));
    return result;  // not what append() returns: that would copy it once more
}

PathOverwrite::PathOverwrite(std::string_view filePathText, const std::string& filePath)
    : place_(const_cast<char*>(filePathText.data())), own_(filePathText) {
    const std::string text = json::serialize(json::Value(filePath));
    isDone_ = text.size() <= own_.size();
    if (isDone_) {
        std::fill(std::copy(text.begin(), text.end(), place_), place_ + own_.size(), ' ');
    }
}

PathOverwrite::~PathOverwrite() {
    if (isDone_) {
        std::copy(own_.begin(), own_.end(), place_);
    }
}

}  // namespace host
