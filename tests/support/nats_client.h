// SPDX-License-Identifier: Apache-2.0
// An editor as the bundle sees it, in libnats alone: it asks and waits for its own answers.
#pragma once

#include <nats/nats.h>

#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "json/value.h"

namespace test {

/// A client of the bundle over NATS. Belongs to one thread.
class NatsClient {
public:
    /// `servers`: URLs. `name`: its rtcIds are "<name>.<number>". Throws std::runtime_error when no
    /// server can be reached.
    NatsClient(const std::vector<std::string>& servers, const std::string& name);

    NatsClient(const NatsClient&) = delete;
    NatsClient& operator=(const NatsClient&) = delete;
    ~NatsClient();

    /// Sends a request with the members `request` and an "rtcId" of its own, and returns the
    /// answer to it; none when none comes in time.
    std::optional<std::string> read(json::Object request, std::chrono::milliseconds patience);
    std::optional<std::string> write(json::Object request, std::chrono::milliseconds patience);

    /// Publishes `payload` as it is; returns whether it could be sent.
    bool publish(const std::string& channel, std::string_view payload);

    /// What is published on `channel` from now on, to be read with `next`.
    struct Channel;
    std::shared_ptr<Channel> subscribe(const std::string& channel);

    struct Message {
        std::string channel;
        std::string payload;
    };
    static std::optional<Message> next(Channel& channel, std::chrono::milliseconds patience);

    /// Waits until the server has all that was sent.
    void flush();

private:
    std::optional<std::string> ask(const std::string& requests, const std::string& responses,
                                   Channel& answers, json::Object request,
                                   std::chrono::milliseconds patience);

    std::string name_;
    natsConnection* connection_ = nullptr;
    std::shared_ptr<Channel> readAnswers_;
    std::shared_ptr<Channel> writeAnswers_;
    unsigned long asked_ = 0;
};

}  // namespace test
