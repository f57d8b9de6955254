// SPDX-License-Identifier: Apache-2.0
// Delivery threads whose source fails.
#include "platform/messaging/delivery_threads.h"

#include <gtest/gtest.h>

#include <condition_variable>
#include <memory>
#include <mutex>
#include <new>
#include <optional>
#include <string>

#include "platform/data_buffer.h"
#include "tests/platform/messaging/bus_test_support.h"

namespace platform::messaging {
namespace {

// Has no memory for its first message, gives a second one, and then waits for its end.
class FailingSource final : public MessageSource {
public:
    std::optional<QueuedMessage> next() override {
        std::unique_lock lock(mutex_);
        switch (calls_++) {
            case 0:
                throw std::bad_alloc();
            case 1:
                return QueuedMessage{
                    {std::make_shared<const std::string>("channel"),
                     std::make_shared<const DataBuffer>(DataBuffer::copyOf("second"))},
                    nullptr,
                    nullptr};
            default:
                ended_.wait(lock, [this] { return hasEnded_; });
                return std::nullopt;
        }
    }

    void end() override {
        const std::lock_guard lock(mutex_);
        hasEnded_ = true;
        ended_.notify_all();
    }

private:
    std::mutex mutex_;  // guards what follows
    std::condition_variable ended_;
    int calls_ = 0;
    bool hasEnded_ = false;
};

TEST(DeliveryThreads, GoOnAfterAMessageThatTheirSourceCouldNotGive) {
    std::string delivered;
    {
        std::mutex mutex;
        std::condition_variable changed;
        DeliveryThreads threads(
            [&](const JsonMessage& message) {
                const std::lock_guard lock(mutex);
                delivered = message.payload();
                changed.notify_all();
            },
            std::make_shared<FailingSource>(), 1);
        std::unique_lock lock(mutex);
        changed.wait(lock, [&] { return !delivered.empty(); });
        lock.unlock();
        threads.close();
    }
    EXPECT_EQ(delivered, "second");
}

}  // namespace
}  // namespace platform::messaging
