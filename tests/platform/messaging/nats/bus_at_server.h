// SPDX-License-Identifier: Apache-2.0
// What the tests of the NATS bus share.
#pragma once

#include <spdlog/logger.h>
#include <spdlog/sinks/base_sink.h>
#include <spdlog/spdlog.h>

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <exception>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "platform/messaging/message_service.h"
#include "platform/messaging/nats/nats_bus.h"
#include "tests/platform/messaging/bus_test_support.h"
#include "tests/support/nats_server.h"
#include "tests/support/wait_until.h"

namespace platform::messaging {

using test::longestWait;
using test::waitUntil;

/// A list that one thread fills while another waits for what is to come.
template <typename T>
class Inbox {
public:
    void add(T item) {
        {
            const std::lock_guard lock(mutex_);
            items_.push_back(std::move(item));
        }
        changed_.notify_all();
    }

    /// Waits until there are `count`; returns all that there are, fewer when it takes too long.
    std::vector<T> waitFor(std::size_t count, std::chrono::milliseconds patience = longestWait) {
        std::unique_lock lock(mutex_);
        changed_.wait_for(lock, patience, [&] { return items_.size() >= count; });
        return items_;
    }

    /// Waits until one satisfies `condition`; returns whether one does.
    bool waitUntilAny(const std::function<bool(const T&)>& condition) {
        std::unique_lock lock(mutex_);
        return changed_.wait_for(lock, longestWait, [&] {
            return std::any_of(items_.begin(), items_.end(), condition);
        });
    }

    std::vector<T> items() {
        const std::lock_guard lock(mutex_);
        return items_;
    }

    void clear() {
        const std::lock_guard lock(mutex_);
        items_.clear();
    }

private:
    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<T> items_;
};

/// What the messaging library of this process logs.
class BusLog {
public:
    /// The log, which is empty when a test begins with this call.
    static BusLog& start() {
        static BusLog& log = *new BusLog();
        log.lines_.clear();
        return log;
    }

    bool waitFor(const std::string& text) {
        return lines_.waitUntilAny(
            [&](const std::string& line) { return line.find(text) != std::string::npos; });
    }

    std::vector<std::string> lines() { return lines_.items(); }

    /// How many lines have `text`.
    long count(const std::string& text) {
        const std::vector<std::string> all = lines();
        return std::count_if(all.begin(), all.end(), [&](const std::string& line) {
            return line.find(text) != std::string::npos;
        });
    }

private:
    class Sink final : public spdlog::sinks::base_sink<std::mutex> {
    public:
        explicit Sink(Inbox<std::string>& lines) : lines_(lines) {}

    private:
        void sink_it_(const spdlog::details::log_msg& message) override {
            lines_.add(std::string(message.payload.data(), message.payload.size()));
        }
        void flush_() override {}

        Inbox<std::string>& lines_;
    };

    BusLog() {
        auto logger = std::make_shared<spdlog::logger>("messaging", std::make_shared<Sink>(lines_));
        // The library takes a logger of this name that exists when it logs for the first time.
        spdlog::register_logger(std::move(logger));
    }

    Inbox<std::string> lines_;
};

// From the beginning, since the first line that is logged decides for good where all go.
inline const BusLog& busLog = BusLog::start();

inline NatsOptions optionsFor(const test::NatsServer& server) {
    NatsOptions options;
    options.servers = {server.url()};
    return options;
}

/// A bus with one client.
struct BusAtServer {
    explicit BusAtServer(const NatsOptions& options, const std::string& name = "client")
        : bus(NatsBus::create(options)), client(bus->connect(name).get()) {}
    explicit BusAtServer(const test::NatsServer& server) : BusAtServer(optionsFor(server)) {}

    std::shared_ptr<Subscription> subscribe(const std::string& channel, MessageHandler handler) {
        return messaging::subscribe(*client, channel, std::move(handler));
    }
    std::shared_ptr<Subscription> collect(const std::string& channel, Inbox<std::string>& texts) {
        return subscribe(channel, [&texts](const JsonMessage& m) { texts.add(textOf(m)); });
    }
    void publish(const std::string& channel, std::string_view text) {
        messaging::publish(*client, channel, text);
    }

    std::shared_ptr<NatsBus> bus;
    std::shared_ptr<MessageService> client;
};

/// The text of the exception that `operation` throws; empty when it throws none.
inline std::string failureOf(const std::function<void()>& operation) {
    try {
        operation();
    } catch (const std::exception& error) {
        return error.what();
    }
    return "";
}

}  // namespace platform::messaging
