// SPDX-License-Identifier: Apache-2.0
// The parser: JSON text to values, with the typed integer arrays of the editor's requests.
//
// A typed integer array is an object with the members "kqtype" and "kqdata", in either order:
//
//     {"kqtype":"int32","kqdata":[1,-2,3]}
//
// The members stay what they are, but the elements of "kqdata" become 64-bit integers (signed for
// int64, int32, int16 and int8, unsigned for uint64, uint32, uint16 and uint8) where every other
// number is a double.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "json/value.h"

namespace json {

/// Parses the object that `text` begins with. A text that is not a well-formed object, or that has
/// anything before the opening brace, gives an empty object; what follows the closing brace is not
/// looked at. Throws nothing but std::bad_alloc. Any bytes may come in: the time is linear in their
/// number, and no stack is used in proportion to the nesting.
Object parse(std::string_view text);

// The routines that parse() is made of.

/// How a routine ended. The numbers are fixed; those that are missing are not in use.
enum class Status : std::uint32_t {
    success = 0,
    notNull = 1,              // the text is not "null"
    notBoolean = 2,           // the text is neither "true" nor "false"
    badUnicodeEscape = 5,     // "\u" without four hexadecimal digits, a high surrogate without "\u"
    badEscape = 6,            // a backslash before a character that is not an escape letter
    notString = 8,            // a string does not begin with a double quote
    notNumber = 11,           // a number does not begin with a digit, after an optional "-"
    noFraction = 12,          // a "." without a digit after it
    noExponent = 13,          // an exponent marker and its optional sign without a digit after them
    notArray = 14,            // an array, plain or typed, does not begin with "["
    badArraySeparator = 15,   // an array element is followed by neither "," nor "]"
    notObject = 16,           // an object does not begin with "{"
    badObjectSeparator = 17,  // an object member is followed by neither "," nor "}"
    noColon = 18,             // a key is not followed by ":"
    endOfInput = 19,          // the input ended too early; also any exception within typed data
    badTypedElement = 20,     // an element of typed data is not an integer
};

/// The bytes that a routine reads. Each routine moves `position` past what it consumes; after a
/// fault it is where the fault was found.
struct Input {
    const char* position = nullptr;
    const char* end = nullptr;
    bool comments = false;  // whether white space may have "// ..." and "/* ... */" comments in it
};

// Each routine writes its target only when it succeeds.

/// Skips white space, and comments if they are allowed. An unterminated comment takes up the rest
/// of the input: endOfInput.
Status skipWhitespace(Input& input);

/// Parses a quoted string with its escapes.
Status parseString(Input& input, std::string& target);

/// Parses a number without a type; the end of the input may complete it.
Status parseNumber(Input& input, double& target);

/// Moves past `literal` if the input goes on with it, whatever comes after it. Otherwise stays, and
/// returns endOfInput if the input ends within the literal, else `mismatch`.
Status parseLiteral(Input& input, std::string_view literal, Status mismatch);

/// Parses an object; the opening brace must come at once.
Status parseObject(Input& input, Object& target);

/// Parses an array; the opening bracket must come at once.
Status parseArray(Input& input, Array& target);

/// Parses a value of any kind; it must begin at once. A byte that begins no value is notString.
Status parseValue(Input& input, Value& target);

/// Parses the text of a "kqdata" member: an array of integers if `typeName` is one of the eight
/// type names, else a value of any kind. An integer beyond the 64-bit range becomes the nearest one
/// in it, whichever of the narrower types is named.
Status parseTypedData(Input& input, std::string_view typeName, Value& target);

}  // namespace json
