// SPDX-License-Identifier: Apache-2.0
// The loaded bundle on a bus of its own, with a client that sends requests and waits for answers.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "framework/bundle_runner.h"
#include "platform/data_buffer.h"
#include "platform/messaging/in_process_bus.h"
#include "platform/messaging/message_service.h"
#include "platform/messaging/transport.h"

namespace benchmarks {

inline constexpr const char* readRequests = "/zpr/service/readRequest_cpp";
inline constexpr const char* writeRequests = "/zpr/service/writeRequest_cpp";

/// Belongs to one thread. Every message of the bundle but notifications is taken for an answer.
class BundleOnBus {
public:
    BundleOnBus() {
        using namespace platform::messaging;
        InProcessBusOptions options;
        options.maxQueuedBytes = std::size_t{1} << 32U;
        options.concurrentChannels = {readRequests};
        bus_ = InProcessBus::create(std::move(options));
        setTransport([bus = bus_](const std::string& clientName, const MessageServiceOptions&) {
            return bus->connect(clientName);
        });
        client_ = bus_->connect("benchmark").get();
        observation_ = bus_->observe([this](std::string_view sender, const JsonMessage& message) {
            if (sender != "benchmark" && message.channel() != notifications) {
                answered(message);
            }
        });
        runner_ = std::make_unique<framework::BundleRunner>(SERIALIZATION_BUNDLE);
    }

    platform::messaging::InProcessBus& bus() { return *bus_; }

    /// Sends `request` without waiting for its answer.
    void send(const char* channel, platform::DataBuffer request) {
        client_->publish(channel, std::move(request)).get();
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
        bus_->waitUntilIdle();
        return std::string(message.payload());
    }

    /// The seconds from sending `request` until its answer has come and been released.
    double time(const char* channel, platform::DataBuffer request) {
        const auto start = std::chrono::steady_clock::now();
        send(channel, std::move(request));
        static_cast<void>(wait());
        const auto end = std::chrono::steady_clock::now();
        bus_->waitUntilIdle();
        return std::chrono::duration<double>(end - start).count();
    }

private:
    static constexpr const char* notifications = "/zpr/service/notifyFileSystemRequest";

    void answered(const platform::messaging::JsonMessage& message) {
        {
            const std::lock_guard lock(mutex_);
            answer_ = message;
            ++answers_;
        }
        changed_.notify_one();
    }

    std::shared_ptr<platform::messaging::InProcessBus> bus_;
    std::shared_ptr<platform::messaging::MessageService> client_;
    std::mutex mutex_;  // guards what follows
    std::condition_variable changed_;
    std::optional<platform::messaging::JsonMessage> answer_;
    std::size_t answers_ = 0;

    std::shared_ptr<platform::messaging::Subscription> observation_;
    std::unique_ptr<framework::BundleRunner> runner_;
};

}  // namespace benchmarks
