// SPDX-License-Identifier: Apache-2.0
// The text writer, alone and together with the parser.
#include "json/serialize.h"

#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <cstdint>
#include <limits>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

#include "json/parser.h"
#include "tests/json/random_json.h"

namespace json {
namespace {

TEST(Serialize, WritesEachKind) {
    EXPECT_EQ(serialize(Value()), "null");
    EXPECT_EQ(serialize(Null()), "null");
    EXPECT_EQ(serialize(true), "true");
    EXPECT_EQ(serialize(false), "false");
    EXPECT_EQ(serialize(1.5), "1.5");
    EXPECT_EQ(serialize("text"), "\"text\"");
    EXPECT_EQ(serialize(Array()), "[]");
    EXPECT_EQ(serialize(Object()), "{}");
    EXPECT_EQ(serialize(0.1f), "0.1");
    EXPECT_EQ(serialize(-9223372036854775807L - 1), "-9223372036854775808");
    EXPECT_EQ(serialize(18446744073709551615UL), "18446744073709551615");
}

TEST(Serialize, WritesArraysAndObjectsCompactly) {
    EXPECT_EQ(serialize(Array{1.0, Array{}, "a", Object{}, Array{true, Null()}}),
              R"([1,[],"a",{},[true,null]])");
    EXPECT_EQ(serialize(Object{{"b", 1.0}, {"a", Array{Object{{"", Value()}}}}, {"c", "d"}}),
              R"({"a":[{"":null}],"b":1,"c":"d"})");
}

TEST(Serialize, WritesMembersInTheOrderOfTheirKeys) {
    EXPECT_EQ(serialize(Object{{"\xC3\xA4", 1.0}, {"a", 2.0}, {"B", 3.0}, {"", 4.0}}),
              "{\"\":4,\"B\":3,\"a\":2,\"\xC3\xA4\":1}");
}

TEST(Serialize, EscapesQuoteBackslashAndControlBytesOnly) {
    EXPECT_EQ(serialize("\" \\ / \b \f \n \r \t"), R"("\" \\ / \b \f \n \r \t")");
    EXPECT_EQ(serialize(std::string("\0\x01\x0B\x1F\x20\x7F", 6)),
              "\"\\u0000\\u0001\\u000b\\u001f \x7F\"");
    std::string others;
    for (int byte = 0x20; byte < 0x100; ++byte) {
        if (byte != '"' && byte != '\\')
            others += static_cast<char>(byte);
    }
    EXPECT_EQ(serialize(others), "\"" + others + "\"");
}

TEST(Serialize, EscapesAtEveryPlaceOfALongString) {
    for (std::size_t length = 1; length < 40; ++length) {
        for (std::size_t place = 0; place < length; ++place) {
            std::string text(length, 'x');
            text[place] = '\n';
            EXPECT_EQ(serialize(text), "\"" + std::string(place, 'x') + "\\n" +
                                           std::string(length - place - 1, 'x') + "\"");
        }
    }
}

TEST(Serialize, WritesTextsThatAreFarLongerThanTheirFirstBytesSuggest) {
    const std::string plain(100'000, 'a');
    const std::string controls(100'000, '\1');
    std::string escaped;
    for (std::size_t i = 0; i < controls.size(); ++i)
        escaped += "\\u0001";
    EXPECT_EQ(serialize(controls), '"' + escaped + '"');
    EXPECT_EQ(serialize(plain + controls + plain), '"' + plain + escaped + plain + '"');
    EXPECT_EQ(serialize(Array{controls, plain}), "[\"" + escaped + "\",\"" + plain + "\"]");

    // Longer than the usual number, and many of them.
    const double number = -1.2345678901234567e-308;
    std::string numbers = "[-1.2345678901234567e-308";
    for (int i = 1; i < 1000; ++i)
        numbers += ",-1.2345678901234567e-308";
    EXPECT_EQ(serialize(Array(1000, number)), numbers + "]");
}

TEST(Serialize, WritesManySmallValuesAndALongTextBehindThem) {
    Array array;
    std::string expected = "[";
    for (long number = 0; number < 10'000; ++number) {
        array.emplace_back(Object{{"n", number}});
        expected += "{\"n\":" + std::to_string(number) + "},";
    }
    array.emplace_back(std::string(100'000, '\x01'));
    array.emplace_back("end");
    expected += '"';
    for (int i = 0; i < 100'000; ++i)
        expected += "\\u0001";
    EXPECT_EQ(serialize(array), expected + "\",\"end\"]");
}

TEST(Serialize, EscapesKeysAsStrings) {
    EXPECT_EQ(serialize(Object{{"a\"\n", true}}), R"({"a\"\n":true})");
}

TEST(Serialize, WritesDoublesAsTheShortestTextThatReadsBack) {
    EXPECT_EQ(serialize(0.1), "0.1");
    EXPECT_EQ(serialize(-0.0), "-0");
    EXPECT_EQ(serialize(1.0), "1");
    EXPECT_EQ(serialize(-65535.0), "-65535");
    EXPECT_EQ(serialize(1000000.0), "1e+06");
    EXPECT_EQ(serialize(1e22), "1e+22");
    EXPECT_EQ(serialize(9007199254740992.0), "9007199254740992");
    EXPECT_EQ(serialize(5e-324), "5e-324");
    EXPECT_EQ(serialize(1.7976931348623157e308), "1.7976931348623157e+308");
}

TEST(Serialize, WritesWhatIsNoNumberAsNull) {
    EXPECT_EQ(serialize(std::numeric_limits<double>::quiet_NaN()), "null");
    EXPECT_EQ(serialize(std::numeric_limits<double>::infinity()), "null");
    EXPECT_EQ(serialize(-std::numeric_limits<float>::infinity()), "null");
}

/// The value that the text of `value` is parsed to.
Value parsedText(const Value& value) {
    const std::string text = serialize(value);
    Input input{text.data(), text.data() + text.size()};
    Value result;
    EXPECT_EQ(parseValue(input, result), Status::success) << text;
    EXPECT_EQ(input.position, input.end) << text;
    return result;
}

TEST(RoundTrip, GivesBackTreesOfAnyShape) {
    for (unsigned seed = 0; seed < 1000; ++seed) {
        const Value value = RandomJson(seed).tree(12);
        ASSERT_EQ(parsedText(value), value) << "seed " << seed << ": " << serialize(value);
    }
}

TEST(RoundTrip, GivesBackStringsOfAnyBytes) {
    RandomJson random(1);
    for (int i = 0; i < 5000; ++i) {
        const Value value(random.bytes(100));
        ASSERT_EQ(parsedText(value), value) << serialize(value);
    }
}

TEST(RoundTrip, GivesBackTheBitsOfEveryDouble) {
    RandomJson random(2);
    for (int i = 0; i < 20000; ++i) {
        const double number = random.finite();
        const double result = parsedText(number).get<double>();
        ASSERT_EQ(std::bit_cast<std::uint64_t>(result), std::bit_cast<std::uint64_t>(number));
    }
    EXPECT_TRUE(std::signbit(parsedText(-0.0).get<double>()));
}

TEST(RoundTrip, GivesBackTypedIntegers) {
    const Object object{
        {"kqtype", "int64"},
        {"kqdata", Array{-9223372036854775807L - 1, 0L, 9223372036854775807L, 9007199254740993L}}};
    EXPECT_EQ(parse(serialize(object)), object);
    const Object unsignedObject{{"kqtype", "uint64"},
                                {"kqdata", Array{0UL, 18446744073709551615UL}}};
    EXPECT_EQ(parse(serialize(unsignedObject)), unsignedObject);
}

/// The text in memory of exactly its length, or nothing when it has more than `maxLength` bytes.
std::optional<std::string> serializeInto(const Value& value, std::size_t maxLength) {
    std::vector<char> memory;
    const bool isWhole = serialize(value, maxLength, [&](std::size_t size) {
        EXPECT_LE(size, maxLength + 100);
        memory.resize(size);
        memory.shrink_to_fit();  // so that it moves
        return memory.data();
    });
    return isWhole ? std::optional(std::string(memory.begin(), memory.end())) : std::nullopt;
}

TEST(SerializeInto, GivesNothingWhenTheTextIsLongerThanAllowed) {
    RandomJson random(1);
    for (int i = 0; i < 500; ++i) {
        const Value value = random.tree(i % 20);
        const std::string text = serialize(value);
        EXPECT_EQ(serializeInto(value, text.size()), text);
        EXPECT_EQ(serializeInto(value, text.size() + 1), text);
        for (std::size_t length = text.size(); length > 0; length /= 2)
            EXPECT_EQ(serializeInto(value, length - 1), std::nullopt) << text;
    }
}

TEST(SerializeInto, GivesNothingForAStringWhoseEscapesMakeItTooLong) {
    const Value value = std::string(10'000, '\0');
    EXPECT_EQ(serializeInto(value, 60'001), std::nullopt);
    EXPECT_EQ(serializeInto(value, 60'002), serialize(value));
}

TEST(SerializeInto, PassesOnWhatItsMemoryThrows) {
    const Value value = std::string(10'000, 'x');
    for (int allowed = 0; allowed < 2; ++allowed) {
        std::string memory;
        int calls = 0;
        const auto resize = [&](std::size_t size) {
            if (calls++ == allowed)
                throw std::runtime_error("Out of memory!");
            memory.resize(size);
            return memory.data();
        };
        EXPECT_THROW(serialize(value, 1'000'000, resize), std::runtime_error);
        EXPECT_EQ(calls, allowed + 1);
    }
}

}  // namespace
}  // namespace json
