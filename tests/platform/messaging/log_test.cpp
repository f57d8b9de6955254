// SPDX-License-Identifier: Apache-2.0
// What reaches standard error when handlers fail.

#include "platform/messaging/log.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <spdlog/sinks/stdout_sinks.h>
#include <spdlog/spdlog.h>

#include <cstdlib>
#include <latch>
#include <memory>
#include <stdexcept>
#include <string>

#include "platform/messaging/in_process_bus.h"
#include "tests/platform/messaging/bus_test_support.h"

namespace platform::messaging {
namespace {

using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

// What a bus writes to standard error when a handler on `channel` fails.
std::string logOf(const std::string& channel, const MessageHandler& handler) {
    testing::internal::CaptureStderr();
    const auto bus = InProcessBus::create();
    const auto client = clientOf(*bus);
    const auto subscription = subscribe(*client, channel, handler);
    publish(*client, channel, "");
    bus->waitUntilIdle();
    return testing::internal::GetCapturedStderr();
}

TEST(Log, NamesTheChannelAndTheExceptionOfAFailedHandler) {
    const std::string log = logOf(
        "/some/channel", [](const JsonMessage&) { throw std::runtime_error("no such document"); });
    EXPECT_THAT(log, HasSubstr("handler"));
    EXPECT_THAT(log, HasSubstr("\"/some/channel\""));
    EXPECT_THAT(log, HasSubstr("no such document"));
}

TEST(Log, NamesTheChannelOfExceptionsOfAnyType) {
    const std::string log = logOf("/other", [](const JsonMessage&) { throw 42; });
    EXPECT_THAT(log, HasSubstr("\"/other\""));
    EXPECT_THAT(log, HasSubstr("not derived from std::exception"));
}

TEST(Log, SaysNothingOfHandlersThatSucceed) {
    EXPECT_THAT(logOf("/quiet", [](const JsonMessage&) {}), IsEmpty());
}

TEST(Log, NamesTheChannelThatAnObserverFailedAt) {
    testing::internal::CaptureStderr();
    const auto bus = InProcessBus::create();
    const auto observation = bus->observe(
        [](std::string_view, const JsonMessage&) { throw std::runtime_error("pipe is closed"); });
    publish(*clientOf(*bus), "/observed", "");
    const std::string log = testing::internal::GetCapturedStderr();
    EXPECT_THAT(log, HasSubstr("observer"));
    EXPECT_THAT(log, HasSubstr("\"/observed\""));
    EXPECT_THAT(log, HasSubstr("pipe is closed"));
}

TEST(Log, FollowsTheLevelThatTheProcessSets) {
    const MessageHandler failing = [](const JsonMessage&) { throw std::runtime_error("seen"); };
    logOf("/before", failing);  // by now there is a logger
    spdlog::set_level(spdlog::level::off);
    EXPECT_THAT(logOf("/off", failing), IsEmpty());
    spdlog::set_level(spdlog::level::info);
    EXPECT_THAT(logOf("/on", failing), HasSubstr("/on"));
}

TEST(LogDeathTest, FollowsALevelThatWasSetBeforeItBegan) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(
        {
            spdlog::set_level(spdlog::level::off);
            const std::string log = logOf("/off", [](const JsonMessage&) { throw 1; });
            std::_Exit(log.empty() ? 0 : 1);
        },
        testing::ExitedWithCode(0), "");
}

TEST(LogDeathTest, UsesALoggerOfItsNameThatExists) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(
        {
            spdlog::stderr_logger_mt("messaging")->set_pattern("the host's own: %v");
            const std::string log = logOf("/named", [](const JsonMessage&) { throw 1; });
            std::_Exit(log.starts_with("the host's own: ") ? 0 : 1);
        },
        testing::ExitedWithCode(0), "");
}

}  // namespace
}  // namespace platform::messaging
