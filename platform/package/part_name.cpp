// SPDX-License-Identifier: Apache-2.0
#include "platform/package/part_name.h"

#include <algorithm>
#include <charconv>
#include <cstddef>
#include <vector>

#include "platform/text/case.h"
#include "platform/text/quoted.h"

namespace platform::package {
namespace {

using text::equalIgnoringCase;
using text::toLowerAscii;

constexpr std::string_view relationshipsFolder = "_rels";
constexpr std::string_view relationshipsExtension = ".rels";

bool endsWithIgnoringCase(std::string_view text, std::string_view end) {
    return text.size() >= end.size() &&
           equalIgnoringCase(text.substr(text.size() - end.size()), end);
}

// The byte for which the percent escape at `at` stands.
std::optional<char> escapedByte(std::string_view text, std::size_t at) {
    unsigned value = 0;
    if (text.size() - at < 3) {
        return std::nullopt;
    }
    const char* digits = text.data() + at + 1;
    const auto [end, error] = std::from_chars(digits, digits + 2, value, 16);
    if (error != std::errc() || end != digits + 2) {
        return std::nullopt;
    }
    return static_cast<char>(value);
}

std::string withEscapesResolved(std::string_view name) {
    std::string resolved;
    resolved.reserve(name.size());
    for (std::size_t i = 0; i < name.size(); ++i) {
        const std::optional<char> byte = name[i] == '%' ? escapedByte(name, i) : std::nullopt;
        resolved += byte.value_or(name[i]);
        i += byte ? 2 : 0;
    }
    return resolved;
}

bool isControl(char c) {
    const auto byte = static_cast<unsigned char>(c);
    return byte < 0x20 || byte == 0x7F;
}

std::string_view characterProblem(std::string_view name) {
    for (std::size_t i = 0; i < name.size(); ++i) {
        if (isControl(name[i])) {
            return "it has a control character";
        }
        if (name[i] == '?' || name[i] == '#' || name[i] == '\\') {
            return "it has one of the characters ? # \\";
        }
        if (name[i] != '%') {
            continue;
        }
        const std::optional<char> byte = escapedByte(name, i);
        if (!byte) {
            return "it has a % without two hexadecimal digits";
        }
        if (*byte == '/' || *byte == '\\' || isControl(*byte)) {
            return "it has an escaped slash, backslash or control character";
        }
    }
    return {};
}

std::string_view lastSegment(std::string_view name) {
    return name.substr(name.rfind('/') + 1);
}

// Whether `reference` begins with a scheme, as absolute URIs do.
bool hasScheme(std::string_view reference) {
    const auto isLetter = [](char c) { return toLowerAscii(c) >= 'a' && toLowerAscii(c) <= 'z'; };
    if (reference.empty() || !isLetter(reference.front())) {
        return false;
    }
    const auto end = std::find_if_not(reference.begin(), reference.end(), [&](char c) {
        return isLetter(c) || (c >= '0' && c <= '9') || c == '+' || c == '-' || c == '.';
    });
    return end != reference.end() && *end == ':';
}

// An absolute path without "." and ".." segments; ".." never leads above the root.
std::string withoutDotSegments(std::string_view path) {
    std::vector<std::string_view> segments;
    for (std::size_t begin = 0; begin < path.size();) {
        const std::size_t end = std::min(path.find('/', begin + 1), path.size());
        const std::string_view segment = path.substr(begin + 1, end - begin - 1);
        if (segment == ".." && !segments.empty()) {
            segments.pop_back();
        } else if (segment != "." && segment != "..") {
            segments.push_back(segment);
        }
        begin = end;
    }
    std::string result;
    for (const std::string_view segment : segments) {
        result.append("/").append(segment);
    }
    return result;
}

}  // namespace

std::string partNameKey(std::string_view name) {
    return toLowerAscii(withEscapesResolved(name));
}

std::string_view partNameProblem(std::string_view name) {
    if (name.empty() || name.front() != '/') {
        return "it does not begin with a slash";
    }
    for (std::size_t begin = 1; begin <= name.size();) {
        const std::size_t end = std::min(name.find('/', begin), name.size());
        if (end == begin) {
            return "it has an empty segment";
        }
        if (name[end - 1] == '.') {
            return "it has a segment that ends with a dot";
        }
        begin = end + 1;
    }
    return characterProblem(name);
}

std::string extensionOf(std::string_view name) {
    const std::string_view segment = lastSegment(name);
    const std::size_t dot = segment.rfind('.');
    return dot == std::string_view::npos ? std::string() : toLowerAscii(segment.substr(dot + 1));
}

std::optional<std::string> relationshipsSource(std::string_view name) {
    const std::string_view file = lastSegment(name);
    const std::string_view folder = name.substr(0, name.size() - file.size());
    if (!endsWithIgnoringCase(file, relationshipsExtension) ||
        !endsWithIgnoringCase(folder, "/_rels/")) {
        return std::nullopt;
    }
    return std::string(folder.substr(0, folder.size() - relationshipsFolder.size() - 1))
        .append(file.substr(0, file.size() - relationshipsExtension.size()));
}

std::string relationshipsPartName(std::string_view source) {
    const std::string_view file = lastSegment(source);
    return std::string(source.substr(0, source.size() - file.size()))
        .append(relationshipsFolder)
        .append("/")
        .append(file)
        .append(relationshipsExtension);
}

std::optional<Piece> pieceNamed(std::string_view name) {
    const std::string_view file = lastSegment(name);
    const bool isLast = endsWithIgnoringCase(file, "].last.piece");
    if (!file.starts_with('[') || !(isLast || endsWithIgnoringCase(file, "].piece"))) {
        return std::nullopt;
    }
    Piece piece{name.substr(0, name.size() - file.size() - 1), 0, isLast};
    const char* numberEnd = file.data() + file.find(']');
    const auto [end, error] = std::from_chars(file.data() + 1, numberEnd, piece.number);
    if (error != std::errc() || end != numberEnd || piece.partName.empty()) {
        return std::nullopt;
    }
    return piece;
}

bool isTrash(std::string_view name) {
    constexpr std::string_view folder = "/[trash]/";
    return equalIgnoringCase(name.substr(0, folder.size()), folder);
}

std::optional<std::string> targetPartKey(std::string_view source, std::string_view target) {
    // The parts of a reference that do not name a part, and the slash that some producers use.
    std::string path(target.substr(0, target.find_first_of("?#")));
    std::replace(path.begin(), path.end(), '\\', '/');
    if (hasScheme(path) || path.starts_with("//")) {
        return std::nullopt;
    }
    if (path.empty()) {
        path = source;
    } else if (path.front() != '/') {
        path.insert(0, source.substr(0, source.rfind('/') + 1));
    }
    std::string resolved = withoutDotSegments(path);
    if (resolved.empty() || resolved.back() == '/') {
        return std::nullopt;
    }
    return partNameKey(resolved);
}

}  // namespace platform::package
