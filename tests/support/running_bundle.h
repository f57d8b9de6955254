// SPDX-License-Identifier: Apache-2.0
// The real bundle, loaded from its library and started on a bus of its own; what it publishes and
// what the bus logs.
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
#include "json/serialize.h"
#include "json/value.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/message_service.h"
#include "tests/support/bundle_on_bus.h"
#include "tests/support/message.h"

namespace test {

using platform::messaging::notificationChannel;
using platform::messaging::readRequestChannel;
using platform::messaging::readResponsePrefix;
using platform::messaging::writeRequestChannel;
using platform::messaging::writeResponsePrefix;

/// What the message bus of this process has logged since the last call: one text for each request
/// whose handler failed.
inline std::vector<std::string> takeBusLog() {
    static const auto sink = [] {
        auto ring = std::make_shared<spdlog::sinks::ringbuffer_sink_mt>(100'000);
        auto logger = std::make_shared<spdlog::logger>("messaging", ring);
        logger->set_pattern("%v");
        // The bus takes a logger of this name that exists when it logs for the first time.
        spdlog::register_logger(std::move(logger));
        return ring;
    }();
    static std::size_t taken = 0;
    std::vector<std::string> lines = sink->last_formatted();
    lines.erase(lines.begin(), lines.begin() + static_cast<std::ptrdiff_t>(taken));
    taken += lines.size();
    return lines;
}

/// The bundle from its library, which notes what it publishes.
class RunningBundle {
public:
    /// Sends `payload` and returns all that the bundle publishes until it is idle, in
    /// order.
    std::vector<Message> send(const std::string& channel, std::string_view payload) {
        bundle_.sendAndWait(channel, payload);
        return published();
    }

    /// What the bundle has published since the last call, in order.
    std::vector<Message> published() {
        const std::lock_guard lock(mutex_);
        return std::exchange(published_, {});
    }

    std::vector<Message> read(const std::string& path, const std::string& contentType,
                              const std::string& rtcId = "1") {
        return send(readRequestChannel, request(path, contentType, rtcId));
    }

    static std::string request(const std::string& path, const std::string& contentType,
                               const std::string& rtcId) {
        json::Object request;
        request["rtcId"] = rtcId;
        request["contentType"] = contentType;
        request["filePath"] = path;
        return json::serialize(json::Value(std::move(request)));
    }

    platform::messaging::InProcessBus& bus() { return bundle_.bus(); }

private:
    const std::vector<std::string> oldLog_ = takeBusLog();  // before the bus logs anything
    std::mutex mutex_;
    std::vector<Message> published_;  // guarded by mutex_
    BundleOnBus<framework::BundleRunner> bundle_{
        [this](const platform::messaging::JsonMessage& message) {
            const std::lock_guard lock(mutex_);
            published_.push_back({std::string(message.channel()), std::string(message.payload())});
        },
        {},
        SERIALIZATION_BUNDLE};
};

}  // namespace test
