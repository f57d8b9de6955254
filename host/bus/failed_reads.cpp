// SPDX-License-Identifier: Apache-2.0
#include "host/bus/failed_reads.h"

#include <exception>
#include <new>
#include <optional>
#include <stdexcept>
#include <utility>

#include "host/bus/forwarding_client.h"
#include "json/find_string.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/resolved.h"

namespace host {

namespace {

using platform::DataBuffer;
using platform::messaging::JsonMessage;
using platform::messaging::MessageHandler;
using platform::messaging::MessageService;
using platform::messaging::Subscription;

// The text of what a DataBuffer throws, and thus the bundle.
constexpr std::string_view outOfMemory = "Out of memory!";

void publishFailure(MessageService& client, const std::string& channel, const std::string& reason) {
    const json::Object answer{{"exception", reason}, {"status", false}};
    client.publish(channel, DataBuffer::copyOf(json::serialize(answer)));
}

void answerOutOfMemory(MessageService& client, const JsonMessage& request) noexcept {
    try {
        answerFailedRead(client, request.payload(), std::string(outOfMemory));
    } catch (const std::exception&) {
        // There is not even memory for this. The handler's caller logs the failure itself.
    }
}

// Calls `handler`, and answers `request` when there is not enough memory for it.
void handleRead(MessageService& client, const MessageHandler& handler, const JsonMessage& request) {
    try {
        handler(request);
    } catch (const std::bad_alloc&) {
        answerOutOfMemory(client, request);
        throw;
    } catch (const std::runtime_error& error) {
        if (error.what() == outOfMemory) {
            answerOutOfMemory(client, request);
        }
        throw;
    }
}

class AnsweringClient final : public ForwardingClient {
public:
    using ForwardingClient::ForwardingClient;

    futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string& channel,
                                                             MessageHandler handler) override {
        if (channel != platform::messaging::readRequestChannel) {
            return next()->subscribe(channel, std::move(handler));
        }
        return next()->subscribe(
            channel, [client = next(), handler = std::move(handler)](const JsonMessage& request) {
                handleRead(*client, handler, request);
            });
    }

    futures::Future<void> publish(const std::string& channel, DataBuffer payload) override {
        return platform::messaging::resolved([&] {
            try {
                next()->publish(channel, std::move(payload)).get();
            } catch (const std::exception& error) {
                if (channel.starts_with(platform::messaging::readResponsePrefix)) {
                    publishFailure(*next(), channel, error.what());
                }
                throw;
            }
        });
    }
};

}  // namespace

void answerFailedRead(MessageService& client, std::string_view request, const std::string& reason) {
    if (const std::optional<std::string> rtcId = json::findString(request, "rtcId")) {
        publishFailure(client, platform::messaging::readResponsePrefix + *rtcId, reason);
    }
}

std::shared_ptr<MessageService> answeringFailedReads(std::shared_ptr<MessageService> client) {
    return std::make_shared<AnsweringClient>(std::move(client));
}

}  // namespace host
