// SPDX-License-Identifier: Apache-2.0
// The value: its kinds, strict access, and ownership of the tree.
#include "json/value.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <set>
#include <stdexcept>
#include <tuple>
#include <utility>

#include "tests/json/random_json.h"

namespace json {
namespace {

using ::testing::ElementsAre;

/// A value of each kind, in the order of the kinds; the scalars hold something that is not a
/// default.
std::vector<Value> oneOfEachKind() {
    std::vector<Value> values;
    values.emplace_back(Undefined());
    values.emplace_back(Null());
    values.emplace_back(true);
    values.emplace_back(1.0);
    values.emplace_back("text");
    values.emplace_back(Array());
    values.emplace_back(Object());
    values.emplace_back(1.0f);
    values.emplace_back(1L);
    values.emplace_back(1UL);
    return values;
}

const std::vector<std::string> kindNames = {"undefined", "null",   "boolean", "double", "string",
                                            "array",     "object", "float",   "int64",  "uint64"};

template <typename T>
class HeldTypes : public ::testing::Test {};

using AllHeldTypes = ::testing::Types<Undefined, Null, bool, double, std::string, Array, Object,
                                      float, long, unsigned long>;
TYPED_TEST_SUITE(HeldTypes, AllHeldTypes);

TYPED_TEST(HeldTypes, AreHeldByOneKindAndRefusedByTheNineOthers) {
    const std::size_t own = Value(TypeParam()).index();
    EXPECT_EQ(traits<TypeParam>::name, kindNames.at(own));
    std::vector<Value> values = oneOfEachKind();
    for (std::size_t actual = 0; actual < values.size(); ++actual) {
        SCOPED_TRACE(kindNames[actual]);
        const Value original = values[actual];
        const Value& constant = values[actual];
        EXPECT_EQ(constant.is<TypeParam>(), actual == own);
        if (actual == own) {
            EXPECT_EQ(&values[actual].get<TypeParam>(), &constant.get<TypeParam>());
            EXPECT_EQ(Value(constant.get<TypeParam>()), original);
            continue;
        }
        const std::string expected =
            "invalid conversion: " + kindNames[actual] + " to " + kindNames[own];
        const auto message = [](auto& value) -> std::string {
            try {
                value.template get<TypeParam>();
            } catch (const std::runtime_error& error) {
                return error.what();
            }
            return "no exception";
        };
        EXPECT_EQ(message(values[actual]), expected);
        EXPECT_EQ(message(constant), expected);
        EXPECT_EQ(constant, original);
    }
}

TYPED_TEST(HeldTypes, AreTakenByCopyAndByMove) {
    const TypeParam held = oneOfEachKind()[Value(TypeParam()).index()].template get<TypeParam>();
    TypeParam moved = held;
    EXPECT_EQ(Value(held).template get<TypeParam>(), held);
    EXPECT_EQ(Value(std::move(moved)).template get<TypeParam>(), held);
}

TEST(Value, HasTenKindsInAFixedOrder) {
    const std::vector<Value> values = oneOfEachKind();
    ASSERT_EQ(values.size(), 10u);
    for (std::size_t i = 0; i < values.size(); ++i)
        EXPECT_EQ(values[i].index(), i);
}

TEST(Value, KindNamesAreDistinct) {
    EXPECT_EQ(std::set<std::string>(kindNames.begin(), kindNames.end()).size(), 10u);
}

TEST(Value, IsUndefinedByDefault) {
    const Value value;
    EXPECT_EQ(value.index(), 0u);
    try {
        value.get<std::string>();
        FAIL() << "an undefined value gave a string";
    } catch (const std::runtime_error& error) {
        EXPECT_STREQ(error.what(), "invalid conversion: undefined to string");
    }
}

TEST(Value, OfAnEmptyCStringIsAnEmptyString) {
    const Value value("");
    EXPECT_EQ(value.index(), 4u);
    EXPECT_EQ(value.get<std::string>(), "");
}

TEST(Value, OfACStringHasItsBytesUpToTheNul) {
    char const text[] = "a\xFF\x80\0z";
    EXPECT_EQ(Value(text).get<std::string>(), "a\xFF\x80");
    char changeable[] = "text";
    EXPECT_TRUE(Value(changeable).is<std::string>());
}

TEST(Value, RefusesTheObjectOfAnEmptyArray) {
    EXPECT_THROW(Value(Array()).get<Object>(), std::runtime_error);
}

TEST(Value, DoesNotConvertBetweenNumbers) {
    EXPECT_THROW(Value(1.0).get<long>(), std::runtime_error);
    EXPECT_THROW(Value(1L).get<unsigned long>(), std::runtime_error);
    EXPECT_THROW(Value(1.0f).get<double>(), std::runtime_error);
}

TEST(Value, IsMadeOfNothingButHeldTypesAndCStrings) {
    EXPECT_TRUE((std::is_constructible_v<Value, bool>));
    EXPECT_FALSE((std::is_constructible_v<Value, int>));
    EXPECT_FALSE((std::is_constructible_v<Value, unsigned>));
    EXPECT_FALSE((std::is_constructible_v<Value, char>));
    EXPECT_FALSE((std::is_constructible_v<Value, std::nullptr_t>));
    EXPECT_FALSE((std::is_constructible_v<Value, int*>));
    EXPECT_FALSE((std::is_constructible_v<Value, void (*)()>));
    EXPECT_FALSE((std::is_constructible_v<Value, char16_t const*>));
    EXPECT_TRUE(std::is_nothrow_move_constructible_v<Value>);
    EXPECT_TRUE(std::is_nothrow_move_assignable_v<Value>);
    EXPECT_TRUE(std::is_nothrow_default_constructible_v<Value>);
}

TEST(Value, KeepsObjectKeysInAscendingByteOrder) {
    Value value{Object()};
    auto& object = value.get<Object>();
    for (char const* key : {"b", "\xC3\xA4", "a", "", "B", "aa", "\x7F"})
        object[key] = key;
    std::vector<std::string> keys;
    for (const auto& [key, member] : object)
        keys.push_back(key);
    EXPECT_THAT(keys, ElementsAre("", "B", "a", "aa", "b", "\x7F", "\xC3\xA4"));
}

TEST(Value, SubscriptOfAMissingKeyInsertsUndefined) {
    Value value{Object()};
    EXPECT_TRUE(value.get<Object>()["missing"].is<Undefined>());
    EXPECT_EQ(value.get<Object>().size(), 1u);
}

Value nestedSample() {
    Object inner;
    inner["list"] = Array{1.0, "two", Array{Null(), Object{{"three", 3L}}}};
    inner["empty"] = Object();
    Object outer;
    outer["inner"] = inner;
    outer["text"] = "text";
    return outer;
}

TEST(Value, CopyEqualsItsSourceAndSharesNothingWithIt) {
    const Value source = nestedSample();
    Value copy = source;
    EXPECT_EQ(copy, source);
    Array& list = copy.get<Object>()["inner"].get<Object>()["list"].get<Array>();
    list[2].get<Array>()[1].get<Object>()["three"] = "changed";
    list.emplace_back(4.0);
    EXPECT_EQ(source, nestedSample());
    EXPECT_FALSE(copy == source);
}

TEST(Value, AssignmentOfEachKindOverEachKindGivesTheSource) {
    std::vector<Value> values = oneOfEachKind();
    values.push_back(nestedSample());
    values.emplace_back(Array{1.0, Array{2.0}});
    for (const Value& source : values) {
        for (const Value& old : values) {
            Value target = old;
            target = source;
            EXPECT_EQ(target, source);
            Value moved = old;
            Value temporary = source;
            moved = std::move(temporary);
            EXPECT_EQ(moved, source);
        }
    }
}

TEST(Value, AssignedArrayMayBeLongerOrShorterThanTheOldOne) {
    Value target(Array{1.0, 2.0, 3.0});
    const Value shorter(Array{"a"});
    const Value longer(Array{"a", "b", Array{"c"}, "d", "e"});
    target = longer;
    EXPECT_EQ(target, longer);
    target = shorter;
    EXPECT_EQ(target, shorter);
}

TEST(Value, ArrayAssignmentKeepsTheElementsThatStay) {
    Value target = Array{1.0, Array{"a", "b"}, Object{{"k", 1.0}}, "last"};
    const Value source = Array{"new", Array{Array{}, 2.0}, Array{3.0}};
    Array& array = target.get<Array>();
    Array& nested = array[1].get<Array>();
    const Value* const elements = array.data();
    const Value* const nestedElements = nested.data();
    target = source;
    EXPECT_EQ(target, source);
    EXPECT_EQ(target.get<Array>().data(), elements);
    EXPECT_EQ(&target.get<Array>()[1].get<Array>(), &nested);
    EXPECT_EQ(nested.data(), nestedElements);
}

TEST(Value, ArrayAssignmentAddsElementsWithoutMovingThoseThatStayWhereThereIsRoom) {
    Value target = Array{1.0};
    target.get<Array>().reserve(3);
    const Value* const elements = target.get<Array>().data();
    const Value longer = Array{"a", Array{1.0}, "c"};
    target = longer;
    EXPECT_EQ(target, longer);
    EXPECT_EQ(target.get<Array>().data(), elements);
    const Value tooLong = Array(100, Value("a"));
    target = tooLong;
    EXPECT_EQ(target, tooLong);
}

TEST(Value, ArrayAssignmentOfAnyTreesGivesTheSource) {
    RandomJson random(7);
    for (int i = 0; i < 1000; ++i) {
        Value target = Array{random.tree(i % 12), random.tree(3), Array{random.tree(2)}};
        const Value source = Array{random.tree(i % 10), random.tree(3), Array{random.tree(2)}};
        target = source;
        EXPECT_EQ(target, source);
    }
}

TEST(Value, TakesAnAssignmentFromItsOwnTree) {
    Value copied(Array{"a", Array{"b", Object{{"key", "c"}}}});
    copied = copied.get<Array>()[1];
    EXPECT_EQ(copied, Value(Array{"b", Object{{"key", "c"}}}));
    copied = copied.get<Array>()[1].get<Object>()["key"];
    EXPECT_EQ(copied, Value("c"));

    Value moved(Object{{"key", Array{"a", Array{"b"}}}});
    moved = std::move(moved.get<Object>()["key"]);
    EXPECT_EQ(moved, Value(Array{"a", Array{"b"}}));
    moved = std::move(moved.get<Array>()[1]);
    EXPECT_EQ(moved, Value(Array{"b"}));
}

TEST(Value, TakesAnAssignmentFromItself) {
    Value value = nestedSample();
    Value& same = value;
    value = same;
    EXPECT_EQ(value, nestedSample());
    value = std::move(same);
    EXPECT_EQ(value, nestedSample());
}

TEST(Value, MoveTakesTheContentsAndLeavesTheKind) {
    Value source(Array{"a", Object{{"key", 1.0}}});
    const Value* const element = &source.get<Array>()[1];
    const Value target = std::move(source);
    EXPECT_EQ(&target.get<Array>()[1], element);
    EXPECT_TRUE(source.get<Array>().empty());  // NOLINT(bugprone-use-after-move)
}

TEST(Value, EmplaceReplacesTheContents) {
    Value value = nestedSample();
    value.emplace<Array>().emplace_back("only");
    EXPECT_EQ(value, Value(Array{"only"}));
    value.emplace<Undefined>();
    EXPECT_EQ(value, Value());
}

TEST(Value, HoldsElementsWhenItIsAnArrayOrObjectThatIsNotEmpty) {
    for (const Value& value : oneOfEachKind())
        EXPECT_FALSE(value.holdsElements());
    EXPECT_TRUE(Value(Array{Value()}).holdsElements());
    EXPECT_TRUE(Value(Object{{"", Value()}}).holdsElements());
}

TEST(Value, EqualsOnlyItsOwnKind) {
    const std::vector<Value> values = oneOfEachKind();
    for (std::size_t i = 0; i < values.size(); ++i) {
        for (std::size_t j = 0; j < values.size(); ++j)
            EXPECT_EQ(values[i] == values[j], i == j);
    }
}

TEST(Value, DiffersInAnyPartOfTheTree) {
    const Value value(Array{1.0, Object{{"key", Array{"a", Array{true}}}}});
    EXPECT_EQ(value, Value(Array{1.0, Object{{"key", Array{"a", Array{true}}}}}));
    EXPECT_NE(value, Value(Array{2.0, Object{{"key", Array{"a", Array{true}}}}}));
    EXPECT_NE(value, Value(Array{1.0, Object{{"kez", Array{"a", Array{true}}}}}));
    EXPECT_NE(value, Value(Array{1.0, Object{{"key", Array{"b", Array{true}}}}}));
    EXPECT_NE(value, Value(Array{1.0, Object{{"key", Array{"a", Array{false}}}}}));
    EXPECT_NE(value, Value(Array{1.0, Object{{"key", Array{"a", Array{true, true}}}}}));
    EXPECT_NE(value, Value(Array{1.0, Object{{"key", Array{"a", Object{{"", true}}}}}}));
    EXPECT_NE(value, Value(Array{1.0, Object{{"key", Array{"a", Array()}}}}));
    EXPECT_NE(value, Value(Array{1.0, Object{{"key", Array{"a", Array{true}}}, {"more", 1.0}}}));
    EXPECT_NE(value, Value(Array{1.0, Object()}));
}

TEST(Value, TreesOfAnyShapeAreCopiedWhole) {
    for (unsigned seed = 0; seed < 300; ++seed) {
        RandomJson random(seed);
        const Value source = random.tree(80);
        const Value copy = source;
        ASSERT_EQ(copy, source) << "seed " << seed;
        Value other = random.tree(5);
        other = copy;
        ASSERT_EQ(other, source) << "seed " << seed;
    }
}

}  // namespace
}  // namespace json
