// SPDX-License-Identifier: Apache-2.0
// The parser's rules written down once more in the plainest way, without regard to speed or stack,
// to hold the real parser against.
#pragma once

#include <cerrno>
#include <cstdlib>
#include <deque>
#include <string>
#include <string_view>
#include <vector>

#include "json/parser.h"
#include "json/value.h"

namespace json {

struct Reference {
    static bool atEnd(const Input& input) { return input.position == input.end; }

    static bool isDigit(char c) { return '0' <= c && c <= '9'; }

    static std::size_t remaining(const Input& input) {
        return static_cast<std::size_t>(input.end - input.position);
    }

    /// Skips a comment from after its opening, keeping the last characters read to compare them
    /// with the terminator.
    static void skipComment(Input& input, std::string_view terminator) {
        std::deque<char> latest;
        while (!atEnd(input)) {
            latest.push_back(*input.position++);
            if (latest.size() > terminator.size())
                latest.pop_front();
            if (std::string(latest.begin(), latest.end()) == terminator)
                return;
        }
    }

    static void skipWhitespace(Input& input) {
        while (!atEnd(input)) {
            const char c = *input.position;
            const char next = remaining(input) > 1 ? input.position[1] : '\0';
            if (c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' || c == '\r') {
                ++input.position;
            } else if (input.comments && c == '/' && next == '/') {
                input.position += 2;
                skipComment(input, "\n");
            } else if (input.comments && c == '/' && next == '*') {
                input.position += 2;
                skipComment(input, "*/");
            } else {
                return;
            }
        }
    }

    static Status parseUnit(Input& input, unsigned& unit) {
        if (remaining(input) < 4)
            return Status::endOfInput;
        const std::string digits(input.position, 4);
        if (digits.find_first_not_of("0123456789abcdefABCDEF") != std::string::npos)
            return Status::badUnicodeEscape;
        unit = static_cast<unsigned>(std::strtoul(digits.c_str(), nullptr, 16));
        input.position += 4;
        return Status::success;
    }

    static std::string utf8(unsigned c) {
        const auto byte = [](unsigned value) { return std::string(1, static_cast<char>(value)); };
        if (c < 0x80)
            return byte(c);
        if (c < 0x800)
            return byte(0xC0 + c / 64) + byte(0x80 + c % 64);
        if (c < 0x10000)
            return byte(0xE0 + c / 4096) + byte(0x80 + c / 64 % 64) + byte(0x80 + c % 64);
        return byte(0xF0 + c / 262144) + byte(0x80 + c / 4096 % 64) + byte(0x80 + c / 64 % 64) +
               byte(0x80 + c % 64);
    }

    static Status parseUnicodeEscape(Input& input, std::string& text) {
        unsigned first = 0;
        Status status = parseUnit(input, first);
        if (status != Status::success)
            return status;
        const auto alone = [](unsigned u) {
            return u >= 0xD800 && u <= 0xDFFF ? "\xEF\xBF\xBD" : utf8(u);
        };
        if (first < 0xD800 || first > 0xDBFF) {
            text += alone(first);
            return Status::success;
        }
        if (remaining(input) < 6)
            return Status::endOfInput;
        if (input.position[0] != '\\' || input.position[1] != 'u')
            return Status::badUnicodeEscape;
        input.position += 2;
        unsigned second = 0;
        status = parseUnit(input, second);
        if (status != Status::success)
            return status;
        if (second >= 0xDC00 && second <= 0xDFFF)
            text += utf8(0x10000 + (first - 0xD800) * 0x400 + (second - 0xDC00));
        else
            text += alone(first) + alone(second);
        return Status::success;
    }

    static Status parseString(Input& input, std::string& target) {
        if (atEnd(input))
            return Status::endOfInput;
        if (*input.position != '"')
            return Status::notString;
        ++input.position;
        std::string text;
        while (!atEnd(input)) {
            const char c = *input.position++;
            if (c == '"') {
                target = text;
                return Status::success;
            }
            if (c != '\\') {
                text += c;
                continue;
            }
            if (atEnd(input))
                return Status::endOfInput;
            const std::string letters = "\"/\\bfnrt";
            const std::size_t letter = letters.find(*input.position);
            if (letter != std::string::npos) {
                text += "\"/\\\b\f\n\r\t"[letter];
                ++input.position;
            } else if (*input.position == 'u') {
                ++input.position;
                const Status status = parseUnicodeEscape(input, text);
                if (status != Status::success)
                    return status;
            } else {
                return Status::badEscape;
            }
        }
        return Status::endOfInput;
    }

