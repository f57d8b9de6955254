// SPDX-License-Identifier: Apache-2.0
// Texts and values of more bytes than 32 bits can count, and of many members.
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstddef>
#include <string>

#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"

namespace json {
namespace {

constexpr std::size_t gibibyte = std::size_t{1} << 30;

bool hasMemory(std::size_t bytes) {
    return static_cast<std::size_t>(::sysconf(_SC_AVPHYS_PAGES)) *
               static_cast<std::size_t>(::sysconf(_SC_PAGESIZE)) >=
           bytes;
}

// Compared without gtest's macros, which would print them.
void expectSame(const std::string& left, const std::string& right) {
    EXPECT_TRUE(left == right);
}

TEST(Size, OfATextOfMoreThanTwoGigabytesWithStringsOfMoreThanOne) {
    if (UNDER_SANITIZERS || !hasMemory(8 * gibibyte)) {
        GTEST_SKIP() << "this takes 7 GB of memory";
    }
    std::string text = R"({"a":")";
    text.reserve(2 * gibibyte + 100);
    text.append(gibibyte + 1, 'x').append(R"(\n","b":")");
    text.append(gibibyte + 2, 'y').append(R"("})");

    const Object object = parse(text);
    ASSERT_EQ(object.size(), 2u);
    const std::string& a = object.at("a").get<std::string>();
    ASSERT_EQ(a.size(), gibibyte + 2);
    EXPECT_EQ(a.find_first_not_of('x'), gibibyte + 1);
    EXPECT_EQ(a.back(), '\n');
    const std::string& b = object.at("b").get<std::string>();
    ASSERT_EQ(b.size(), gibibyte + 2);
    EXPECT_EQ(b.find_first_not_of('y'), std::string::npos);
    expectSame(serialize(Value(object)), text);
}

TEST(Size, OfAnObjectOfAMillionMembers) {
    std::string text = "{";
    for (int i = 1'000'000; i < 2'000'000; ++i)
        text += '"' + std::to_string(i) + "\":" + std::to_string(i) + ',';
    text.back() = '}';
    const Object object = parse(text);
    EXPECT_EQ(object.size(), 1'000'000u);
    EXPECT_EQ(object.at("1999999"), Value(1999999.0));
    // Doubles may be written in another form, so texts do not compare.
    EXPECT_TRUE(parse(serialize(Value(object))) == object);

    // The same member a million times is one.
    std::string repeated = "{";
    for (int i = 0; i < 1'000'000; ++i)
        repeated += "\"key\":" + std::to_string(i) + ',';
    repeated.back() = '}';
    const Object one = parse(repeated);
    EXPECT_EQ(one.size(), 1u);
    EXPECT_EQ(one.at("key"), Value(0.0));
}

}  // namespace
}  // namespace json
