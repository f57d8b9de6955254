// SPDX-License-Identifier: Apache-2.0
#include "host/bus/failed_reads.h"

#include <exception>
#include <new>
#include <optional>
#include <stdexcept>
#include <utility>

#include "json/find_string.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/messaging/channels.h"

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

void answerForWantOfMemory(MessageService& client, const JsonMessage& request) noexcept {
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
        answerForWantOfMemory(client, request);
        throw;
    } catch (const std::runtime_error& error) {
        if (error.what() == outOfMemory) {
            answerForWantOfMemory(client, request);
        }
        throw;
    }
}

class AnsweringClient final : public MessageService {
public:
    explicit AnsweringClient(std::shared_ptr<MessageService> client) : client_(std::move(client)) {}

    futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string& channel,
                                                             MessageHandler handler) override {
        if (channel != platform::messaging::readRequestChannel) {
            return client_->subscribe(channel, std::move(handler));
        }
        return client_->subscribe(
            channel, [client = client_, handler = std::move(handler)](const JsonMessage& request) {
                handleRead(*client, handler, request);
            });
    }

    futures::Future<void> publish(const std::string& channel, DataBuffer payload) override {
        futures::Promise<void> promise;
        try {
            client_->publish(channel, std::move(payload)).get();
            promise.setValue();
        } catch (const std::exception& error) {
            if (channel.starts_with(platform::messaging::readResponsePrefix)) {
                publishFailure(*client_, channel, error.what());
            }
            promise.setException(std::current_exception());
        }
        return promise.getFuture();
    }

    std::size_t maxPayload(const std::string& channel) const override {
        return client_->maxPayload(channel);
    }

    void awaitMemory(std::size_t bytes) override { client_->awaitMemory(bytes); }

private:
    const std::shared_ptr<MessageService> client_;
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
