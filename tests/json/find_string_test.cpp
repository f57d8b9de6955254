// SPDX-License-Identifier: Apache-2.0
#include "json/find_string.h"

#include <gtest/gtest.h>

#include <optional>
#include <string>

#include "json/parser.h"
#include "json/serialize.h"
#include "tests/json/random_json.h"

namespace json {
namespace {

std::optional<std::string> find(std::string_view text) {
    return findString(text, "id");
}

TEST(FindString, FindsAMemberBehindOthersOfEveryKind) {
    EXPECT_EQ(find(R"({"id":"x"})"), "x");
    EXPECT_EQ(find("{ \"id\" :\t\"x\" , "), "x");
    EXPECT_EQ(find(R"({"a":[{"id":"no"},"id","]"],"b":{"c":"},{"},"d":-1e5,"e":null,"id":"x"})"),
              "x");
    EXPECT_EQ(find(R"({"a":"\"id\":\\","id":"\u0041\n"})"), "A\n");
    EXPECT_EQ(find(R"({"\u0069d":"x"})"), "x");
}

TEST(FindString, TakesTheFirstOfSeveral) {
    EXPECT_EQ(find(R"({"id":"x","id":"y"})"), "x");
    EXPECT_EQ(find(R"({"id":1,"id":"y"})"), std::nullopt);
}

TEST(FindString, FindsNothingWhereThereIsNoSuchString) {
    for (const char* text : {"", "{", "{}", " {\"id\":\"x\"}", "[\"id\"]", R"({"id")", R"({"id":)",
                             R"({"id":"x)", R"({"id":"\x"})", R"({"id":1})", R"({"id":["x"]})",
                             R"({"a":{"id":"x"}})", R"({"a":"id"})", R"({"a":"x)", R"({"a":[[)",
                             R"({"a":1]"id":"x"})", R"({"a" "id":"x"})", R"({id:"x"})"})
        EXPECT_EQ(find(text), std::nullopt) << text;
}

TEST(FindString, AgreesWithTheParserOnEveryObject) {
    RandomJson random(5);
    for (int i = 0; i < 2000; ++i) {
        Object object{{"a", random.tree(i % 10)}, {"z", random.tree(3)}};
        object["id"] = random.oneIn(4) ? random.tree(2) : Value(random.bytes(30));
        const std::string text = serialize(object);
        const Object parsed = parse(text);
        for (const char* key : {"a", "id", "z", "missing"}) {
            const auto member = parsed.find(key);
            const bool isString = member != parsed.end() && member->second.is<std::string>();
            EXPECT_EQ(findString(text, key),
                      isString ? std::optional(member->second.get<std::string>()) : std::nullopt)
                << text;
        }
    }
}

}  // namespace
}  // namespace json
