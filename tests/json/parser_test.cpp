// SPDX-License-Identifier: Apache-2.0
// The parser: its routines and their status codes, and the entry that drops the codes.
#include "json/parser.h"

#include <gtest/gtest.h>

#include <limits>
#include <string>
#include <vector>

#include "json/serialize.h"

namespace json {
namespace {

using namespace std::string_literals;  // for texts with NUL bytes

/// How a routine went: its status, how far it moved, and its target.
template <typename T>
struct Result {
    Status status;
    std::ptrdiff_t moved;
    T target;
};

template <typename T>
Result<T> run(Status (*routine)(Input&, T&), std::string_view text, bool comments = false,
              T target = T()) {
    Input input{text.data(), text.data() + text.size(), comments};
    const Status status = routine(input, target);
    return {status, input.position - text.data(), std::move(target)};
}

Result<Value> runTyped(std::string_view typeName, std::string_view text, Value target = Value()) {
    Input input{text.data(), text.data() + text.size()};
    const Status status = parseTypedData(input, typeName, target);
    return {status, input.position - text.data(), std::move(target)};
}

Status statusOf(std::string_view objectText) {
    return run(parseObject, objectText).status;
}

constexpr long least = std::numeric_limits<long>::min();
constexpr long greatest = std::numeric_limits<long>::max();
constexpr unsigned long greatestUnsigned = std::numeric_limits<unsigned long>::max();

TEST(Status, HasItsFixedNumbers) {
    const auto number = [](Status status) { return static_cast<std::uint32_t>(status); };
    EXPECT_EQ(number(Status::success), 0u);
    EXPECT_EQ(number(Status::notNull), 1u);
    EXPECT_EQ(number(Status::notBoolean), 2u);
    EXPECT_EQ(number(Status::badUnicodeEscape), 5u);
    EXPECT_EQ(number(Status::badEscape), 6u);
    EXPECT_EQ(number(Status::notString), 8u);
    EXPECT_EQ(number(Status::notNumber), 11u);
    EXPECT_EQ(number(Status::noFraction), 12u);
    EXPECT_EQ(number(Status::noExponent), 13u);
    EXPECT_EQ(number(Status::notArray), 14u);
    EXPECT_EQ(number(Status::badArraySeparator), 15u);
    EXPECT_EQ(number(Status::notObject), 16u);
    EXPECT_EQ(number(Status::badObjectSeparator), 17u);
    EXPECT_EQ(number(Status::noColon), 18u);
    EXPECT_EQ(number(Status::endOfInput), 19u);
    EXPECT_EQ(number(Status::badTypedElement), 20u);
}

// ---- White space ----

struct Skipped {
    Status status;
    std::ptrdiff_t moved;
    bool operator==(const Skipped&) const = default;
};

Skipped skip(std::string_view text, bool comments) {
    Input input{text.data(), text.data() + text.size(), comments};
    const Status status = skipWhitespace(input);
    return {status, input.position - text.data()};
}

TEST(SkipWhitespace, SkipsTheSixAsciiWhitespaceBytes) {
    EXPECT_EQ(skip(" \t\n\v\f\rx", false), (Skipped{Status::success, 6}));
    EXPECT_EQ(skip("", false), (Skipped{Status::success, 0}));
    EXPECT_EQ(skip("  ", false), (Skipped{Status::success, 2}));
    for (const std::string& other : {"\0"s, "\x1F"s, "\x85"s, "\xA0"s, "\xEF\xBB\xBF"s})
        EXPECT_EQ(skip(other, true), (Skipped{Status::success, 0}));
}

TEST(SkipWhitespace, SkipsCommentsOnlyWhenAllowed) {
    EXPECT_EQ(skip(" // a\n /* b */ x", true), (Skipped{Status::success, 15}));
    EXPECT_EQ(skip(" // a\n /* b */ x", false), (Skipped{Status::success, 1}));
    EXPECT_EQ(skip(" /* b */ x", false), (Skipped{Status::success, 1}));
}

TEST(SkipWhitespace, FindsTheEndOfACommentAfterItsOpening) {
    EXPECT_EQ(skip("/**/x", true), (Skipped{Status::success, 4}));
    EXPECT_EQ(skip("/***/x", true), (Skipped{Status::success, 5}));
    EXPECT_EQ(skip("/*/ x */y", true), (Skipped{Status::success, 8}));
    EXPECT_EQ(skip("/* // */x", true), (Skipped{Status::success, 8}));
    EXPECT_EQ(skip("// /*\nx", true), (Skipped{Status::success, 6}));
    EXPECT_EQ(skip("//\nx", true), (Skipped{Status::success, 3}));
}

TEST(SkipWhitespace, OfACommentWithoutEndReachesTheEndOfInput) {
    for (const std::string& text : {"// a"s, "//"s, "/* a"s, "/*"s, "/*/"s, " /* *"s})
        EXPECT_EQ(skip(text, true),
                  (Skipped{Status::endOfInput, static_cast<std::ptrdiff_t>(text.size())}))
            << text;
}

TEST(SkipWhitespace, StaysAtASlashThatOpensNoComment) {
    EXPECT_EQ(skip("/", true), (Skipped{Status::success, 0}));
    EXPECT_EQ(skip(" /x", true), (Skipped{Status::success, 1}));
}

// ---- Strings ----

TEST(ParseString, TakesBytesAsTheyStand) {
    const std::string bytes = "\x01\n\0\x7F\x80\xFF\xC3 '/"s;
    const auto result = run(parseString, "\"" + bytes + "\"rest");
    EXPECT_EQ(result.status, Status::success);
    EXPECT_EQ(result.target, bytes);
    EXPECT_EQ(result.moved, static_cast<std::ptrdiff_t>(bytes.size() + 2));
    EXPECT_EQ(run(parseString, "\"\"", false, "old"s).target, "");
}

TEST(ParseString, ReadsTheEscapeLetters) {
    const auto result = run(parseString, R"("\"\/\\\b\f\n\r\t")");
    EXPECT_EQ(result.status, Status::success);
    EXPECT_EQ(result.target, "\"/\\\b\f\n\r\t");
    EXPECT_EQ(result.moved, 18);
}

TEST(ParseString, ReadsUnicodeEscapesInEitherCase) {
    EXPECT_EQ(run(parseString, R"("\u0041\u00e4\u00E4\u20aC")").target,
              "A\xC3\xA4\xC3\xA4\xE2\x82\xAC");
    EXPECT_EQ(run(parseString, R"("a\u0000b")").target, "a\0b"s);
    EXPECT_EQ(run(parseString, R"("\uFFFF1")").target,
              "\xEF\xBF\xBF"
              "1");
}

TEST(ParseString, JoinsASurrogatePair) {
    const auto result = run(parseString, R"("\uD83D\uDE00")");
    EXPECT_EQ(result.status, Status::success);
    EXPECT_EQ(result.target, "\xF0\x9F\x98\x80");
}

TEST(ParseString, ReplacesSurrogatesThatAreNoPair) {
    // The second unit of a pair may be any, and a low surrogate may stand alone.
    EXPECT_EQ(run(parseString, R"("\uD83D\u0041x")").target,
              "\xEF\xBF\xBD"
              "Ax");
    EXPECT_EQ(run(parseString, R"("\uD83D\uD83Dx")").target, "\xEF\xBF\xBD\xEF\xBF\xBDx");
    EXPECT_EQ(run(parseString, R"("\uDE00x")").target, "\xEF\xBF\xBDx");
    EXPECT_EQ(run(parseString, R"("\uDBFF\uDFFF")").target, "\xF4\x8F\xBF\xBF");
    EXPECT_EQ(run(parseString, R"("\uE000")").target, "\xEE\x80\x80");
}

TEST(ParseString, ReadsEscapesAtEveryPlaceOfALongString) {
    for (std::size_t length = 0; length < 40; ++length) {
        const std::string before(length, 'x');
        EXPECT_EQ(run(parseString, "\"" + before + "\\nyz\"").target, before + "\nyz");
        EXPECT_EQ(run(parseString, "\"" + before + "\"yz").target, before);
    }
}

TEST(ParseString, WithoutAQuoteIsFault8) {
    const auto result = run(parseString, "a\"", false, "old"s);
    EXPECT_EQ(result.status, Status::notString);
    EXPECT_EQ(result.moved, 0);
    EXPECT_EQ(result.target, "old");
}

TEST(ParseString, WithAnUnknownEscapeLetterIsFault6) {
    for (const std::string& letter : {"x"s, "'"s, "N"s, "U0041"s, "\0"s, "0"s, "\n"s}) {
        const auto result = run(parseString, "\"a\\" + letter + "\"", false, "old"s);
        EXPECT_EQ(result.status, Status::badEscape) << letter;
        EXPECT_EQ(result.moved, 3);
        EXPECT_EQ(result.target, "old");
    }
}

TEST(ParseString, WithoutFourHexadecimalDigitsIsFault5) {
    for (char const* text :
         {R"("\u004g")", R"("\ug041")", R"("\u+041")", R"("\u-041")", R"("\u0x41")", R"("\u 041")",
          R"("\u004")"
          "  ",
          R"("\uD83D\uDE0G")"})
        EXPECT_EQ(run(parseString, text).status, Status::badUnicodeEscape) << text;
    EXPECT_EQ(run(parseString, R"("\u004g")").moved, 3);
}

TEST(ParseString, WithAHighSurrogateBeforeNoEscapeIsFault5) {
    for (char const* text : {R"("\uD83Dabcdef")", R"("\uD83D\nabcd")", R"("\uD83Du\DE00")",
                             R"("\uDBFF" , "a")", R"("\uD800\U0041")"})
        EXPECT_EQ(run(parseString, text).status, Status::badUnicodeEscape) << text;
    EXPECT_EQ(run(parseString, R"("\uD83Dabcdef")").moved, 7);
}

TEST(ParseString, EndedEarlyIsFault19) {
    // A group of bytes that is not there as a whole counts as missing, whatever its bytes are.
    for (char const* text :
         {"", "\"", "\"abc", "\"long enough for a word", R"("\)", R"("\u)", R"("\u004)", R"("\ug)",
          R"("\u04")", R"("\uD83D)", R"("\uD83D\uDE0)", R"("\uD83Dabc")", R"("\uD83D")"}) {
        const auto result = run(parseString, text, false, "old"s);
        EXPECT_EQ(result.status, Status::endOfInput) << text;
        EXPECT_EQ(result.target, "old");
    }
}

// ---- Numbers ----

TEST(ParseNumber, TakesTheLongestNumber) {
    const struct {
        char const* text;
        double number;
        std::ptrdiff_t moved;
    } cases[] = {{"0", 0, 1},         {"-0", -0.0, 2},   {"7", 7, 1},          {"12]", 12, 2},
                 {"-120,", -120, 4},  {"0.5}", 0.5, 3},  {"12.25 ", 12.25, 5}, {"1e3x", 1000, 3},
                 {"1E+3", 1000, 4},   {"25e-1", 2.5, 5}, {"0e0", 0, 3},        {"-0.0E-0", -0.0, 7},
                 {"012", 0, 1},       {"-01", -0.0, 2},  {"1e5.5", 1e5, 3},    {"1-2", 1, 1},
                 {"1e0012", 1e12, 6}, {"1+2", 1, 1}};
    for (const auto& [text, number, moved] : cases) {
        const auto result = run(parseNumber, text, false, 99.0);
        EXPECT_EQ(result.status, Status::success) << text;
        EXPECT_EQ(result.target, number) << text;
        EXPECT_EQ(result.moved, moved) << text;
    }
}

TEST(ParseNumber, BeyondTheRangeOfADoubleIsInfinityOrZero) {
    EXPECT_EQ(run(parseNumber, "1e999").target, std::numeric_limits<double>::infinity());
    EXPECT_EQ(run(parseNumber, "-1e999").target, -std::numeric_limits<double>::infinity());
    EXPECT_EQ(run(parseNumber, "1e-999", false, 1.0).target, 0.0);
}

void expectNumberFault(std::string_view text, Status status, std::ptrdiff_t moved) {
    const auto result = run(parseNumber, text, false, 99.0);
    EXPECT_EQ(result.status, status) << text;
    EXPECT_EQ(result.moved, moved) << text;
    EXPECT_EQ(result.target, 99.0) << text;
}

TEST(ParseNumber, WithoutADigitIsFault11) {
    expectNumberFault("a", Status::notNumber, 0);
    expectNumberFault("+1", Status::notNumber, 0);
    expectNumberFault(".5", Status::notNumber, 0);
    expectNumberFault(" 1", Status::notNumber, 0);
    expectNumberFault("-a", Status::notNumber, 1);
    expectNumberFault("--1", Status::notNumber, 1);
    expectNumberFault("-.5", Status::notNumber, 1);
    expectNumberFault("-]", Status::notNumber, 1);
}

TEST(ParseNumber, WithoutADigitAfterThePointIsFault12) {
    expectNumberFault("1.]", Status::noFraction, 2);
    expectNumberFault("-0.e5", Status::noFraction, 3);
    expectNumberFault("1..5", Status::noFraction, 2);
}

TEST(ParseNumber, WithoutADigitInTheExponentIsFault13) {
    expectNumberFault("1e]", Status::noExponent, 2);
    expectNumberFault("1E+]", Status::noExponent, 3);
    expectNumberFault("1.5e-x", Status::noExponent, 5);
    expectNumberFault("1e+-5", Status::noExponent, 3);
}

TEST(ParseNumber, EndedEarlyIsFault19) {
    expectNumberFault("", Status::endOfInput, 0);
    expectNumberFault("-", Status::endOfInput, 1);
    expectNumberFault("12.", Status::endOfInput, 3);
    expectNumberFault("12e", Status::endOfInput, 3);
    expectNumberFault("12E-", Status::endOfInput, 4);
}

// ---- Literals ----

Skipped literal(std::string_view text, std::string_view expected, Status mismatch) {
    Input input{text.data(), text.data() + text.size()};
    const Status status = parseLiteral(input, expected, mismatch);
    return {status, input.position - text.data()};
}

TEST(ParseLiteral, MovesPastTheLiteralWhateverFollows) {
    EXPECT_EQ(literal("null", "null", Status::notNull), (Skipped{Status::success, 4}));
    EXPECT_EQ(literal("truex", "true", Status::notBoolean), (Skipped{Status::success, 4}));
}

TEST(ParseLiteral, OfOtherTextIsTheGivenFaultAndStays) {
    EXPECT_EQ(literal("nulL", "null", Status::notNull), (Skipped{Status::notNull, 0}));
    EXPECT_EQ(literal("nul,", "null", Status::notNull), (Skipped{Status::notNull, 0}));
    EXPECT_EQ(literal("x", "null", Status::notNull), (Skipped{Status::notNull, 0}));
    EXPECT_EQ(literal("nx", "null", Status::notNull), (Skipped{Status::notNull, 0}));
    EXPECT_EQ(literal("truf", "true", Status::notBoolean), (Skipped{Status::notBoolean, 0}));
    EXPECT_EQ(literal("false", "true", Status::notBoolean), (Skipped{Status::notBoolean, 0}));
}

TEST(ParseLiteral, EndedEarlyIsFault19AndStays) {
    EXPECT_EQ(literal("", "null", Status::notNull), (Skipped{Status::endOfInput, 0}));
    EXPECT_EQ(literal("n", "null", Status::notNull), (Skipped{Status::endOfInput, 0}));
    EXPECT_EQ(literal("fals", "false", Status::notBoolean), (Skipped{Status::endOfInput, 0}));
}

// ---- Arrays ----

TEST(ParseArray, TakesElementsOfEveryKindInOrder) {
    const auto result = run(parseArray, R"([ 1 , "a",[ ],{ },true ,false,null, -0.5]rest)");
    EXPECT_EQ(result.status, Status::success);
    EXPECT_EQ(result.target, (Array{1.0, "a", Array(), Object(), true, false, Null(), -0.5}));
    EXPECT_EQ(result.moved, 41);
    EXPECT_EQ(run(parseArray, "[ \n]", false, Array{1.0}).target, Array());
}

void expectArrayFault(std::string_view text, Status status, std::ptrdiff_t moved) {
    const auto result = run(parseArray, text, false, Array{"old"});
    EXPECT_EQ(result.status, status) << text;
    EXPECT_EQ(result.moved, moved) << text;
    EXPECT_EQ(result.target, Array{"old"}) << text;
}

TEST(ParseArray, WithoutABracketIsFault14) {
    expectArrayFault("1]", Status::notArray, 0);
    expectArrayFault(" []", Status::notArray, 0);
    expectArrayFault("{}", Status::notArray, 0);
}

TEST(ParseArray, WithAnotherSeparatorIsFault15) {
    expectArrayFault("[1 2]", Status::badArraySeparator, 3);
    expectArrayFault("[truex]", Status::badArraySeparator, 5);
    expectArrayFault("[01]", Status::badArraySeparator, 2);
    expectArrayFault("[[]}", Status::badArraySeparator, 3);
    expectArrayFault("[1:2]", Status::badArraySeparator, 2);
}

TEST(ParseArray, WithoutAnElementAfterACommaIsFault8) {
    expectArrayFault("[1,]", Status::notString, 3);
    expectArrayFault("[,1]", Status::notString, 1);
}

TEST(ParseArray, ReportsTheFaultOfAnElement) {
    expectArrayFault(R"([1,"\x"])", Status::badEscape, 5);
    expectArrayFault(R"([1,{"a" 1}])", Status::noColon, 8);
    expectArrayFault("[[[-a", Status::notNumber, 4);
}

TEST(ParseArray, EndedEarlyIsFault19) {
    expectArrayFault("", Status::endOfInput, 0);
    expectArrayFault("[", Status::endOfInput, 1);
    expectArrayFault("[ ", Status::endOfInput, 2);
    expectArrayFault("[1", Status::endOfInput, 2);
    expectArrayFault("[1 ", Status::endOfInput, 3);
    expectArrayFault("[1,", Status::endOfInput, 3);
    expectArrayFault("[1, ", Status::endOfInput, 4);
    expectArrayFault("[[1]", Status::endOfInput, 4);
}

// ---- Objects ----

TEST(ParseObject, TakesMembersWithWhiteSpaceBetweenAnyTokens) {
    const auto result = run(parseObject, "{ \"b\" : 1 ,\n\t\"a\":\v[ ]\f, \"\" : { } }rest");
    EXPECT_EQ(result.status, Status::success);
    EXPECT_EQ(result.target, (Object{{"", Object()}, {"a", Array()}, {"b", 1.0}}));
    EXPECT_EQ(result.moved, 34);
    EXPECT_EQ(run(parseObject, "{ }", false, Object{{"old", 1.0}}).target, Object());
}

TEST(ParseObject, ReplacesWhatTheTargetHeld) {
    const auto result = run(parseObject, R"({"a":1})", false, Object{{"old", 1.0}, {"a", 2.0}});
    EXPECT_EQ(result.target, (Object{{"a", 1.0}}));
}

TEST(ParseObject, DropsALaterMemberWithTheSameKey) {
    EXPECT_EQ(run(parseObject, R"({"a":1,"a":2})").target, (Object{{"a", 1.0}}));
    EXPECT_EQ(run(parseObject, R"({"a":1,"b":2,"\u0061":[{"a":1,"a":[2]}],"c":{"b":3}})").target,
              (Object{{"a", 1.0}, {"b", 2.0}, {"c", Object{{"b", 3.0}}}}));
    EXPECT_EQ(statusOf(R"({"a":1,"a":[}})"), Status::notString);
}

TEST(ParseObject, TellsKeysApartByAllTheirBytes) {
    EXPECT_EQ(run(parseObject, R"({"a\u0000":1,"a":2,"a\u0000b":3})").target,
              (Object{{"a\0"s, 1.0}, {"a", 2.0}, {"a\0b"s, 3.0}}));
}

void expectObjectFault(std::string_view text, Status status, std::ptrdiff_t moved) {
    const auto result = run(parseObject, text, false, Object{{"old", true}});
    EXPECT_EQ(result.status, status) << text;
    EXPECT_EQ(result.moved, moved) << text;
    EXPECT_EQ(result.target, (Object{{"old", true}})) << text;
}

TEST(ParseObject, WithoutABraceIsFault16) {
    expectObjectFault(" {}", Status::notObject, 0);
    expectObjectFault("[]", Status::notObject, 0);
    expectObjectFault("\xEF\xBB\xBF{}", Status::notObject, 0);
}

TEST(ParseObject, WithAnotherSeparatorIsFault17) {
    expectObjectFault(R"({"a":012})", Status::badObjectSeparator, 6);
    expectObjectFault(R"({"a":1 "b":2})", Status::badObjectSeparator, 7);
    expectObjectFault(R"({"a":truex})", Status::badObjectSeparator, 9);
    expectObjectFault(R"({"a":[]])", Status::badObjectSeparator, 7);
}

TEST(ParseObject, WithoutAColonIsFault18) {
    expectObjectFault(R"({"a",1})", Status::noColon, 4);
    expectObjectFault(R"({"a" "b"})", Status::noColon, 5);
}

TEST(ParseObject, WithoutAKeyIsFault8) {
    expectObjectFault(R"({"a":1,"b":2,})", Status::notString, 13);
    expectObjectFault("{a:1}", Status::notString, 1);
    expectObjectFault("{,}", Status::notString, 1);
    expectObjectFault("{1:1}", Status::notString, 1);
}

TEST(ParseObject, ReportsTheFaultOfAKeyOrValue) {
    expectObjectFault(R"({"\x":1})", Status::badEscape, 3);
    expectObjectFault(R"({"a":})", Status::notString, 5);
    expectObjectFault(R"({"a":{"b":{}})", Status::endOfInput, 13);
    expectObjectFault(R"({"a":1.})", Status::noFraction, 7);
}

TEST(ParseObject, EndedEarlyIsFault19) {
    expectObjectFault("", Status::endOfInput, 0);
    expectObjectFault("{", Status::endOfInput, 1);
    expectObjectFault("{ ", Status::endOfInput, 2);
    expectObjectFault("{\"a", Status::endOfInput, 3);
    expectObjectFault("{\"a\"", Status::endOfInput, 4);
    expectObjectFault("{\"a\" ", Status::endOfInput, 5);
    expectObjectFault("{\"a\":", Status::endOfInput, 5);
    expectObjectFault("{\"a\": ", Status::endOfInput, 6);
    expectObjectFault("{\"a\":1", Status::endOfInput, 6);
    expectObjectFault("{\"a\":1 ", Status::endOfInput, 7);
    expectObjectFault("{\"a\":1,", Status::endOfInput, 7);
    expectObjectFault("{\"a\":1, ", Status::endOfInput, 8);
}

// ---- Values ----

TEST(ParseValue, GivesEachKind) {
    EXPECT_EQ(run(parseValue, "\"a\"").target, Value("a"));
    EXPECT_EQ(run(parseValue, "12").target, Value(12.0));
    EXPECT_EQ(run(parseValue, "-1").target, Value(-1.0));
    EXPECT_EQ(run(parseValue, R"({"a":1})").target, Value(Object{{"a", 1.0}}));
    EXPECT_EQ(run(parseValue, "[1]").target, Value(Array{1.0}));
    EXPECT_EQ(run(parseValue, "true").target, Value(true));
    EXPECT_EQ(run(parseValue, "false").target, Value(false));
    EXPECT_EQ(run(parseValue, "null").target, Value(Null()));
}

void expectValueFault(std::string_view text, Status status, std::ptrdiff_t moved) {
    const auto result = run(parseValue, text, false, Value("old"));
    EXPECT_EQ(result.status, status) << text;
    EXPECT_EQ(result.moved, moved) << text;
    EXPECT_EQ(result.target, Value("old")) << text;
}

TEST(ParseValue, AtAByteThatBeginsNoneIsFault8AndStays) {
    for (char const* text :
         {"x", "]", "}", ",", " 1", "+1", ".5", "\xFF", "'a'", "NaN", "Infinity"})
        expectValueFault(text, Status::notString, 0);
    expectValueFault("\0"s, Status::notString, 0);
}

TEST(ParseValue, OfAnIncompleteLiteralIsFault8AndStays) {
    for (char const* text : {"t", "tru", "trux", "fals", "f", "nul", "n", "nil", "True", "NULL"})
        expectValueFault(text, Status::notString, 0);
}

TEST(ParseValue, ReportsTheAttemptThatGotFurthest) {
    expectValueFault("-x", Status::notNumber, 1);
    expectValueFault("-", Status::endOfInput, 1);
    expectValueFault("\"\\x", Status::badEscape, 2);
    expectValueFault("1.x", Status::noFraction, 2);
    expectValueFault("[1}", Status::badArraySeparator, 2);
    expectValueFault("{]", Status::notString, 1);
    expectValueFault("{\"a\";", Status::noColon, 4);
    expectValueFault("", Status::endOfInput, 0);
}

// ---- Typed data ----

const std::vector<std::string> signedNames = {"int64", "int32", "int16", "int8"};
const std::vector<std::string> unsignedNames = {"uint64", "uint32", "uint16", "uint8"};

TEST(ParseTypedData, GivesSignedIntegersForTheSignedNames) {
    for (const std::string& name : signedNames) {
        const auto result = runTyped(name, "[ 1 ,-2,0, -0,70000]rest");
        EXPECT_EQ(result.status, Status::success) << name;
        EXPECT_EQ(result.target, Value(Array{1L, -2L, 0L, 0L, 70000L})) << name;
        EXPECT_EQ(result.moved, 20);
    }
}

TEST(ParseTypedData, GivesUnsignedIntegersForTheUnsignedNames) {
    for (const std::string& name : unsignedNames) {
        const auto result = runTyped(name, "[1,-2,0,-0,70000]");
        EXPECT_EQ(result.status, Status::success) << name;
        EXPECT_EQ(result.target, Value(Array{1UL, 0UL, 0UL, 0UL, 70000UL})) << name;
    }
}

TEST(ParseTypedData, SaturatesAtTheBordersOf64Bits) {
    EXPECT_EQ(runTyped("int8",
                       "[9223372036854775807,9223372036854775808,99999999999999999999,"
                       "-9223372036854775808,-9223372036854775809,-99999999999999999999]")
                  .target,
              Value(Array{greatest, greatest, greatest, least, least, least}));
    EXPECT_EQ(runTyped("uint8",
                       "[18446744073709551615,18446744073709551616,99999999999999999999,"
                       "9223372036854775808,-1,-99999999999999999999]")
                  .target,
              Value(Array{greatestUnsigned, greatestUnsigned, greatestUnsigned,
                          9223372036854775808UL, 0UL, 0UL}));
    EXPECT_EQ(runTyped("int64", "[1" + std::string(1000, '0') + "]").target,
              Value(Array{greatest}));
}

TEST(ParseTypedData, OfAnEmptyArrayIsOne) {
    EXPECT_EQ(runTyped("int8", "[]").target, Value(Array()));
    EXPECT_EQ(runTyped("uint8", "[ \n]").target, Value(Array()));
}

TEST(ParseTypedData, ForAnyOtherNameIsAnOrdinaryValue) {
    for (char const* name : {"", "double", "INT8", "int", "int8 ", "uint128", "float"})
        EXPECT_EQ(runTyped(name, "[1.5]").target, Value(Array{1.5})) << name;
    EXPECT_EQ(runTyped("", "\"text\"").target, Value("text"));
    EXPECT_EQ(runTyped("", "x").status, Status::notString);
}

void expectTypedFault(std::string_view text, Status status, std::ptrdiff_t moved) {
    for (char const* name : {"int32", "uint32"}) {
        const auto result = runTyped(name, text, "old");
        EXPECT_EQ(result.status, status) << text;
        EXPECT_EQ(result.moved, moved) << text;
        EXPECT_EQ(result.target, Value("old")) << text;
    }
}

TEST(ParseTypedData, WithoutABracketIsFault14) {
    expectTypedFault("1", Status::notArray, 0);
    expectTypedFault("{}", Status::notArray, 0);
    expectTypedFault(" []", Status::notArray, 0);
    expectTypedFault("null", Status::notArray, 0);
}

TEST(ParseTypedData, WithAnotherSeparatorIsFault15) {
    expectTypedFault("[012]", Status::badArraySeparator, 2);
    expectTypedFault("[-00]", Status::badArraySeparator, 3);
    expectTypedFault("[1 2]", Status::badArraySeparator, 3);
    expectTypedFault("[1}", Status::badArraySeparator, 2);
    expectTypedFault("[1[]]", Status::badArraySeparator, 2);
}

TEST(ParseTypedData, WithAnElementThatIsNoIntegerIsFault20) {
    expectTypedFault("[\"1\"]", Status::badTypedElement, 1);
    expectTypedFault("[[1]]", Status::badTypedElement, 1);
    expectTypedFault("[{}]", Status::badTypedElement, 1);
    expectTypedFault("[true]", Status::badTypedElement, 1);
    expectTypedFault("[+1]", Status::badTypedElement, 1);
    expectTypedFault("[.5]", Status::badTypedElement, 1);
    expectTypedFault("[,1]", Status::badTypedElement, 1);
    expectTypedFault("[-]", Status::badTypedElement, 2);
    expectTypedFault("[--1]", Status::badTypedElement, 2);
    expectTypedFault("[1,]", Status::badTypedElement, 3);
}

TEST(ParseTypedData, WithAFractionOrTheLikeAfterAnIntegerIsFault20) {
    for (const std::string& refused : {"."s, "e"s, "E"s, "\""s, "{"s}) {
        expectTypedFault("[1" + refused + "5]", Status::badTypedElement, 2);
        expectTypedFault("[0" + refused + "5]", Status::badTypedElement, 2);
        expectTypedFault("[1 " + refused + "5]", Status::badTypedElement, 3);
        expectTypedFault("[1" + refused, Status::badTypedElement, 2);
    }
}

TEST(ParseTypedData, EndedEarlyIsFault19) {
    expectTypedFault("", Status::endOfInput, 0);
    expectTypedFault("[", Status::endOfInput, 1);
    expectTypedFault("[ ", Status::endOfInput, 2);
    expectTypedFault("[-", Status::endOfInput, 2);
    expectTypedFault("[1", Status::endOfInput, 2);
    expectTypedFault("[1 ", Status::endOfInput, 3);
    expectTypedFault("[1,", Status::endOfInput, 3);
    expectTypedFault("[1, ", Status::endOfInput, 4);
}

// ---- Typed numbers in objects ----

TEST(TypedNumbers, TypeBeforeData) {
    EXPECT_EQ(parse(R"({"kqtype":"int32","kqdata":[1,-2,3]})"),
              (Object{{"kqtype", "int32"}, {"kqdata", Array{1L, -2L, 3L}}}));
    EXPECT_EQ(parse(R"({"kqtype":"uint8","kqdata":[-3, 300]})"),
              (Object{{"kqtype", "uint8"}, {"kqdata", Array{0UL, 300UL}}}));
    EXPECT_EQ(parse(R"({"kqtype":"int64","kqdata":[99999999999999999999]})"),
              (Object{{"kqtype", "int64"}, {"kqdata", Array{greatest}}}));
}

TEST(TypedNumbers, DataBeforeType) {
    EXPECT_EQ(parse(R"({"kqdata":[5],"kqtype":"uint8"})"),
              (Object{{"kqtype", "uint8"}, {"kqdata", Array{5UL}}}));
    EXPECT_EQ(parse(R"({"kqdata" : [ -5 , 6 ] ,"x":{"y":[1]}, "kqtype" : "int8", "z":7})"),
              (Object{{"kqtype", "int8"},
                      {"kqdata", Array{-5L, 6L}},
                      {"x", Object{{"y", Array{1.0}}}},
                      {"z", 7.0}}));
}

TEST(TypedNumbers, EveryNameWorksInBothOrders) {
    for (const auto* names : {&signedNames, &unsignedNames}) {
        const Value one = names == &signedNames ? Value(1L) : Value(1UL);
        for (const std::string& name : *names) {
            const Object expected{{"kqtype", name}, {"kqdata", Array{one}}};
            EXPECT_EQ(parse(R"({"kqtype":")" + name + R"(","kqdata":[1]})"), expected);
            EXPECT_EQ(parse(R"({"kqdata":[1],"kqtype":")" + name + R"("})"), expected);
        }
    }
}

TEST(TypedNumbers, AnyOtherTypeIsAnOrdinaryMember) {
    EXPECT_EQ(parse(R"({"kqtype":"double","kqdata":[1.5]})"),
              (Object{{"kqtype", "double"}, {"kqdata", Array{1.5}}}));
    EXPECT_EQ(parse(R"({"kqdata":[1.5],"kqtype":"double"})"),
              (Object{{"kqtype", "double"}, {"kqdata", Array{1.5}}}));
    for (const std::string& type : {"8"s, "null"s, "true"s, R"(["int8"])"s, R"({"a":"int8"})"s}) {
        const Object object = parse(R"({"kqtype":)" + type + R"(,"kqdata":[1,"x"]})");
        ASSERT_TRUE(object.contains("kqdata")) << type;
        EXPECT_EQ(object.at("kqdata"), Value(Array{1.0, "x"})) << type;
        EXPECT_FALSE(object.at("kqtype").is<std::string>());
    }
}

TEST(TypedNumbers, AnInvalidTypeDoesNotUnsetTheOneRemembered) {
    EXPECT_EQ(parse(R"({"kqtype":"int8","kqtype":"double","kqtype":1,"kqdata":[1]})"),
              (Object{{"kqtype", "int8"}, {"kqdata", Array{1L}}}));
    EXPECT_EQ(parse(R"({"kqtype":"double","kqtype":"uint8","kqdata":[1]})"),
              (Object{{"kqtype", "double"}, {"kqdata", Array{1UL}}}));
}

TEST(TypedNumbers, DataWithoutATypeMayBeAnything) {
    EXPECT_EQ(parse(R"({"kqdata":{"kqdata":["a",1.5]}})"),
              (Object{{"kqdata", Object{{"kqdata", Array{"a", 1.5}}}}}));
    EXPECT_EQ(parse(R"({"kqtype":"x","kqdata":"y"})"), (Object{{"kqtype", "x"}, {"kqdata", "y"}}));
}

TEST(TypedNumbers, ARepeatedTypeGovernsTheDataAndIsDroppedItself) {
    EXPECT_EQ(parse(R"({"kqtype":"int8","kqtype":"uint8","kqdata":[-1]})"),
              (Object{{"kqtype", "int8"}, {"kqdata", Array{0UL}}}));
    EXPECT_EQ(parse(R"({"kqtype":"int8","kqdata":[-1],"kqtype":"uint8"})"),
              (Object{{"kqtype", "int8"}, {"kqdata", Array{0UL}}}));
    EXPECT_EQ(parse(R"({"kqdata":[-1],"kqtype":"uint8","kqtype":"int16"})"),
              (Object{{"kqtype", "uint8"}, {"kqdata", Array{-1L}}}));
}

TEST(TypedNumbers, RepeatedDataIsDroppedUnlessATypeFollows) {
    EXPECT_EQ(parse(R"({"kqdata":[1.5],"kqdata":[2.5]})"), (Object{{"kqdata", Array{1.5}}}));
    EXPECT_EQ(parse(R"({"kqtype":"int8","kqdata":[1],"kqdata":[2]})"),
              (Object{{"kqtype", "int8"}, {"kqdata", Array{1L}}}));
    EXPECT_EQ(parse(R"({"kqdata":[1],"kqtype":"int8","kqdata":[2]})"),
              (Object{{"kqtype", "int8"}, {"kqdata", Array{1L}}}));
    EXPECT_EQ(parse(R"({"kqdata":[1],"kqdata":[2],"kqtype":"int8"})"),
              (Object{{"kqtype", "int8"}, {"kqdata", Array{2L}}}));
    EXPECT_EQ(parse(R"({"kqdata":[1],"kqtype":"int8","kqdata":[2],"kqtype":"uint8"})"),
              (Object{{"kqtype", "int8"}, {"kqdata", Array{2UL}}}));
    EXPECT_EQ(parse(R"({"kqdata":["x"],"kqdata":[2],"kqtype":"int8"})"),
              (Object{{"kqtype", "int8"}, {"kqdata", Array{2L}}}));
}

TEST(TypedNumbers, BelongToTheInnermostObject) {
    EXPECT_EQ(
        parse(R"({"kqtype":"int8","a":{"kqdata":[1]},"kqdata":[1]})"),
        (Object{{"kqtype", "int8"}, {"a", Object{{"kqdata", Array{1.0}}}}, {"kqdata", Array{1L}}}));
    EXPECT_EQ(parse(R"({"a":[{"kqdata":[1],"kqtype":"int8"}],"kqdata":[1]})"),
              (Object{{"a", Array{Object{{"kqdata", Array{1L}}, {"kqtype", "int8"}}}},
                      {"kqdata", Array{1.0}}}));
    // Also in a member that is dropped, and in data that has no type itself.
    EXPECT_EQ(parse(R"({"a":1,"a":{"kqdata":[1],"kqtype":"int8"},"kqdata":[1]})"),
              (Object{{"a", 1.0}, {"kqdata", Array{1.0}}}));
    EXPECT_EQ(parse(R"({"kqdata":{"kqtype":"int8","kqdata":[1]}})"),
              (Object{{"kqdata", Object{{"kqtype", "int8"}, {"kqdata", Array{1L}}}}}));
}

TEST(TypedNumbers, KeysAreKnownHoweverTheyAreWritten) {
    EXPECT_EQ(parse(R"({"\u006bqtype":"\u0069nt8","kqdat\u0061":[1]})"),
              (Object{{"kqtype", "int8"}, {"kqdata", Array{1L}}}));
    EXPECT_EQ(parse(R"({"Kqtype":"int8","kqdata":[1]})"),
              (Object{{"Kqtype", "int8"}, {"kqdata", Array{1.0}}}));
}

TEST(TypedNumbers, FaultsInTheDataAreTheObjects) {
    EXPECT_EQ(statusOf(R"({"kqtype":"int8","kqdata":[1.5]})"), Status::badTypedElement);
    EXPECT_EQ(statusOf(R"({"kqtype":"int64","kqdata":[012]})"), Status::badArraySeparator);
    EXPECT_EQ(statusOf(R"({"kqtype":"int64","kqdata":"1"})"), Status::notArray);
    EXPECT_EQ(statusOf(R"({"kqtype":"int64","kqdata":)"), Status::endOfInput);
    EXPECT_EQ(statusOf(R"({"kqtype":"int64","kqdata":[1)"), Status::endOfInput);
    EXPECT_TRUE(parse(R"({"kqtype":"int8","kqdata":[1.5]})").empty());
    EXPECT_TRUE(parse(R"({"kqtype":"int64","kqdata":[012]})").empty());
}

TEST(TypedNumbers, FaultsInDataThatGetsItsTypeLaterAreTheObjects) {
    expectObjectFault(R"({"kqdata":[1.5],"kqtype":"int8","a":x})", Status::badTypedElement, 31);
    expectObjectFault(R"({"kqdata":[1,[2]],"kqtype":"int8"})", Status::badTypedElement, 33);
    expectObjectFault(R"({"kqdata":"a","kqtype":"int8"})", Status::notArray, 29);
    expectObjectFault(R"({"kqdata":{},"kqtype":"int8"})", Status::notArray, 28);
    expectObjectFault(R"({"kqdata":[1],"kqdata":null,"kqtype":"int8"})", Status::notArray, 43);
    expectObjectFault(R"({"kqdata":[1],"kqtype":"int8","kqdata":[true],"kqtype":"x"})",
                      Status::badTypedElement, 40);
    EXPECT_TRUE(parse(R"({"a":1,"kqdata":[1.5],"kqtype":"int8"})").empty());
}

// ---- Comments ----

TEST(Comments, AreWhiteSpaceEverywhereWhenAllowed) {
    const std::string text =
        "{/* { */\"a\"//:\n:/**/[//\n1/*]*/,/*,*/2//\n]/**/,/**/\"kqdata\":/**/[/**/1/**/,//\n2],"
        "\"kqtype\":\"int8\"//}\n}";
    const auto result = run(parseObject, text, true);
    EXPECT_EQ(result.status, Status::success);
    EXPECT_EQ(result.target,
              (Object{{"a", Array{1.0, 2.0}}, {"kqdata", Array{1L, 2L}}, {"kqtype", "int8"}}));
    EXPECT_EQ(run(parseValue, "[/**/]", true).target, Value(Array()));
}

TEST(Comments, AreFaultsInRequests) {
    for (char const* text :
         {R"({/**/"a":1})", R"({"a"/**/:1})", R"({"a":/**/1})", R"({"a":1/**/})", "{\"a\":1//\n}",
          R"({"a":1,/**/"b":2})", R"({"a":[/**/]})", R"({"kqtype":"int8","kqdata":[1/**/]})"}) {
        EXPECT_TRUE(parse(text).empty()) << text;
        EXPECT_EQ(run(parseObject, text, true).status, Status::success) << text;
    }
}

TEST(Comments, AreNotSkippedBeforeTheFirstBrace) {
    EXPECT_EQ(run(parseObject, "/**/{}", true).status, Status::notObject);
}

TEST(Comments, WithoutEndAreFault19) {
    EXPECT_EQ(run(parseObject, R"({"a":1 /* })", true).status, Status::endOfInput);
    EXPECT_EQ(run(parseObject, R"({"a":1 // })", true).status, Status::endOfInput);
    EXPECT_EQ(run(parseObject, R"({"a":1 / })", true).status, Status::badObjectSeparator);
}

// ---- The entry ----

TEST(Parse, GivesTheObject) {
    EXPECT_EQ(parse("{}"), Object());
    EXPECT_EQ(parse(R"({"a":1})"), (Object{{"a", 1.0}}));
    EXPECT_EQ(parse(R"({"a":1,"a":2})"), (Object{{"a", 1.0}}));
    EXPECT_TRUE(parse(R"({"a":1})").at("a").is<double>());
}

TEST(Parse, LooksAtNothingAfterTheClosingBrace) {
    EXPECT_EQ(parse("{\"a\":1}}{\xFF\""), (Object{{"a", 1.0}}));
}

TEST(Parse, OfAMalformedTextIsEmpty) {
    for (char const* text : {"", " {}", " {\"a\":1}", R"({"a":1,"b":2,})", R"({"a":012})", "[1]",
                             "1", "null", R"({"a":1)", R"({"a":1])", "\xEF\xBB\xBF{\"a\":1}"})
        EXPECT_TRUE(parse(text).empty()) << text;
    EXPECT_TRUE(parse({}).empty());
}

TEST(Parse, OfAnyBytesEndsInBounds) {
    // Each text stands at the very end of its allocation, where a sanitizer sees a byte too many
    // read.
    for (int first = 0; first < 256; ++first) {
        for (char const* rest : {"", "\"", "{", "\\"}) {
            const std::string text = "{\"a\":" + std::string(1, static_cast<char>(first)) + rest;
            const std::vector<char> exact(text.begin(), text.end());
            EXPECT_TRUE(parse({exact.data(), exact.size()}).empty());
        }
    }
}

TEST(Parse, OfEveryPrefixOfAnObjectIsEmpty) {
    const std::string text =
        R"({"a":[1,-2.5e+3,true,false,null,"x\n\u0041\ud83d\ude00"],"b":{"c":{},"c":[[]]},)"
        R"("kqtype":"int8","kqdata":[1,-20],"d":{"kqdata":[0, 7],"kqtype":"uint64"}})";
    EXPECT_EQ(parse(text).size(), 5u);
    for (std::size_t length = 0; length < text.size(); ++length) {
        const std::vector<char> prefix(text.begin(),
                                       text.begin() + static_cast<std::ptrdiff_t>(length));
        EXPECT_TRUE(parse({prefix.data(), prefix.size()}).empty()) << length;
    }
}

}  // namespace
}  // namespace json
