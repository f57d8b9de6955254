// SPDX-License-Identifier: Apache-2.0
// Runs the parser and the reference side by side.
#pragma once

#include <sstream>
#include <string>
#include <string_view>

#include "json/parser.h"
#include "json/serialize.h"
#include "tests/json/reference_parser.h"

namespace json {

/// What is different between a routine and its reference on `text`, or an empty string. Values are
/// also compared as text, which tells -0 from 0.
template <typename Target, typename Routine, typename Reference>
std::string difference(std::string_view text, bool comments, Routine routine, Reference reference) {
    const auto run = [&](auto& function, Target& target) {
        Input input{text.data(), text.data() + text.size(), comments};
        const Status status = function(input, target);
        return std::pair(status, input.position - text.data());
    };
    Target actual{};
    Target expected{};
    const auto actualEnd = run(routine, actual);
    const auto expectedEnd = run(reference, expected);
    if (actualEnd == expectedEnd && actual == expected && serialize(actual) == serialize(expected))
        return "";
    std::ostringstream message;
    const auto describe = [&](const auto& end, const Target& value) {
        message << static_cast<std::uint32_t>(end.first) << " at " << end.second << " "
                << serialize(value) << "\n";
    };
    describe(actualEnd, actual);
    message << "expected\n";
    describe(expectedEnd, expected);
    return message.str();
}

/// Runs every routine on `text`, with and without comments. Gives the first difference, or an empty
/// string.
inline std::string differenceFromReference(std::string_view text) {
    for (const bool comments : {false, true}) {
        std::string result =
            difference<Object>(text, comments, parseObject, Reference::parseObject);
        if (result.empty())
            result = difference<Value>(text, comments, parseValue, Reference::parseValue);
        if (result.empty())
            result = difference<Array>(text, comments, parseArray, Reference::parseArray);
        if (result.empty())
            result = difference<double>(text, comments, parseNumber, Reference::parseNumber);
        if (result.empty())
            result = difference<std::string>(text, comments, parseString, Reference::parseString);
        for (std::string name : {"int64", "uint8", "other"}) {
            if (!result.empty())
                break;
            result = difference<Value>(
                text, comments,
                [&](Input& input, Value& value) { return parseTypedData(input, name, value); },
                [&](Input& input, Value& value) {
                    return Reference::parseTypedData(input, name, value);
                });
        }
        if (!result.empty())
            return (comments ? "with comments: " : "without comments: ") + result;
    }
    return "";
}

}  // namespace json
