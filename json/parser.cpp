// SPDX-License-Identifier: Apache-2.0
// The parser. Strings, numbers, literals and typed data have a routine each; arrays, objects and
// the values in them are parsed together by TreeParser, which keeps the containers that are open on
// a stack of its own, so that no depth can exhaust the thread's.
//
//     object  =  "{" [ member *( "," member ) ] "}"
//     member  =  string ":" value
//     array   =  "[" [ value *( "," value ) ] "]"
//     value   =  string / number / object / array / "true" / "false" / "null"
//     number  =  integer [ "." 1*digit ] [ ( "e" / "E" ) [ "+" / "-" ] 1*digit ]
//     data    =  "[" [ integer *( "," integer ) ] "]"
//     integer =  [ "-" ] ( "0" / 1-9 *digit )
//
// White space may come after each of "{" "[" ":" ",", and before ":" "," "]" "}".
#include "json/parser.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cstring>
#include <exception>
#include <forward_list>
#include <limits>
#include <stack>
#include <system_error>
#include <type_traits>
#include <utility>
#include <vector>

#include "json/conversions.h"
#include "json/string_kernels.h"
#include "json/text_memory.h"
#include "json/word_bytes.h"
#include "platform/text/ascii.h"

namespace json {
namespace {

using platform::text::isdigit_ascii;
using platform::text::isspace_ascii;

bool atEnd(const Input& input) {
    return input.position == input.end;
}

bool at(const Input& input, char c) {
    return !atEnd(input) && *input.position == c;
}

std::string_view rest(const Input& input) {
    return {input.position, input.end};
}

/// As skipWhitespace, but quicker where there is none, which is usual.
void skipAnyWhitespace(Input& input) {
    const bool mayBeAny = !atEnd(input) && (*input.position <= ' ' || *input.position == '/');
    if (mayBeAny)
        skipWhitespace(input);
}

// ---- Strings ----

/// Parses the four hexadecimal digits of a "\u" escape.
Status parseUnit(Input& input, char16_t& unit) {
    if (input.end - input.position < 4)
        return Status::endOfInput;
    std::uint16_t number = 0;
    const char* const last = input.position + 4;
    if (std::from_chars(input.position, last, number, 16).ptr != last)
        return Status::badUnicodeEscape;
    unit = number;
    input.position = last;
    return Status::success;
}

/// Parses what follows "\u": the digits of one unit, and after a high surrogate a second escape,
/// whatever its unit. Writes the character to `out`, in no more bytes than it has read.
Status parseUnicodeEscape(Input& input, char*& out) {
    std::array<char16_t, 2> units{};
    std::size_t count = 1;
    if (const Status status = parseUnit(input, units[0]); status != Status::success)
        return status;
    if (units[0] >= 0xD800 && units[0] <= 0xDBFF) {
        if (input.end - input.position < 6)
            return Status::endOfInput;
        if (!rest(input).starts_with("\\u"))
            return Status::badUnicodeEscape;
        input.position += 2;
        if (const Status status = parseUnit(input, units[1]); status != Status::success)
            return status;
        count = 2;
    }
    const std::string character = u16_to_u8({units.data(), count});
    out = std::copy(character.begin(), character.end(), out);
    return Status::success;
}

/// Parses string content with escapes up to `end`, which is within the input, and writes what it
/// stands for to `out`. `outEnd` is as the kernel wants it.
Status parseContent(Input& input, const char* end, char*& out, char* outEnd) {
    const detail::StringKernels& kernels = detail::stringKernels();
    for (;;) {
        const auto copied = kernels.unescape(input.position, end, out, outEnd);
        input.position = copied.in;
        out = copied.out;
        if (input.position == end)
            return Status::success;
        // The kernel leaves "\u" and all that is not an escape.
        ++input.position;
        if (atEnd(input))
            return Status::endOfInput;
        if (!at(input, 'u'))
            return Status::badEscape;
        ++input.position;
        if (const Status status = parseUnicodeEscape(input, out); status != Status::success)
            return status;
    }
}

/// Parses a string, of which the opening quote is there. After a fault `text` is undefined.
Status parseQuoted(Input& input, std::string& text) {
    const char* const start = ++input.position;
    if (input.end - start >= detail::shortLength) {
        // Most strings other than documents, and nearly all keys.
        const std::ptrdiff_t length = detail::lengthOfShort(start);
        if (length < detail::shortLength) {
            // A copy of a fixed length, of which the rest is cut off.
            detail::overwrite(text, detail::shortLength - 1, [&](char* memory) {
                std::memcpy(memory, start, detail::shortLength - 1);
                return static_cast<std::size_t>(length);
            });
            input.position += length + 1;
            return Status::success;
        }
    }
    const detail::StringExtent extent = detail::stringKernels().measure(start, input.end);
    const char* const end = extent.end;
    Status status = Status::success;
    if (extent.escapes == 0) {
        text.assign(start, end);
        input.position = end;
    } else {
        const std::size_t bound = static_cast<std::size_t>(end - start) - extent.escapes;
        detail::overwrite(text, bound, [&](char* memory) {
            char* out = memory;
            status = parseContent(input, end, out, memory + bound);
            return static_cast<std::size_t>(out - memory);
        });
    }
    if (status != Status::success)
        return status;
    if (atEnd(input))
        return Status::endOfInput;
    ++input.position;
    return Status::success;
}

// ---- Numbers ----

void skipDigits(Input& input) {
    while (!atEnd(input) && isdigit_ascii(*input.position))
        ++input.position;
}

Status skipSomeDigits(Input& input, Status ifNone) {
    if (atEnd(input))
        return Status::endOfInput;
    if (!isdigit_ascii(*input.position))
        return ifNone;
    skipDigits(input);
    return Status::success;
}

/// Skips an optional "-", then a "0" or digits that begin with another.
Status skipInteger(Input& input, Status ifNone) {
    if (at(input, '-'))
        ++input.position;
    if (at(input, '0')) {
        ++input.position;
        return Status::success;
    }
    return skipSomeDigits(input, ifNone);
}

Status skipNumber(Input& input) {
    if (const Status status = skipInteger(input, Status::notNumber); status != Status::success)
        return status;
    if (at(input, '.')) {
        ++input.position;
        if (const Status status = skipSomeDigits(input, Status::noFraction);
            status != Status::success)
            return status;
    }
    if (at(input, 'e') || at(input, 'E')) {
        ++input.position;
        if (at(input, '+') || at(input, '-'))
            ++input.position;
        return skipSomeDigits(input, Status::noExponent);
    }
    return Status::success;
}

// ---- Typed data ----

enum class IntegerType : std::uint8_t { none, signedInteger, unsignedInteger };

/// The kind of the elements that a "kqtype" names. The narrower types are not held to their range.
IntegerType integerType(std::string_view name) {
    if (name == "int64" || name == "int32" || name == "int16" || name == "int8")
        return IntegerType::signedInteger;
    if (name == "uint64" || name == "uint32" || name == "uint16" || name == "uint8")
        return IntegerType::unsignedInteger;
    return IntegerType::none;
}

/// The integer that `text` is written as, or the nearest that the type has.
template <typename Integer>
Integer toInteger(std::string_view text) {
    using Limits = std::numeric_limits<Integer>;
    const bool negative = text.starts_with('-');
    if (negative && !Limits::is_signed)
        return 0;
    Integer integer = 0;
    if (std::from_chars(text.data(), text.data() + text.size(), integer).ec == std::errc())
        return integer;
    return negative ? Limits::min() : Limits::max();
}

/// Whether the next byte would make the integer before it something else.
bool atNonInteger(const Input& input) {
    return !atEnd(input) &&
           std::string_view(".eE\"{").find(*input.position) != std::string_view::npos;
}

/// Reads an array of integers and hands the text of each to `take`.
template <typename Take>
Status readIntegers(Input& input, Take take) {
    if (atEnd(input))
        return Status::endOfInput;
    if (!at(input, '['))
        return Status::notArray;
    ++input.position;
    skipAnyWhitespace(input);
    if (at(input, ']')) {
        ++input.position;
        return Status::success;
    }
    for (;;) {
        const char* const start = input.position;
        if (const Status status = skipInteger(input, Status::badTypedElement);
            status != Status::success)
            return status;
        const std::string_view integer(start, input.position);
        if (atNonInteger(input))
            return Status::badTypedElement;
        take(integer);
        skipAnyWhitespace(input);
        if (atEnd(input))
            return Status::endOfInput;
        if (atNonInteger(input))
            return Status::badTypedElement;
        const char separator = *input.position;
        if (separator != ',' && separator != ']')
            return Status::badArraySeparator;
        ++input.position;
        if (separator == ']')
            return Status::success;
        skipAnyWhitespace(input);
    }
}

/// Parses an array of integers of a type other than none. Running out of memory counts as a fault
/// here.
Status parseIntegers(Input& input, IntegerType type, Value& target) try {
    Array integers;
    const Status status = readIntegers(input, [&](std::string_view text) {
        if (type == IntegerType::signedInteger)
            integers.emplace_back(toInteger<long>(text));
        else
            integers.emplace_back(toInteger<unsigned long>(text));
    });
    if (status == Status::success)
        target = std::move(integers);
    return status;
} catch (const std::exception&) {
    return Status::endOfInput;
}

Status checkIntegers(Input input) {
    return readIntegers(input, [](std::string_view) {});
}

// ---- Values, arrays and objects ----

/// Parses a value and all within it.
///
/// A value is one of six things: a string, a number, an object, an array, a boolean or null. When
/// it is none of them, the status is that of the attempt to read one that gets furthest, the
/// earliest of several. The first byte tells which one that is: the others fail without moving, and
/// so does a literal that is not complete, which leaves the string as the earliest of all.
class TreeParser {
public:
    explicit TreeParser(Input& text) : input(text) {}

