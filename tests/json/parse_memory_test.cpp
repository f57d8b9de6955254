// SPDX-License-Identifier: Apache-2.0
// The bound on what parsing takes, against what it takes.
#include "json/parse_memory.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "json/parser.h"
#include "json/serialize.h"
#include "tests/json/counting_allocator.h"
#include "tests/json/random_json.h"

namespace json {
namespace {

/// The most bytes that are allocated while `text` is parsed, beyond those that were before.
std::size_t peakOfParsing(std::string_view text) {
    const std::size_t before = memory.bytes;
    memory.peak = before;
    const Object object = parse(text);
    return memory.peak - before;
}

void expectBounded(const std::string& text) {
    const std::size_t bound = memoryToParse(text);
    EXPECT_LE(peakOfParsing(text), bound) << text.substr(0, 100) << " of " << text.size();
    EXPECT_LE(bound, mostMemoryToParse(text.size())) << text.substr(0, 100);
}

std::string repeated(std::string_view piece, std::size_t times) {
    std::string text;
    for (std::size_t i = 0; i < times; ++i)
        text += piece;
    return text;
}

/// Texts of one shape each, of about `times` pieces; some of them break off.
std::vector<std::string> shapes(std::size_t times) {
    return {
        R"({"a":)" + repeated("[", times),
        R"({"a":)" + repeated("[", times) + repeated("]", times) + "}",
        repeated(R"({"":)", times),
        repeated(R"({"a key that is longer than short":)", times) + "1" + repeated("}", times) +
            "}",
        R"({"a":[)" + repeated("[],", times) + "[]]}",
        R"({"a":[)" + repeated("[0],", times) + "0]}",
        R"({"a":[)" + repeated("[0,0],", times) + "0]}",
        R"({"a":[)" + repeated("[0,0,0,0,0],", times) + "0]}",
        R"({"a":[)" + repeated("{},", times) + "0]}",
        R"({"a":[)" + repeated(R"({"b":0},)", times) + "0]}",
        R"({"a":[)" + repeated("0,", times) + "0]}",
        R"({"a":[)" + repeated("0,", times),
        R"({"a":[)" + repeated(R"("",)", times) + "0]}",
        R"({"a":[)" + repeated(R"("sixteen letters!",)", times) + "0]}",
        R"({"a":[)" + repeated(R"("sixteen\n letters",)", times) + "0]}",
        R"({"a":")" + repeated("[{,", times) + "\"}",
        R"({"a":")" + repeated("\\u0041\\\"", times) + "\"}",
        R"({"kqdata":[)" + repeated("1,", times) + R"(1],"kqtype":"int8"})",
        R"({"kqtype":"int8","kqdata":[)" + repeated("1,", times) + "1]}",
        R"({"kqdata":[)" + repeated("1,", times) + R"(1],"kqtype":"int8","kqdata":[)" +
            repeated("1,", times) + R"(1],"kqtype":"int8"})",
        "{" + repeated(R"("a":[0,0],)", times) + R"("a":0})",
        repeated(R"({"a":0,"a":)", times) + "0" + repeated("}", times),
        "{" + repeated(R"("a":0,)", times),
        "",
        "[",
        "{\"",
    };
}

TEST(MemoryToParse, BoundsWhatTextsOfEveryShapeTake) {
    for (const std::size_t times : {1u, 2u, 3u, 5u, 8u, 9u, 64u, 1000u, 1025u, 100'000u}) {
        for (const std::string& text : shapes(times))
            expectBounded(text);
    }
}

TEST(MemoryToParse, BoundsWhatObjectsOfManyMembersTake) {
    std::string text = "{";
    for (int i = 0; i < 100'000; ++i)
        text += '"' + std::to_string(i) + "\":[" + std::to_string(i) + "],";
    expectBounded(text + "\"\":0}");
}

TEST(MemoryToParse, BoundsWhatRandomTextsTake) {
    RandomJson random(3);
    for (int i = 0; i < 2000; ++i) {
        std::string text = serialize(Object{{"a", random.tree(i % 40)}});
        expectBounded(text);
        text.resize(random.below(text.size()));
        expectBounded(text);
        expectBounded(random.bytes(200));
    }
}

TEST(MemoryToParse, IsLittleMoreThanALongStringWhateverIsInIt) {
    const std::string text = R"({"a":")" + repeated("[{,", 1'000'000) + "\"}";
    EXPECT_LE(memoryToParse(text), text.size() + 5000);
}

TEST(MemoryToParse, IsNotFarAboveWhatDeepTextsTake) {
    const std::string text = R"({"a":)" + repeated("[", 1'000'000);
    EXPECT_LE(memoryToParse(text), 120 * text.size());
}

}  // namespace
}  // namespace json
