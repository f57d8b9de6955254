// SPDX-License-Identifier: Apache-2.0
#include "host/bus/unsent_answers.h"

#include <exception>
#include <string>
#include <utility>

#include "json/serialize.h"
#include "json/value.h"
#include "platform/messaging/channels.h"

namespace host {

namespace {

using platform::DataBuffer;
using platform::messaging::MessageHandler;
using platform::messaging::MessageService;
using platform::messaging::Subscription;

class TellingClient final : public MessageService {
public:
    explicit TellingClient(std::shared_ptr<MessageService> client) : client_(std::move(client)) {}

    futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string& channel,
                                                             MessageHandler handler) override {
        return client_->subscribe(channel, std::move(handler));
    }

    futures::Future<void> publish(const std::string& channel, DataBuffer payload) override {
        futures::Promise<void> promise;
        try {
            client_->publish(channel, std::move(payload)).get();
            promise.setValue();
        } catch (const std::exception& error) {
            if (channel.starts_with(platform::messaging::readResponsePrefix)) {
                json::Object answer{{"exception", error.what()}, {"status", false}};
                client_->publish(channel, DataBuffer::copyOf(json::serialize(std::move(answer))));
            }
            promise.setException(std::current_exception());
        }
        return promise.getFuture();
    }

    std::size_t maxPayload(const std::string& channel) const override {
        return client_->maxPayload(channel);
    }

private:
    const std::shared_ptr<MessageService> client_;
};

}  // namespace

std::shared_ptr<MessageService> tellingWhatIsNotSent(std::shared_ptr<MessageService> client) {
    return std::make_shared<TellingClient>(std::move(client));
}

}  // namespace host