    /// Parses the value at the input's position. After a fault `root` holds a part of it.
    Status parse(Value& root) {
        Status status = startValue(root);
        while (status == Status::success && !open.empty()) {
            Value& innermost = *open.top();
            status = innermost.is<Array>() ? continueArray(innermost.get<Array>())
                                           : continueObject(innermost.get<Object>());
        }
        return status;
    }

private:
    /// What has to be remembered of an object that is open.
    struct OpenObject {
        bool inOrder = true;       // each key so far comes after the one before
        bool dropsMember = false;  // the value of the latest member is the front of `dropped`
        bool dataChecked = false;  // `data` is known to be an array of integers
        IntegerType type = IntegerType::none;  // what the latest "kqtype" that names a type names
        const char* data = nullptr;            // the text of the latest "kqdata"
        const char* typedData = nullptr;       // what "kqdata" was when that "kqtype" came
    };

    /// Parses a value whole, or the opening of an array or object that is not empty.
    Status startValue(Value& value);
    template <HeldType T>
    Status startLiteral(std::string_view literal, T meaning, Value& value);
    template <typename Container>
    Status startContainer(Value& value, char closing);

    /// Each parses on up to the end of the next element, the start of one that is itself left open,
    /// or the end of the container.
    Status continueArray(Array& array);
    Status continueObject(Object& object);