    /// Takes one or more digits.
    static Status takeDigits(Input& input, Status ifNone, std::string& text) {
        if (atEnd(input))
            return Status::endOfInput;
        if (!isDigit(*input.position))
            return ifNone;
        while (!atEnd(input) && isDigit(*input.position))
            text += *input.position++;
        return Status::success;
    }

    static Status takeInteger(Input& input, Status ifNone, std::string& text) {
        if (!atEnd(input) && *input.position == '-')
            text += *input.position++;
        if (!atEnd(input) && *input.position == '0') {
            text += *input.position++;
            return Status::success;
        }
        return takeDigits(input, ifNone, text);
    }

    static Status parseNumber(Input& input, double& target) {
        std::string text;
        Status status = takeInteger(input, Status::notNumber, text);
        if (status != Status::success)
            return status;
        if (!atEnd(input) && *input.position == '.') {
            text += *input.position++;
            status = takeDigits(input, Status::noFraction, text);
            if (status != Status::success)
                return status;
        }
        if (!atEnd(input) && (*input.position == 'e' || *input.position == 'E')) {
            text += *input.position++;
            if (!atEnd(input) && (*input.position == '+' || *input.position == '-'))
                text += *input.position++;
            status = takeDigits(input, Status::noExponent, text);
            if (status != Status::success)
                return status;
        }
        target = std::strtod(text.c_str(), nullptr);
        return Status::success;
    }

    static Status parseLiteral(Input& input, const std::string& literal, Status mismatch) {
        const std::string rest(input.position, input.end);
        if (rest.size() < literal.size())
            return literal.substr(0, rest.size()) == rest ? Status::endOfInput : mismatch;
        if (rest.substr(0, literal.size()) != literal)
            return mismatch;
        input.position += literal.size();
        return Status::success;
    }

    static Status parseArray(Input& input, Array& target) {
        if (atEnd(input))
            return Status::endOfInput;
        if (*input.position != '[')
            return Status::notArray;
        ++input.position;
        skipWhitespace(input);
        if (atEnd(input))
            return Status::endOfInput;
        Array array;
        if (*input.position == ']') {
            ++input.position;
            target = array;
            return Status::success;
        }
        for (;;) {
            Value element;
            const Status status = parseValue(input, element);
            if (status != Status::success)
                return status;
            array.push_back(element);
            skipWhitespace(input);
            if (atEnd(input))
                return Status::endOfInput;
            const char c = *input.position;
            if (c != ',' && c != ']')
                return Status::badArraySeparator;
            ++input.position;
            if (c == ']') {
                target = array;
                return Status::success;
            }
            skipWhitespace(input);
        }
    }

    static bool isSignedName(const std::string& name) {
        return name == "int64" || name == "int32" || name == "int16" || name == "int8";
    }

    static bool isUnsignedName(const std::string& name) {
        return name == "uint64" || name == "uint32" || name == "uint16" || name == "uint8";
    }

    static Value integerOf(const std::string& text, const std::string& typeName) {
        // Both saturate at the end of their range.
        if (isSignedName(typeName))
            return std::strtol(text.c_str(), nullptr, 10);
        if (text[0] == '-')
            return 0UL;
        return std::strtoul(text.c_str(), nullptr, 10);
    }

    static bool isRefusedAfterInteger(char c) {
        return c == '.' || c == 'e' || c == 'E' || c == '"' || c == '{';
    }

