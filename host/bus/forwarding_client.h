// SPDX-License-Identifier: Apache-2.0
// The base of clients that stand between the bundle and its message service.
#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <utility>

#include "platform/messaging/message_service.h"

namespace host {

/// A client that does what the client below it does, `next()`. Each derived class overrides what it
/// does otherwise.
class ForwardingClient : public platform::messaging::MessageService {
public:
    explicit ForwardingClient(std::shared_ptr<platform::messaging::MessageService> next)
        : next_(std::move(next)) {}

    futures::Future<std::shared_ptr<platform::messaging::Subscription>> subscribe(
        const std::string& channel, platform::messaging::MessageHandler handler) override {
        return next_->subscribe(channel, std::move(handler));
    }

    futures::Future<void> publish(const std::string& channel,
                                  platform::DataBuffer payload) override {
        return next_->publish(channel, std::move(payload));
    }

    std::size_t maxPayload(const std::string& channel) const override {
        return next_->maxPayload(channel);
    }

    void awaitMemory(std::size_t bytes) override { next_->awaitMemory(bytes); }

protected:
    const std::shared_ptr<platform::messaging::MessageService>& next() const { return next_; }

private:
    const std::shared_ptr<platform::messaging::MessageService> next_;
};

}  // namespace host
