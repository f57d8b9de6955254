// SPDX-License-Identifier: Apache-2.0
// Values and texts that nest NESTING_LEVELS deep, all on a stack of 256 KiB. There is no time limit
// but that of the test runner: were anything quadratic, these tests would not end.
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>

#include <cstddef>
#include <string>
#include <string_view>
#include <utility>

#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"

namespace json {
namespace {

constexpr std::size_t levels = NESTING_LEVELS;
// For shapes whose levels are large, and which are variations.
constexpr std::size_t fewerLevels = levels / 10;
constexpr rlim_t stackBytes = 256 * 1024;

std::string repeated(std::string_view text, std::size_t times) {
    std::string result;
    result.reserve(text.size() * times);
    for (std::size_t i = 0; i < times; ++i)
        result += text;
    return result;
}

/// `innermost` within `depth` openings and closings.
std::string nested(std::string_view opening, std::string_view innermost, std::string_view closing,
                   std::size_t depth = levels) {
    return repeated(opening, depth) + std::string(innermost) + repeated(closing, depth);
}

char descend(char above, std::size_t frames) {
    volatile char frame[256] = {above};
    return frames == 0 ? frame[0] : static_cast<char>(descend(frame[0], frames - 1) + frame[0]);
}

TEST(SmallStack, EndsTheProcessThatNeedsMore) {
    rlimit limit{};
    ASSERT_EQ(getrlimit(RLIMIT_STACK, &limit), 0);
    EXPECT_EQ(limit.rlim_cur, stackBytes);
    const auto overflow = [] {
        // By the system's own means: a sanitizer's report would wait for what the overflow cut off.
        ::signal(SIGSEGV, SIG_DFL);
        descend(1, 4096);
    };
    EXPECT_EXIT(overflow(), testing::KilledBySignal(SIGSEGV), "");
}

/// Parses `text`, a compact object, and does all that can be done to a value with the result.
void expectWorks(const std::string& text) {
    Value value(parse(text));
    ASSERT_TRUE(value.holdsElements());
    EXPECT_TRUE(serialize(value) == text);

    Value copy = value;
    EXPECT_TRUE(copy == value);
    EXPECT_TRUE(copy.get<Object>() == value.get<Object>());
    Value moved = std::move(copy);
    EXPECT_TRUE(moved == value);
    moved = "something else";
    copy = value;
    EXPECT_TRUE(copy == value);
    copy = Array{"a", 1.0};

    // As element of a container that is no Value itself, from which it is copied and destroyed.
    Array array;
    array.push_back(std::move(value));
    Object object;
    object["array"] = array;
    array.clear();
    const Object objectCopy = object;
    EXPECT_TRUE(objectCopy == object);
}

TEST(Depth, OfArrays) {
    expectWorks("{\"a\":" + nested("[", "", "]") + "}");
}

TEST(Depth, OfObjects) {
    expectWorks(nested("{\"a\":", "1", "}"));
}

TEST(Depth, OfArraysAndObjectsInTurn) {
    expectWorks("{\"a\":" + nested("[{\"a\":", "[]", "}]", fewerLevels) + "}");
}

TEST(Depth, WithNeighboursOnBothSides) {
    expectWorks("{\"a\":" + nested("[[1],", "{}", ",[\"b\",[]]]", fewerLevels) + "}");
}

TEST(Depth, OfObjectsWithNeighboursOnBothSides) {
    expectWorks(nested("{\"a\":[true],\"b\":", "[]", ",\"c\":{\"d\":{}}}", fewerLevels));
}

TEST(Depth, OfDataWithoutType) {
    expectWorks("{\"kqdata\":" + nested("[", "", "]") + ",\"kqtype\":\"double\"}");
    expectWorks(nested("{\"kqdata\":", "[]", "}", fewerLevels));
}

TEST(Depth, OfDataThatGetsItsTypeLater) {
    for (const std::string& data : {nested("[", "", "]"), nested("{\"a\":", "1", "}"),
                                    nested("{\"kqdata\":", "[]", "}", fewerLevels)}) {
        EXPECT_TRUE(parse("{\"kqdata\":" + data + ",\"kqtype\":\"int8\"}").empty());
        EXPECT_FALSE(parse("{\"kqdata\":" + data + ",\"kqtype\":\"int\"}").empty());
    }
    const std::string typed =
        nested("{\"kqdata\":[1],\"kqtype\":\"int8\",\"z\":", "2", "}", fewerLevels);
    EXPECT_TRUE(serialize(parse(typed)) == typed);
}

TEST(Depth, OfMembersThatAreDropped) {
    EXPECT_EQ(serialize(parse(nested("{\"a\":1,\"a\":", "2", "}", fewerLevels))), R"({"a":1})");
    EXPECT_EQ(serialize(parse("{\"a\":1,\"a\":" + nested("[", "", "]") + "}")), R"({"a":1})");
}

TEST(Depth, OfTextsThatEndEarlyOrAreMalformed) {
    for (char const* opening : {"[", "{\"a\":"}) {
        EXPECT_TRUE(parse("{\"a\":" + repeated(opening, levels)).empty());
        EXPECT_TRUE(parse("{\"a\":" + repeated(opening, fewerLevels) + "x").empty());
    }
    for (char const* opening : {"[{\"a\":", "[1,", "{\"a\":1,\"a\":"})
        EXPECT_TRUE(parse("{\"a\":" + repeated(opening, fewerLevels)).empty());
}

TEST(Depth, OfATreeThatDiffersInItsInnermostValue) {
    const Value left(parse("{\"a\":" + nested("[", "1", "]", fewerLevels) + "}"));
    const Value right(parse("{\"a\":" + nested("[", "2", "]", fewerLevels) + "}"));
    EXPECT_FALSE(left == right);
}

TEST(Breadth, OfManyContainersThatHoldOthers) {
    expectWorks("{\"a\":[" + repeated("[[1],{\"a\":[2]}],", fewerLevels) + "0]}");
}

TEST(RepeatedType, AfterLongDataTakesLinearTime) {
    const std::size_t times = fewerLevels;
    std::string text = "{\"kqdata\":[" + repeated("1,", times) + "1]";
    text += repeated(",\"kqtype\":\"int8\",\"kqtype\":\"uint8\"", times);
    text += "}";
    const Object object = parse(text);
    ASSERT_EQ(object.size(), 2u);
    EXPECT_EQ(object.at("kqdata"), Value(Array(times + 1, 1UL)));
    EXPECT_EQ(object.at("kqtype"), Value("int8"));
}

}  // namespace
}  // namespace json

int main(int argc, char** argv) {
    ::testing::InitGoogleTest(&argc, argv);
    // Holds at once: the system compares the limit whenever the stack grows.
    const rlimit limit{json::stackBytes, json::stackBytes};
    if (setrlimit(RLIMIT_STACK, &limit) != 0)
        return 1;
    return RUN_ALL_TESTS();
}