    static Status parseTypedData(Input& input, const std::string& typeName, Value& target) {
        if (!isSignedName(typeName) && !isUnsignedName(typeName))
            return parseValue(input, target);
        if (atEnd(input))
            return Status::endOfInput;
        if (*input.position != '[')
            return Status::notArray;
        ++input.position;
        skipWhitespace(input);
        if (atEnd(input))
            return Status::endOfInput;
        Array array;
        if (*input.position == ']') {
            ++input.position;
            target = array;
            return Status::success;
        }
        for (;;) {
            std::string text;
            const Status status = takeInteger(input, Status::badTypedElement, text);
            if (status != Status::success)
                return status;
            if (!atEnd(input) && isRefusedAfterInteger(*input.position))
                return Status::badTypedElement;
            array.push_back(integerOf(text, typeName));
            skipWhitespace(input);
            if (atEnd(input))
                return Status::endOfInput;
            const char c = *input.position;
            if (isRefusedAfterInteger(c))
                return Status::badTypedElement;
            if (c != ',' && c != ']')
                return Status::badArraySeparator;
            ++input.position;
            if (c == ']') {
                target = array;
                return Status::success;
            }
            skipWhitespace(input);
        }
    }

    static Status parseObject(Input& input, Object& target) {
        if (atEnd(input))
            return Status::endOfInput;
        if (*input.position != '{')
            return Status::notObject;
        ++input.position;
        skipWhitespace(input);
        if (atEnd(input))
            return Status::endOfInput;
        Object object;
        if (*input.position == '}') {
            ++input.position;
            target = object;
            return Status::success;
        }
        std::string typeName;
        bool dataSeen = false;
        const char* dataStart = nullptr;
        for (;;) {
            std::string key;
            Status status = parseString(input, key);
            if (status != Status::success)
                return status;
            skipWhitespace(input);
            if (atEnd(input))
                return Status::endOfInput;
            if (*input.position != ':')
                return Status::noColon;
            ++input.position;
            skipWhitespace(input);
            if (atEnd(input))
                return Status::endOfInput;

            Value value;
            if (key == "kqdata") {
                dataSeen = true;
                dataStart = input.position;
                status = parseTypedData(input, typeName, value);
            } else {
                status = parseValue(input, value);
            }
            if (status != Status::success)
                return status;
            if (key == "kqtype" && value.is<std::string>()) {
                const std::string& name = value.get<std::string>();
                if (isSignedName(name) || isUnsignedName(name)) {
                    typeName = name;
                    if (dataSeen) {
                        Input data{dataStart, input.end, input.comments};
                        Value typed;
                        status = parseTypedData(data, typeName, typed);
                        if (status != Status::success)
                            return status;
                        object["kqdata"] = typed;
                    }
                }
            }
            object.insert({key, value});

            skipWhitespace(input);
            if (atEnd(input))
                return Status::endOfInput;
            const char c = *input.position;
            if (c != ',' && c != '}')
                return Status::badObjectSeparator;
            ++input.position;
            if (c == '}') {
                target = object;
                return Status::success;
            }
            skipWhitespace(input);
        }
    }

    static Status parseBoolean(Input& input, bool& target) {
        const Status status = parseLiteral(input, "true", Status::notBoolean);
        target = status == Status::success;
        return target ? status : parseLiteral(input, "false", Status::notBoolean);
    }

    /// One of the six ways to read a value, from the same start; the result is stored by the first
    /// that succeeds, and the one that got furthest, the earliest of several, says how it went.
    static Status parseValue(Input& input, Value& target) {
        struct Attempt {
            Status status;
            const char* position;
        };
        std::vector<Attempt> attempts;
        const auto attempt = [&](auto routine, auto result) {
            if (!attempts.empty() && attempts.back().status == Status::success)
                return;
            Input own = input;
            const Status status = routine(own, result);
            if (status == Status::success)
                target = Value(result);
            attempts.push_back({status, own.position});
        };
        attempt(parseString, std::string());
        attempt(parseNumber, 0.0);
        attempt(parseObject, Object());
        attempt(parseArray, Array());
        attempt(parseBoolean, false);
        attempt([](Input& own, Null&) { return parseLiteral(own, "null", Status::notNull); },
                Null());

        Attempt furthest = attempts.front();
        for (const Attempt& other : attempts) {
            if (other.position > furthest.position)
                furthest = other;
        }
        input.position = furthest.position;
        return furthest.status;
    }
};

}  // namespace json
