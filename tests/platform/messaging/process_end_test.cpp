// SPDX-License-Identifier: Apache-2.0
// How a process ends that has used the bus: normally, whatever is still subscribed.

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstddef>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <latch>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>

#include "platform/messaging/message_service.h"
#include "tests/platform/messaging/bus_test_support.h"

namespace platform::messaging {
namespace {

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
    struct Kept {  // to the end and beyond it
        std::shared_ptr<MessageService> client = processClient();
        std::shared_ptr<Subscription> subscription;
        std::latch failures{3};
    };
    static Kept& kept = *new Kept();
    kept.subscription = subscribe(*kept.client, "/failing", [](const JsonMessage& message) {
        publish(*kept.client, "/failing", "");
        if (!kept.failures.try_wait()) {
            kept.failures.count_down();
        }
        throw std::runtime_error("on and on at " + std::string(message.channel()));
    });
    publish(*kept.client, "/failing", "");
    kept.failures.wait();
    std::exit(0);
}

[[noreturn]] void exitWithAStaticSubscription() {
    static std::shared_ptr<Subscription> subscription;
    const auto client = processClient();
    subscription = subscribe(*client, "/static", [](const JsonMessage&) {});
    publish(*client, "/static", "");
    std::exit(0);
}

// Whether the thread `id` of this process waits for something.
bool isWaiting(const std::string& id) {
    std::ifstream file("/proc/self/task/" + id + "/stat");
    const std::string status(std::istreambuf_iterator<char>(file), {});
    const std::size_t name = status.rfind(") ");  // the state follows it
    return name != std::string::npos && status.compare(name + 2, 1, "S") == 0;
}

// To be called before a fork, so that no thread is in malloc: a lock that the address sanitizer
// holds there would stay locked in the child.
void waitUntilTheOtherThreadsWait() {
    const std::string self = std::to_string(::getpid());
    for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
        const std::string id = task.path().filename();
        while (id != self && !isWaiting(id)) {
            std::this_thread::yield();
        }
    }
}

[[noreturn]] void exitInAForkedChild() {
    const auto client = processClient();
    const auto subscription = subscribe(*client, "/forked", [](const JsonMessage&) {});
    waitUntilTheOtherThreadsWait();
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
