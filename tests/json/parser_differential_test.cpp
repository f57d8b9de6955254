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

}  // namespace
}  // namespace json
