// SPDX-License-Identifier: Apache-2.0
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <thread>
#include <vector>

#include "host/limits/memory_limit.h"
#include "platform/messaging/channels.h"
#include "tests/host/host_program.h"
#include "tests/support/process_state.h"
#include "tests/support/temporary_directory.h"
#include "tests/support/wait_until.h"

namespace {

using platform::messaging::readRequestChannel;
using platform::messaging::readResponsePrefix;
using test::hostCommand;
using test::Outcome;

constexpr std::uintmax_t gigabyte = std::uintmax_t{1} << 30;

class MemoryLimit : public ::testing::Test {
protected:
    void SetUp() override {
        if (!LIMIT_MEMORY) {
            GTEST_SKIP() << "the sanitizers take more address space than there is memory";
        }
        test::writeFile(small, "text");
    }

    // A file of that size that takes no room on disk.
    std::string sparse(std::uintmax_t size) const {
        const std::filesystem::path file = folder / "sparse";
        test::writeFile(file, "");
        std::filesystem::resize_file(file, size);
        return file.string();
    }

    test::TemporaryDirectory folder;
    const std::string small = (folder / "small").string();
};

TEST_F(MemoryLimit, MakesAFileThatIsLargerAFailedRequest) {
    const Outcome outcome =
        test::run(hostCommand({"--memory-limit", "500MB", "read", sparse(gigabyte), small}));
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.output,
              "{\"exception\":\"std::bad_alloc\",\"status\":false}\n"
              "{\"data\":\"text\",\"status\":true}\n");
}

TEST_F(MemoryLimit, HoldsForTheOldTextThatIsKeptWhileANewOneIsWrittenInPlace) {
    const std::string file = sparse(gigabyte);
    std::filesystem::create_hard_link(file, folder / "other name");  // so that it is in place
    const Outcome outcome = test::run(
        hostCommand({"--memory-limit", "500MB", "write", "--no-history", file}), "new text");
    EXPECT_EQ(outcome.status, 1);
    EXPECT_EQ(outcome.output, "false\n");
    EXPECT_THAT(outcome.errors,
                testing::HasSubstr("cannot be kept in memory: Cannot allocate memory"));
    EXPECT_EQ(std::filesystem::file_size(file), gigabyte);
}

TEST_F(MemoryLimit, HoldsForTheStandardInputThatIsRead) {
    const Outcome outcome = test::run(hostCommand({"--memory-limit", "100MB", "read", "-"}),
                                      std::string(200'000'000, 'x'));
    EXPECT_EQ(outcome.status, 1);
    EXPECT_THAT(outcome.errors,
                testing::HasSubstr("cannot be kept in memory: Cannot allocate memory"));
}

TEST_F(MemoryLimit, IsThereWithoutBeingAskedFor) {
    test::Subprocess program(hostCommand({"stdio"}));
    program.write(test::framedReadRequest("1", small));
    EXPECT_NE(program.readSome(), "");  // it has started
    std::ifstream limits("/proc/" + std::to_string(program.id()) + "/limits");
    const std::string text{std::istreambuf_iterator<char>(limits), {}};
    EXPECT_THAT(text, testing::ContainsRegex("Max data size +" +
                                             std::to_string(host::defaultMemoryLimit()) + " "));
    EXPECT_GT(host::defaultMemoryLimit(), gigabyte / 4);
}

TEST_F(MemoryLimit, LeavesTheLimitOfTextsToTellOfAFileThatIsTooLargeForOne) {
    const Outcome outcome =
        test::run(hostCommand({"--memory-limit", "500MB", "read", sparse(gigabyte + 1), small}));
    EXPECT_EQ(outcome.output,
              "{\"exception\":\"The text is too large: 1073741825 bytes, at most 1073741824 are "
              "accepted\",\"status\":false}\n"
              "{\"data\":\"text\",\"status\":true}\n");
}

TEST_F(MemoryLimit, IsNotUsedUpByTheStacksOfThreads) {
    test::Subprocess program(hostCommand({"--memory-limit", "64MB", "stdio"}));
    program.write(test::framedReadRequest("1", small));
    EXPECT_NE(program.readSome(), "");  // it has started
    std::ifstream status("/proc/" + std::to_string(program.id()) + "/status");
    std::size_t kilobytes = 0;
    for (std::string word; status >> word;) {
        if (word == "VmData:") {
            status >> kilobytes;
        }
    }
    EXPECT_GT(kilobytes, 0U);
    EXPECT_LT(kilobytes, 24U * 1024);
}

// A read request in which something nests `levels` deep beside what counts.
std::string deepRequest(const std::string& rtcId, const std::string& file, std::size_t levels) {
    std::string request = test::readRequest(rtcId, file);
    request.back() = ',';
    return request + "\"deep\":" + std::string(levels, '[') + std::string(levels, ']') + "}";
}

test::Message answer(const std::string& rtcId, const std::string& payload) {
    return {readResponsePrefix + rtcId, payload};
}

TEST_F(MemoryLimit, HasARequestRefusedWhoseValuesWouldTakeMoreThanHalfOfIt) {
    const Outcome outcome =
        test::run(hostCommand({"--memory-limit", "200MB", "stdio"}),
                  test::framed(readRequestChannel, deepRequest("1", small, 2'000'000)) +
                      test::framedReadRequest("2", small));
    EXPECT_EQ(outcome.status, 0);
    const std::vector<test::Message> messages = test::messagesIn(outcome.output);
    ASSERT_THAT(messages, testing::SizeIs(2));
    EXPECT_THAT(messages, testing::Contains(answer("2", R"({"data":"text","status":true})")));
    EXPECT_THAT(messages, testing::Contains(testing::Field(
                              &test::Message::payload,
                              testing::StartsWith(R"({"exception":"The request is too large: )"))));
    EXPECT_THAT(outcome.errors, testing::HasSubstr("is refused: The request is too large"));
}

TEST_F(MemoryLimit, LetsTenMillionLevelsThroughByDefault) {
    if (host::defaultMemoryLimit() < 4 * gigabyte) {
        GTEST_SKIP() << "the machine has too little memory";
    }
    const Outcome outcome =
        test::run(hostCommand({"stdio"}),
                  test::framed(readRequestChannel, deepRequest("1", small, 10'000'000)));
    EXPECT_THAT(test::messagesIn(outcome.output),
                testing::ElementsAre(answer("1", R"({"data":"text","status":true})")));
}

TEST_F(MemoryLimit, IsNotUsedUpByARequestThatIsDone) {
    test::Subprocess program(hostCommand({"stdio"}));
    program.write(test::framedReadRequest("1", small));
    EXPECT_NE(program.readSome(), "");
    const auto memory = [&] { return test::memoryOf(std::to_string(program.id()), "VmRSS"); };
    const std::size_t before = memory();
    program.write(test::framed(readRequestChannel, deepRequest("1", small, 3'000'000)));
    EXPECT_NE(program.readSome(), "");
    // The answer comes before the request's values are given back.
    EXPECT_TRUE(test::waitUntil([&] { return memory() <= before + gigabyte / 20; }));
}

TEST_F(MemoryLimit, OfLessThanTheProgramTakesIsWrongUsage) {
    const Outcome outcome = test::run(hostCommand({"--memory-limit", "16", "read", small}));
    EXPECT_EQ(outcome.status, 2);
    EXPECT_THAT(outcome.errors, testing::HasSubstr("the program itself takes some 64 MB"));
}

}  // namespace
