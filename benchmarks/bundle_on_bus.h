// SPDX-License-Identifier: Apache-2.0
// The loaded bundle on a bus of its own, with a client that waits for its answers.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "framework/bundle_runner.h"
#include "platform/data_buffer.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/in_process_bus.h"
#include "platform/messaging/message_service.h"
#include "tests/support/bundle_on_bus.h"

namespace benchmarks {

using platform::messaging::readRequestChannel;
using platform::messaging::writeRequestChannel;

/// Belongs to one thread. Every message of the bundle but notifications counts as an answer.
class BundleOnBus {
public:
    platform::messaging::InProcessBus& bus() { return bundle_.bus(); }

    /// Sends `request` without waiting for its answer.
    void send(const char* channel, platform::DataBuffer request) {
        bundle_.send(channel, std::move(request));
    }

    /// Waits until `count` answers have come since the last call, and returns the last of them.
    platform::messaging::JsonMessage wait(std::size_t count = 1) {
        std::unique_lock lock(mutex_);
        changed_.wait(lock, [&] { return answers_ >= count; });
        answers_ -= count;
        platform::messaging::JsonMessage last = std::move(*answer_);
        answer_.reset();
        return last;
    }

    /// The answer to a request whose bytes are `request`.
    std::string answer(const char* channel, std::string_view request) {
        send(channel, platform::DataBuffer::copyOf(request));
        const platform::messaging::JsonMessage message = wait();
        bus().waitUntilIdle();
        return std::string(message.payload());
    }

    /// The seconds from sending `request` until its answer has come and been released.
    double time(const char* channel, platform::DataBuffer request) {
        const auto start = std::chrono::steady_clock::now();
        send(channel, std::move(request));
        static_cast<void>(wait());
        const auto end = std::chrono::steady_clock::now();
        bus().waitUntilIdle();
        return std::chrono::duration<double>(end - start).count();
    }

private:
    static platform::messaging::InProcessBusOptions options() {
        platform::messaging::InProcessBusOptions options;
        options.maxQueuedBytes = std::size_t{1} << 32U;
        options.concurrentChannels = {readRequestChannel};
        return options;
    }

    void published(const platform::messaging::JsonMessage& message) {
        if (message.channel() == platform::messaging::notificationChannel) {
            return;
        }
        {
            const std::lock_guard lock(mutex_);
            answer_ = message;
            ++answers_;
        }
        changed_.notify_one();
    }

    std::mutex mutex_;  // guards what follows
    std::condition_variable changed_;
    std::optional<platform::messaging::JsonMessage> answer_;
    std::size_t answers_ = 0;

    test::BundleOnBus<framework::BundleRunner> bundle_{
        [this](const platform::messaging::JsonMessage& message) { published(message); },
        {.bus = options()},
        SERIALIZATION_BUNDLE};
};

}  // namespace benchmarks
