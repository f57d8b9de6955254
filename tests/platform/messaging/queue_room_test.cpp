// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <atomic>
#include <cstddef>
#include <future>
#include <limits>
#include <memory>
#include <string>

#include "platform/messaging/in_process_bus.h"

namespace platform::messaging {
namespace {

constexpr std::size_t any = std::numeric_limits<std::size_t>::max();
constexpr std::size_t messageCount = 200;

// A bus with messages for one handler, which begins with them when the gate opens.
class QueueRoom : public ::testing::Test {
protected:
    void publish(const std::string& payload) {
        for (std::size_t i = 0; i < messageCount; ++i) {
            client_->publish("/channel", DataBuffer::copyOf(payload)).get();
        }
    }

    std::promise<void> gate_;
    std::atomic<std::size_t> begun_ = 0;
    std::shared_ptr<InProcessBus> bus_ = InProcessBus::create();
    std::shared_ptr<MessageService> client_ = bus_->connect("client").get();
    std::shared_ptr<Subscription> subscription_ =
        client_
            ->subscribe("/channel",
                        [this, open = gate_.get_future().share()](const JsonMessage&) {
                            ++begun_;
                            open.wait();
                        })
            .get();
};

TEST_F(QueueRoom, IsThereAtOnceOnAnEmptyBus) {
    bus_->waitUntilQueuedAtMost(0, 0);
    gate_.set_value();
}

TEST_F(QueueRoom, IsWaitedForInBytes) {
    publish("12345");
    EXPECT_GE(bus_->queuedBytes(), 5 * (messageCount - 1));
    gate_.set_value();
    bus_->waitUntilQueuedAtMost(any, 10);
    EXPECT_LE(bus_->queuedBytes(), 10U);
}

TEST_F(QueueRoom, IsWaitedForInMessagesThatHaveNoBytes) {
    publish("");
    EXPECT_LE(begun_, 1U);
    gate_.set_value();
    bus_->waitUntilQueuedAtMost(0, any);
    // The last one has left the queue, and its handler may be about to begin.
    EXPECT_GE(begun_, messageCount - 1);
}

}  // namespace
}  // namespace platform::messaging