    /// Moves past what follows an element: a separator, and the white space after it, or the
    /// closing.
    Status skipSeparator(char closing, Status fault, bool& closed);
    Status parseKey(std::string& key);
    Value& memberValue(Object& object, std::string key);
    Status startData(Value& value);
    Status applyType(const Value& name);
    Status closeObject(Object& object);

    template <typename T>
    using Stack = std::stack<T, std::vector<T>>;

    Input& input;

    // The arrays and objects of which a part has been parsed, up to the end of an element or, at
    // first, to where the first element begins; from the outermost to the innermost. A text may
    // open tens of millions of arrays, so what only objects need is kept apart.
    Stack<Value*> open;
    Stack<OpenObject> objects;

    std::forward_list<Value> dropped;  // values of members whose key was there, the innermost first
};

Status TreeParser::startValue(Value& value) {
    if (atEnd(input))
        return Status::endOfInput;
    switch (*input.position) {
        case '"':
            return parseQuoted(input, value.emplace<std::string>());
        case '-':
        case '0':
        case '1':
        case '2':
        case '3':
        case '4':
        case '5':
        case '6':
        case '7':
        case '8':
        case '9':
            return parseNumber(input, value.emplace<double>());
        case '{':
            return startContainer<Object>(value, '}');
        case '[':
            return startContainer<Array>(value, ']');
        case 't':
            return startLiteral("true", true, value);
        case 'f':
            return startLiteral("false", false, value);
        case 'n':
            return startLiteral("null", Null(), value);
        default:
            return Status::notString;
    }
}

template <HeldType T>
Status TreeParser::startLiteral(std::string_view literal, T meaning, Value& value) {
    // Whatever is wrong with the literal, no attempt has moved: it counts as a string that is none.
    const Status status = parseLiteral(input, literal, Status::notString);
    if (status != Status::success)
        return Status::notString;
    value.emplace<T>() = meaning;
    return status;
}

template <typename Container>
Status TreeParser::startContainer(Value& value, char closing) {
    ++input.position;
    skipAnyWhitespace(input);
    if (atEnd(input))
        return Status::endOfInput;
    value.emplace<Container>();
    if (*input.position == closing) {
        ++input.position;
        return Status::success;
    }
    open.push(&value);
    if constexpr (std::is_same_v<Container, Object>)
        objects.emplace();
    return Status::success;
}

Status TreeParser::skipSeparator(char closing, Status fault, bool& closed) {
    skipAnyWhitespace(input);
    if (atEnd(input))
        return Status::endOfInput;
    closed = *input.position == closing;
    if (!closed && *input.position != ',')
        return fault;
    ++input.position;
    if (!closed)
        skipAnyWhitespace(input);
    return Status::success;
}

Status TreeParser::continueArray(Array& array) {
    if (!array.empty()) {
        bool closed = false;
        const Status status = skipSeparator(']', Status::badArraySeparator, closed);
        if (status != Status::success)
            return status;
        if (closed) {
            open.pop();
            return Status::success;
        }
    }
    // After one element, which needs little memory, comes room for several.
    constexpr std::size_t usualCapacity = 4;
    if (array.size() == 1)
        array.reserve(usualCapacity);
    return startValue(array.emplace_back());
}

Status TreeParser::continueObject(Object& object) {
    if (!object.empty()) {
        if (std::exchange(objects.top().dropsMember, false))
            dropped.pop_front();
        bool closed = false;
        const Status status = skipSeparator('}', Status::badObjectSeparator, closed);
        if (status != Status::success)
            return status;
        if (closed)
            return closeObject(object);
    }

    std::string key;
    if (const Status status = parseKey(key); status != Status::success)
        return status;
    const bool mayBeTyped = key.starts_with("kq");
    const bool isType = mayBeTyped && key == "kqtype";
    const bool isData = mayBeTyped && key == "kqdata";
    Value& value = memberValue(object, std::move(key));
    if (isData)
        return startData(value);
    const Status status = startValue(value);
    if (isType && status == Status::success)
        return applyType(value);
    return status;
}

/// Parses the key of a member and moves to where its value begins.
Status TreeParser::parseKey(std::string& key) {
    if (atEnd(input))
        return Status::endOfInput;
    if (!at(input, '"'))
        return Status::notString;
    if (const Status status = parseQuoted(input, key); status != Status::success)
        return status;
    skipAnyWhitespace(input);
    if (atEnd(input))
        return Status::endOfInput;
    if (!at(input, ':'))
        return Status::noColon;
    ++input.position;
    skipAnyWhitespace(input);
    return atEnd(input) ? Status::endOfInput : Status::success;
}

/// Where the value of a member is to be put: into the object, unless the key is there already. Then
/// the first value stays, and the later one has to be parsed only to get past it.
Value& TreeParser::memberValue(Object& object, std::string key) {
    OpenObject& container = objects.top();
    const std::size_t size = object.size();
    // In order, a member is appended without a search.
    const auto member = container.inOrder ? object.try_emplace(object.end(), std::move(key))
                                          : object.emplace(std::move(key), Undefined()).first;
    if (object.size() > size) {
        container.inOrder = container.inOrder && std::next(member) == object.end();
        return member->second;
    }
    container.dropsMember = true;
    return dropped.emplace_front();
}

Status TreeParser::startData(Value& value) {
    OpenObject& container = objects.top();
    container.data = input.position;
    container.dataChecked = container.type != IntegerType::none;
    return container.dataChecked ? parseIntegers(input, container.type, value) : startValue(value);
}

/// Remembers the type that a "kqtype" names, if it does. Data that came before it is to be read
/// again as data of that type, and put into the object in place of what is there. Whether that can
/// be done does not depend on the type, so each data is checked once, and read when the object
/// ends: a request may repeat "kqtype" after long data many times.
Status TreeParser::applyType(const Value& name) {
    if (!name.is<std::string>())
        return Status::success;
    const IntegerType type = integerType(name.get<std::string>());
    if (type == IntegerType::none)
        return Status::success;
    OpenObject& container = objects.top();
    container.type = type;
    container.typedData = container.data;
    if (container.data == nullptr || container.dataChecked)
        return Status::success;
    container.dataChecked = true;
    return checkIntegers({container.data, input.end, input.comments});
}

Status TreeParser::closeObject(Object& object) {
    const OpenObject& container = objects.top();
    Status status = Status::success;
    if (container.typedData != nullptr) {
        Value& value = object.at("kqdata");
        value = Undefined();  // so that the memory is not taken twice
        Input data{container.typedData, input.end, input.comments};
        status = parseIntegers(data, container.type, value);
    }
    objects.pop();
    open.pop();
    return status;
}

}  // namespace

Object parse(std::string_view text) {
    Input input{text.data(), text.data() + text.size()};
    Object object;
    parseObject(input, object);
    return object;
}

Status skipWhitespace(Input& input) {
    for (;;) {
        while (!atEnd(input) && isspace_ascii(*input.position))
            ++input.position;
        if (!input.comments)
            return Status::success;
        std::string_view terminator;
        if (rest(input).starts_with("//"))
            terminator = "\n";
        else if (rest(input).starts_with("/*"))
            terminator = "*/";
        else
            return Status::success;
        const std::size_t found = rest(input).find(terminator, 2);
        if (found == std::string_view::npos) {
            input.position = input.end;
            return Status::endOfInput;
        }
        input.position += found + terminator.size();
    }
}

Status parseString(Input& input, std::string& target) {
    if (atEnd(input))
        return Status::endOfInput;
    if (!at(input, '"'))
        return Status::notString;
    std::string text;
    const Status status = parseQuoted(input, text);
    if (status == Status::success)
        target = std::move(text);
    return status;
}

Status parseNumber(Input& input, double& target) {
    const char* const start = input.position;
    const Status status = skipNumber(input);
    if (status == Status::success)
        target = string_to_double({start, input.position});
    return status;
}

Status parseLiteral(Input& input, std::string_view literal, Status mismatch) {
    if (rest(input).starts_with(literal)) {
        input.position += literal.size();
        return Status::success;
    }
    return literal.starts_with(rest(input)) ? Status::endOfInput : mismatch;
}

Status parseObject(Input& input, Object& target) {
    if (atEnd(input))
        return Status::endOfInput;
    if (!at(input, '{'))
        return Status::notObject;
    Value object;
    const Status status = TreeParser(input).parse(object);
    if (status == Status::success)
        target = std::move(object.get<Object>());
    return status;
}

Status parseArray(Input& input, Array& target) {
    if (atEnd(input))
        return Status::endOfInput;
    if (!at(input, '['))
        return Status::notArray;
    Value array;
    const Status status = TreeParser(input).parse(array);
    if (status == Status::success)
        target = std::move(array.get<Array>());
    return status;
}

Status parseValue(Input& input, Value& target) {
    Value value;
    const Status status = TreeParser(input).parse(value);
    if (status == Status::success)
        target = std::move(value);
    return status;
}

Status parseTypedData(Input& input, std::string_view typeName, Value& target) {
    const IntegerType type = integerType(typeName);
    return type == IntegerType::none ? parseValue(input, target)
                                     : parseIntegers(input, type, target);
}

}  // namespace json
