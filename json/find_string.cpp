// SPDX-License-Identifier: Apache-2.0
#include "json/find_string.h"

#include <cstddef>
#include <utility>

#include "json/parser.h"
#include "json/string_kernels.h"

namespace json {
namespace {

bool at(const Input& input, char c) {
    return input.position != input.end && *input.position == c;
}

/// Moves past `c` and the white space after it. Returns false when the next character is another.
bool skip(Input& input, char c) {
    if (!at(input, c))
        return false;
    ++input.position;
    skipWhitespace(input);
    return true;
}

/// Moves to the comma or brace that ends the member whose value begins here.
void skipValue(Input& input) {
    const detail::StringKernels& kernels = detail::stringKernels();
    std::size_t depth = 0;
    for (; input.position != input.end; ++input.position) {
        switch (*input.position) {
            case '"':
                input.position = kernels.measure(input.position + 1, input.end).end;
                if (input.position == input.end)
                    return;
                break;
            case '[':
            case '{':
                ++depth;
                break;
            case ']':
            case '}':
                if (depth == 0)
                    return;
                --depth;
                break;
            case ',':
                if (depth == 0)
                    return;
                break;
            default:
                break;
        }
    }
}

}  // namespace

std::optional<std::string> findString(std::string_view text, std::string_view key) {
    Input input{text.data(), text.data() + text.size()};
    std::string name;
    if (!skip(input, '{'))
        return std::nullopt;
    do {
        if (parseString(input, name) != Status::success)
            return std::nullopt;
        skipWhitespace(input);
        if (!skip(input, ':'))
            return std::nullopt;
        if (name == key) {
            std::string value;
            return parseString(input, value) == Status::success ? std::optional(std::move(value))
                                                                : std::nullopt;
        }
        skipValue(input);
    } while (skip(input, ','));
    return std::nullopt;
}

}  // namespace json
