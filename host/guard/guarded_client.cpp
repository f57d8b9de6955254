// SPDX-License-Identifier: Apache-2.0
#include "host/guard/guarded_client.h"

#include <cstddef>
#include <exception>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "host/bus/forwarding_client.h"
#include "host/bus/publications.h"
#include "json/parser.h"
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

JsonMessage withPayload(const JsonMessage& message, std::string payload) {
    const auto owner = std::make_shared<const std::string>(std::move(payload));
    return {std::make_shared<const std::string>(message.channel()), std::string_view(*owner),
            owner};
}

// Throws BundleFailure.
BundleAnswer ask(const MessageHandler& bundle, const JsonMessage& message) {
    std::vector<Publication> publications;
    try {
        publications = publicationsOf([&] { bundle(message); });
        if (publications.empty()) {
            throw std::runtime_error("the bundle gave no answer");
        }
    } catch (...) {
        throw BundleFailure{std::current_exception()};
    }
    BundleAnswer answer;
    for (const auto& [channel, payload] : publications) {
        if (channel == platform::messaging::notificationChannel) {
            answer.existed = json::parse(payload.view())["isExistingFile"] == json::Value(true);
        } else {
            answer.isWritten = payload.view() == "true";
        }
    }
    return answer;
}

void publishResult(MessageService& client, const WriteRequest& request, const SaveResult& result) {
    json::Object notification{{"filePath", request.filePath}, {"isExistingFile", result.existed}};
    client.publish(platform::messaging::notificationChannel,
                   DataBuffer::copyOf(json::serialize(std::move(notification))));
    if (!result.version.empty()) {
        json::Object version{{"status", true}, {"version", result.version}};
        client.publish(platform::messaging::filesResponsePrefix + request.rtcId,
                       DataBuffer::copyOf(json::serialize(std::move(version))));
    }
    client.publish(platform::messaging::writeResponsePrefix + request.rtcId,
                   DataBuffer::copyOf(result.isSaved ? "true" : "false"));
}

class GuardedClient final : public ForwardingClient {
public:
    GuardedClient(std::shared_ptr<MessageService> client, Guard guard)
        : ForwardingClient(std::move(client)), guard_(std::move(guard)) {}
    GuardedClient(const GuardedClient&) = delete;
    GuardedClient& operator=(const GuardedClient&) = delete;

    // The bundle owns its client, and the code of its handler is unloaded with it.
    ~GuardedClient() override { *guard_.read = nullptr; }

    futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string& channel,
                                                             MessageHandler handler) override {
        if (channel == platform::messaging::readRequestChannel) {
            *guard_.read = handler;
        }
        if (channel != platform::messaging::writeRequestChannel) {
            return next()->subscribe(channel, std::move(handler));
        }
        return next()->subscribe(
            channel,
            [client = next(), saves = guard_.saves, bundle = std::move(handler)](
                const JsonMessage& message) { handleWrite(*client, *saves, bundle, message); });
    }

    futures::Future<void> publish(const std::string& channel, DataBuffer payload) override {
        return keepBack(channel, payload) ? platform::messaging::resolved([] {})
                                          : next()->publish(channel, std::move(payload));
    }

    std::size_t maxPayload(const std::string& channel) const override {
        return longestKeptBack().value_or(next()->maxPayload(channel));
    }

private:
    static void handleWrite(MessageService& client, Saves& saves, const MessageHandler& bundle,
                            const JsonMessage& message) {
        const std::optional<WriteRequest> request = readWriteRequest(message.payload());
        if (!request) {
            bundle(message);
            return;
        }
        const AskBundle askBundle = [&](const std::string& otherPath) {
            if (otherPath.empty()) {
                return ask(bundle, message);
            }
            // The request is this client's alone: the bundle is the one subscriber of the channel.
            const PathOverwrite overwrite(request->filePathText, otherPath);
            return ask(bundle,
                       overwrite.isDone()
                           ? message
                           : withPayload(message, withFilePath(message.payload(), otherPath)));
        };
        try {
            publishResult(client, *request, saves.save(*request, askBundle, [&](std::size_t bytes) {
                client.awaitMemory(bytes);
            }));
        } catch (const BundleFailure& failure) {
            std::rethrow_exception(failure.exception);
        }
    }

    const Guard guard_;
};

}  // namespace

std::shared_ptr<MessageService> savingSafely(std::shared_ptr<MessageService> client, Guard guard) {
    return std::make_shared<GuardedClient>(std::move(client), std::move(guard));
}

}  // namespace host
