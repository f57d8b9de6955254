// SPDX-License-Identifier: Apache-2.0
// What the clients between the bundle and its message service leave to the one below them.
#include "host/bus/forwarding_client.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <functional>
#include <memory>
#include <string>
#include <utility>

#include "host/bus/failed_reads.h"
#include "host/bus/serving_client.h"
#include "host/guard/guarded_client.h"
#include "platform/messaging/resolved.h"

namespace host {
namespace {

using platform::DataBuffer;
using platform::messaging::MessageHandler;
using platform::messaging::MessageService;
using platform::messaging::resolved;
using platform::messaging::Subscription;

class RecordingService final : public MessageService {
public:
    futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string& channel,
                                                             MessageHandler) override {
        subscribed = channel;
        return resolved([] { return std::shared_ptr<Subscription>(); });
    }

    futures::Future<void> publish(const std::string& channel, DataBuffer payload) override {
        published = channel + " " + std::string(payload.view());
        return resolved([] {});
    }

    std::size_t maxPayload(const std::string& channel) const override { return channel.size(); }

    void awaitMemory(std::size_t bytes) override { awaited = bytes; }

    std::string subscribed;
    std::string published;
    std::size_t awaited = 0;
};

using Wrap = std::function<std::shared_ptr<MessageService>(std::shared_ptr<MessageService>)>;

class ForwardingClients : public ::testing::TestWithParam<Wrap> {
protected:
    const std::shared_ptr<RecordingService> service_ = std::make_shared<RecordingService>();
    const std::shared_ptr<MessageService> client_ = GetParam()(service_);
};

TEST_P(ForwardingClients, ForwardOtherSubscriptionsAndMessages) {
    client_->subscribe("/other", {}).get();
    EXPECT_EQ(service_->subscribed, "/other");
    client_->publish("/any", DataBuffer::copyOf("text")).get();
    EXPECT_EQ(service_->published, "/any text");
}

TEST_P(ForwardingClients, HaveTheLongestPayloadOfTheOneBelow) {
    EXPECT_EQ(client_->maxPayload("/five"), 5U);
}

TEST_P(ForwardingClients, AskTheOneBelowForMemory) {
    client_->awaitMemory(7);
    EXPECT_EQ(service_->awaited, 7U);
}

INSTANTIATE_TEST_SUITE_P(
    All, ForwardingClients,
    ::testing::Values(
        [](std::shared_ptr<MessageService> service) -> std::shared_ptr<MessageService> {
            return std::make_shared<ForwardingClient>(std::move(service));
        },
        [](std::shared_ptr<MessageService> service) {
            return answeringFailedReads(std::move(service));
        },
        [](std::shared_ptr<MessageService> service) {
            return servingClient(std::move(service), ServingOptions());
        },
        [](std::shared_ptr<MessageService> service) {
            return savingSafely(std::move(service), Guard());
        }));

}  // namespace
}  // namespace host
