// How a process ends that has used the bus: normally, whatever is still subscribed.

#include <gtest/gtest.h>
#include <spdlog/spdlog.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <latch>
#include <memory>
#include <stdexcept>
#include <thread>

#include "platform/messaging/message_service.h"
#include "tests/platform/messaging/bus_test_support.h"

namespace platform::messaging {
namespace {

// What is kept to the end and beyond it.
template <typename T>
T& immortal(T value) {
    return *new T(std::move(value));
}

std::shared_ptr<MessageService> processClient() {
    return createMessageService("client", {}).get();
}

// Each ends the process normally, static destructors included.

[[noreturn]] void exitWithAnIdleSubscription() {
    const auto client = processClient();
    const auto subscription = subscribe(*client, "/idle", [](const JsonMessage&) {});
    std::exit(0);
}

[[noreturn]] void exitWithARunningHandler() {
    static auto& entered = *new std::latch(1);
    static auto& never = *new std::latch(1);
    const auto client = processClient();
    const auto subscription = subscribe(*client, "/running", [](const JsonMessage&) {
        entered.count_down();
        never.wait();
    });
    publish(*client, "/running", "");
    entered.wait();
    std::exit(0);
}

[[noreturn]] void exitWithHandlersThatGoOnFailing() {
    static auto& begun = *new std::latch(1);
    auto& client = immortal(processClient());
    immortal(subscribe(*client, "/failing", [&client](const JsonMessage&) {
        publish(*client, "/failing", "");
        static const bool first = [] {
            begun.count_down();
            return true;
        }();
        throw std::runtime_error(first ? "again" : "");
    }));
    publish(*client, "/failing", "");
    begun.wait();
    std::exit(0);
}

[[noreturn]] void exitWithAStaticSubscription() {
    static std::shared_ptr<Subscription> subscription;
    const auto client = processClient();
    subscription = subscribe(*client, "/static", [](const JsonMessage&) {});
    publish(*client, "/static", "");
    std::exit(0);
}

[[noreturn]] void exitInAForkedChild() {
    const auto client = processClient();
    const auto subscription = subscribe(*client, "/forked", [](const JsonMessage&) {});
    const pid_t child = fork();
    if (child == 0) {
        std::exit(0);
    }
    int status = -1;
    waitpid(child, &status, 0);
    std::exit(WIFEXITED(status) ? WEXITSTATUS(status) : 1);
}

class ProcessEndDeathTest : public testing::TestWithParam<void (*)()> {};

TEST_P(ProcessEndDeathTest, IsNormal) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(GetParam()(), testing::ExitedWithCode(0), "");
}

INSTANTIATE_TEST_SUITE_P(Cases, ProcessEndDeathTest,
                         testing::Values(&exitWithAnIdleSubscription, &exitWithARunningHandler,
                                         &exitWithHandlersThatGoOnFailing,
                                         &exitWithAStaticSubscription, &exitInAForkedChild));

}  // namespace
}  // namespace platform::messaging
