// SPDX-License-Identifier: Apache-2.0
// The real bundle, loaded from its library and started on a bus of its own, with a client beside
// it.
#pragma once

#include <spdlog/logger.h>
#include <spdlog/sinks/ringbuffer_sink.h>
#include <spdlog/spdlog.h>

#include <cstddef>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "framework/bundle_runner.h"
#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/messaging/in_process_bus.h"
#include "platform/messaging/message_service.h"
#include "platform/messaging/transport.h"

namespace test {

inline constexpr const char* kReadRequests = "/zpr/service/readRequest_cpp";
inline constexpr const char* kWriteRequests = "/zpr/service/writeRequest_cpp";
inline constexpr const char* kReadResponses = "/zpr/service/readResponse/";
inline constexpr const char* kWriteResponses = "/zpr/service/writeResponse/";
inline constexpr const char* kNotifications = "/zpr/service/notifyFileSystemRequest";

/// A message that the bundle published.
struct Message {
    std::string channel;
    std::string payload;
    bool operator==(const Message&) const = default;
};

inline void PrintTo(const Message& message, std::ostream* out) {
    *out << message.channel << ' ' << message.payload;
}

/// What the message bus of this process has logged since the last call: one text for each request
/// whose handler failed.
inline std::vector<std::string> takeBusLog() {
    static const auto sink = [] {
        auto ring = std::make_shared<spdlog::sinks::ringbuffer_sink_mt>(100'000);
        auto logger = std::make_shared<spdlog::logger>("messaging", ring);
        logger->set_pattern("%v");
        // The bus takes a logger of this name that is there when it first has something to tell.
        spdlog::register_logger(std::move(logger));
        return ring;
    }();
    static std::size_t taken = 0;
    std::vector<std::string> lines = sink->last_formatted();
    lines.erase(lines.begin(), lines.begin() + static_cast<std::ptrdiff_t>(taken));
    taken += lines.size();
    return lines;
}

class RunningBundle {
public:
    RunningBundle() {
        takeBusLog();
        using namespace platform::messaging;
        setTransport([bus = bus_](const std::string& clientName, const MessageServiceOptions&) {
            return bus->connect(clientName);
        });
        runner_ = std::make_unique<framework::BundleRunner>(SERIALIZATION_BUNDLE);
        client_ = bus_->connect("client").get();
        observation_ = bus_->observe([this](std::string_view from, const JsonMessage& message) {
            if (from == "EditorSerialization") {
                const std::lock_guard lock(mutex_);
                published_.push_back(
                    {std::string(message.channel()), std::string(message.payload())});
            }
        });
    }

    /// Sends `payload` and returns all that the bundle publishes until it has come to rest, in
    /// order.
    std::vector<Message> send(const std::string& channel, std::string_view payload) {
        client_->publish(channel, platform::DataBuffer::copyOf(payload)).get();
        bus_->waitUntilIdle();
        return published();
    }

    /// What the bundle has published since the last call, in order.
    std::vector<Message> published() {
        const std::lock_guard lock(mutex_);
        return std::exchange(published_, {});
    }

    std::vector<Message> read(const std::string& path, const std::string& contentType,
                              const std::string& rtcId = "1") {
        return send(kReadRequests, request(path, contentType, rtcId));
    }

    static std::string request(const std::string& path, const std::string& contentType,
                               const std::string& rtcId) {
        json::Object request;
        request["rtcId"] = rtcId;
        request["contentType"] = contentType;
        request["filePath"] = path;
        return json::serialize(json::Value(std::move(request)));
    }

    platform::messaging::InProcessBus& bus() { return *bus_; }
    framework::BundleRunner& runner() { return *runner_; }

private:
    std::shared_ptr<platform::messaging::InProcessBus> bus_ =
        platform::messaging::InProcessBus::create();
    std::mutex mutex_;
    std::vector<Message> published_;  // guarded by mutex_
    std::shared_ptr<platform::messaging::MessageService> client_;
    std::shared_ptr<platform::messaging::Subscription> observation_;
    std::unique_ptr<framework::BundleRunner> runner_;
};

}  // namespace test
