// SPDX-License-Identifier: Apache-2.0
// A client of the message service for a bundle that serves others: what it may open, whether it
// takes requests at all, and which of them it had to refuse.
#pragma once

#include <filesystem>
#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "host/metrics/request_metrics.h"
#include "platform/messaging/message_service.h"

namespace host {

/// The last failure of a client's subscriptions. Belongs to one thread at a time.
class SubscriptionFailure {
public:
    void set(const std::string& reason) { reason_ = reason; }

    /// Throws std::runtime_error with the reason if there was a failure.
    void check() const {
        if (!reason_.empty()) {
            throw std::runtime_error("the bundle gets no requests: " + reason_);
        }
    }

private:
    std::string reason_;
};

struct ServingOptions {
    /// The folders outside which documents cannot be opened; empty: there is no such limit.
    std::vector<std::filesystem::path> roots;

    /// Called once on each thread that handles messages, before its first message.
    std::function<void()> prepareThread;

    /// Set when the client may not subscribe, which the bundle does not report.
    std::shared_ptr<SubscriptionFailure> subscriptionFailure =
        std::make_shared<SubscriptionFailure>();

    /// Where requests are counted.
    std::shared_ptr<RequestMetrics> metrics = std::make_shared<RequestMetrics>();
};

/// A client that does what `client` does and what `options` says. When a request for a path outside
/// the roots fails, the log has a warning: to its client, the answer looks like that for a missing
/// file.
std::shared_ptr<platform::messaging::MessageService> servingClient(
    std::shared_ptr<platform::messaging::MessageService> client, ServingOptions options);

}  // namespace host
