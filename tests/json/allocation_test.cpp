// SPDX-License-Identifier: Apache-2.0
// What happens when memory runs out, at every allocation in turn: nothing leaks and nothing is left
// half done. This program's operator new can be told to fail.
#include <gtest/gtest.h>

#include <cstddef>
#include <new>
#include <string>

#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"
#include "tests/json/counting_allocator.h"
#include "tests/json/random_json.h"

namespace json {
namespace {

/// Runs `action` with memory for 0 allocations, for 1, and so on until it has enough. After each
/// failure calls `check`. Gives the number of failures.
template <typename Action, typename Check>
std::size_t failAtEachAllocation(Action action, Check check) {
    for (std::size_t allowed = 0;; ++allowed) {
        const std::size_t live = memory.live;
        memory.untilFailure = allowed;
        try {
            action();
            memory.untilFailure = Memory::never;
            return allowed;
        } catch (const std::bad_alloc&) {
            memory.untilFailure = Memory::never;
            EXPECT_EQ(memory.live, live) << "leak after " << allowed << " allocations";
            check();
        }
    }
}

Value sample() {
    return parse(R"({"a":[1,"a text too long for the string itself",[{"b":[[]]},{"c":{}}],[2]],)"
                 R"("another key that needs memory":{"d":[true,{"e":[3]}],"f":"g"}})");
}

/// A chain of `depth` arrays, each with a text and an object beside the next.
Value chain(int depth) {
    Value value("innermost");
    for (int i = 0; i < depth; ++i) {
        Array level;
        level.emplace_back("a text too long for the string itself");
        level.push_back(std::move(value));
        level.emplace_back(Object{{"key", Array{1.0}}});
        value = std::move(level);
    }
    return value;
}

TEST(OutOfMemory, WhileCopyingLeaksNothing) {
    for (const Value& source : {sample(), chain(100)}) {
        const Value original = source;
        const auto copy = [&] { Value{source}; };
        const std::size_t failures =
            failAtEachAllocation(copy, [&] { EXPECT_EQ(source, original); });
        EXPECT_GT(failures, 10u);
    }
}

TEST(OutOfMemory, WhileAssigningLeavesTheTargetAsItWas) {
    const Value source = sample();
    const Value old(Array{"a text too long for the string itself", Array{1.0}});
    Value target = old;
    const std::size_t failures =
        failAtEachAllocation([&] { target = source; }, [&] { EXPECT_EQ(target, old); });
    EXPECT_GT(failures, 10u);
    EXPECT_EQ(target, source);
}

TEST(OutOfMemory, WhileParsingIsThrownAndLeaksNothing) {
    const std::string text = serialize(sample());
    Object object{{"old", true}};
    const auto parseText = [&] {
        Input input{text.data(), text.data() + text.size()};
        parseObject(input, object);
    };
    const std::size_t failures = failAtEachAllocation(parseText, [&] {
        EXPECT_EQ(object, (Object{{"old", true}}));
    });
    EXPECT_GT(failures, 10u);
    EXPECT_EQ(object, sample().get<Object>());
}

TEST(OutOfMemory, WhileParsingTypedDataIsTheFaultEndOfInput) {
    const std::string text = "[1,2,3,4,5,6,7,8,9]";
    std::size_t failures = 0;
    for (std::size_t allowed = 0;; ++allowed) {
        Value target(true);
        Input input{text.data(), text.data() + text.size()};
        const std::size_t live = memory.live;
        memory.untilFailure = allowed;
        const Status status = parseTypedData(input, "int8", target);
        memory.untilFailure = Memory::never;
        if (status == Status::success)
            break;
        ++failures;
        EXPECT_EQ(status, Status::endOfInput);
        EXPECT_EQ(target, Value(true));
        EXPECT_EQ(memory.live, live);
    }
    EXPECT_GE(failures, 1u);
}

TEST(OutOfMemory, WhileParsingDataThatGetsItsTypeLaterIsTheObjectsFault) {
    const std::string text = R"({"kqdata":[1,2,3,4,5,6,7,8,9],"kqtype":"int8"})";
    std::size_t faults = 0;
    Status status = Status::success;
    Object object;
    for (std::size_t allowed = 0;; ++allowed) {
        Input input{text.data(), text.data() + text.size()};
        const std::size_t live = memory.live;
        memory.untilFailure = allowed;
        try {
            status = parseObject(input, object);
        } catch (const std::bad_alloc&) {
            memory.untilFailure = Memory::never;
            EXPECT_EQ(memory.live, live);
            continue;
        }
        memory.untilFailure = Memory::never;
        if (status == Status::success)
            break;
        ++faults;
        EXPECT_EQ(status, Status::endOfInput);
        EXPECT_TRUE(object.empty());
        EXPECT_EQ(memory.live, live);
    }
    EXPECT_GE(faults, 1u);
    EXPECT_EQ(object.at("kqdata").get<Array>().size(), 9u);
}

TEST(OutOfMemory, WhileSerializingLeaksNothing) {
    const Value value = sample();
    std::string text;
    const std::size_t failures =
        failAtEachAllocation([&] { text = serialize(value); }, [&] { EXPECT_EQ(text, ""); });
    EXPECT_GE(failures, 1u);
}

TEST(Destruction, FreesTreesOfAnyShape) {
    for (unsigned seed = 0; seed < 100; ++seed) {
        const std::size_t live = memory.live;
        {
            RandomJson random(seed);
            Value value = random.tree(100);
            Value other = random.tree(50);
            const Value copy = value;
            value = other;
            other = Value();
        }
        ASSERT_EQ(memory.live, live) << "seed " << seed;
    }
}

TEST(Destruction, NeedsNoMemory) {
    Value value = chain(200);
    memory.untilFailure = 0;
    value = Value();
    memory.untilFailure = Memory::never;
    EXPECT_TRUE(value.is<Undefined>());
}

TEST(RepeatedType, ConvertsLongDataOnce) {
    const auto allocations = [](int repetitions) {
        std::string text = "{\"kqdata\":[0";
        for (int i = 0; i < 1000; ++i)
            text += ",1";
        text += "]";
        for (int i = 0; i < repetitions; ++i)
            text += R"(,"kqtype":"int8","kqtype":"uint8")";
        text += "}";
        const std::size_t before = memory.made;
        EXPECT_EQ(parse(text).at("kqdata").get<Array>().size(), 1001u);
        return memory.made - before;
    };
    // A repeated type costs the place of its dropped value, nothing that grows with the data.
    EXPECT_LE(allocations(1000) - allocations(1), 2u * 999u);
}

}  // namespace
}  // namespace json
