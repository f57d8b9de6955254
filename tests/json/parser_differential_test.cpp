// SPDX-License-Identifier: Apache-2.0
// The parser against the rules written down plainly, on many texts that are almost JSON.
#include <gtest/gtest.h>

#include <cstdint>
#include <map>

#include "tests/json/parser_comparison.h"
#include "tests/json/random_json.h"

namespace json {
namespace {

TEST(ParserDifferential, GivesTheStatusPositionAndValueOfTheRules) {
    std::map<std::uint32_t, int> seen;
    for (unsigned seed = 0; seed < 30000; ++seed) {
        const std::string text = RandomJson(seed).text(5);
        ASSERT_EQ(differenceFromReference(text), "") << "seed " << seed << ": " << text;
        Input input{text.data(), text.data() + text.size(), seed % 2 == 0};
        Object object;
        ++seen[static_cast<std::uint32_t>(parseObject(input, object))];
    }
    // The texts have to be varied enough to end in every way that an object can.
    for (const std::uint32_t status :
         {0u, 5u, 6u, 8u, 11u, 12u, 13u, 14u, 15u, 16u, 17u, 18u, 19u, 20u})
        EXPECT_GT(seen[status], 10) << "status " << status;
    EXPECT_GT(seen[0], 2000);
}

/// A quoted string of a few hundred bytes: runs of letters, escapes of each sort, now and then a
/// fault, and sometimes no end.
std::string longString(RandomJson& random) {
    std::string text = "\"";
    const std::size_t length = random.below(600);
    const std::size_t longestRun = 1 + random.below(90);
    while (text.size() < length) {
        text += std::string(random.below(longestRun), 'a');
        if (random.oneIn(300))
            text += "\\x";
        else if (random.oneIn(300))
            text += "\\u12";
        else if (random.oneIn(3))
            text += random.oneIn(2) ? "\\u20AC" : "\\uD83D\\uDE00";
        else
            text += random.oneIn(2) ? "\\\"" : "\\\\";
    }
    if (!random.oneIn(10))
        text += "\" ";
    return text.substr(0, text.size() - random.below(2));
}

TEST(ParserDifferential, GivesTheStatusPositionAndValueOfLongStrings) {
    RandomJson random(1);
    std::map<std::uint32_t, int> seen;
    for (int i = 0; i < 20000; ++i) {
        const std::string text = longString(random);
        ASSERT_EQ(difference<std::string>(text, false, parseString, Reference::parseString), "")
            << text;
        Input input{text.data(), text.data() + text.size()};
        std::string target;
        ++seen[static_cast<std::uint32_t>(parseString(input, target))];
    }
    for (const std::uint32_t status : {0u, 5u, 6u, 19u})
        EXPECT_GT(seen[status], 100) << "status " << status;
    EXPECT_GT(seen[0], 10000);
}

}  // namespace
}  // namespace json
