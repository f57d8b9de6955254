// SPDX-License-Identifier: Apache-2.0
// Documents as requests and answers carry them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>

#include "json/serialize.h"
#include "json/value.h"

namespace test {

inline json::Object fileRequest(const std::string& path, const std::string& contentType) {
    json::Object request;
    request["contentType"] = contentType;
    request["filePath"] = path;
    return request;
}

/// A package with one text part of `text` and one image.
inline json::Object packageDocument(const std::string& text) {
    json::Object part;
    part["partUri"] = "/document.xml";
    part["contentType"] = "application/xml";
    part["content"] = text;
    part["relationship"] = json::Array();
    json::Object image;
    image["partUri"] = "/image.png";
    image["contentType"] = "image/png";
    image["content"] = "data:image/png;base64,iVBORw==";
    image["relationship"] = json::Array();
    json::Object relationship;
    relationship["relationshipId"] = "r1";
    relationship["relationshipType"] = "urn:document";
    relationship["target"] = "document.xml";
    relationship["targetMode"] = "";
    json::Object document;
    document["parts"] = json::Array{std::move(part), std::move(image)};
    document["relationships"] = json::Array{std::move(relationship)};
    return document;
}

inline json::Object writePackage(const std::string& path, const std::string& text) {
    json::Object request = fileRequest(path, "text/xml");
    request["content"] = packageDocument(text);
    return request;
}

/// The answer to a read of that package.
inline std::string packageAnswer(const std::string& text) {
    json::Object answer = packageDocument(text);
    answer["status"] = true;
    return json::serialize(std::move(answer));
}

inline json::Object writeText(const std::string& path, const std::string& text) {
    json::Object request = fileRequest(path, "text/plain");
    request["content"] = text;
    request["encoding"] = "UTF-8";
    return request;
}

inline std::string textAnswer(const std::string& text) {
    json::Object answer;
    answer["data"] = text;
    answer["status"] = true;
    return json::serialize(std::move(answer));
}

/// Text of `size` bytes that does not deflate well.
inline std::string noise(std::size_t size, unsigned seed) {
    std::string text(size, ' ');
    std::uint64_t state = seed + 1;
    for (char& c : text) {
        state = state * 6364136223846793005U + 1442695040888963407U;
        c = static_cast<char>('!' + (state >> 33U) % 90);
    }
    return text;
}

}  // namespace test
