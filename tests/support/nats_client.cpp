// SPDX-License-Identifier: Apache-2.0
#include "tests/support/nats_client.h"

#include <algorithm>
#include <cstdint>
#include <stdexcept>
#include <utility>

#include "json/serialize.h"
#include "platform/messaging/channels.h"

namespace test {
namespace {

using platform::messaging::readRequestChannel;
using platform::messaging::readResponsePrefix;
using platform::messaging::writeRequestChannel;
using platform::messaging::writeResponsePrefix;
using Clock = std::chrono::steady_clock;

void check(natsStatus status) {
    if (status != NATS_OK) {
        throw std::runtime_error(std::string("libnats: ") + natsStatus_GetText(status));
    }
}

}  // namespace

struct NatsClient::Channel {
    Channel(natsConnection* connection, const std::string& name) {
        check(natsConnection_SubscribeSync(&subscription, connection, name.c_str()));
        check(natsSubscription_SetPendingLimits(subscription, -1, -1));
    }
    Channel(const Channel&) = delete;
    Channel& operator=(const Channel&) = delete;
    ~Channel() { natsSubscription_Destroy(subscription); }

    natsSubscription* subscription = nullptr;
};

NatsClient::NatsClient(const std::vector<std::string>& servers, const std::string& name)
    : name_(name) {
    std::vector<const char*> urls;
    for (const std::string& server : servers) {
        urls.push_back(server.c_str());
    }
    natsOptions* created = nullptr;
    check(natsOptions_Create(&created));
    const std::unique_ptr<natsOptions, decltype(&natsOptions_Destroy)> options(created,
                                                                               natsOptions_Destroy);
    check(natsOptions_SetServers(created, urls.data(), static_cast<int>(urls.size())));
    check(natsOptions_SetMaxReconnect(created, -1));
    check(natsOptions_SetReconnectWait(created, 50));
    check(natsOptions_SetSendAsap(created, true));
    check(natsConnection_Connect(&connection_, created));
    readAnswers_ = subscribe(readResponsePrefix + name_ + ".*");
    writeAnswers_ = subscribe(writeResponsePrefix + name_ + ".*");
}

NatsClient::~NatsClient() {
    readAnswers_.reset();
    writeAnswers_.reset();
    natsConnection_Destroy(connection_);
}

std::optional<std::string> NatsClient::read(json::Object request,
                                            std::chrono::milliseconds patience) {
    return ask(readRequestChannel, readResponsePrefix, *readAnswers_, std::move(request), patience);
}

std::optional<std::string> NatsClient::write(json::Object request,
                                             std::chrono::milliseconds patience) {
    return ask(writeRequestChannel, writeResponsePrefix, *writeAnswers_, std::move(request),
               patience);
}

bool NatsClient::publish(const std::string& channel, std::string_view payload) {
    return natsConnection_Publish(connection_, channel.c_str(), payload.data(),
                                  static_cast<int>(payload.size())) == NATS_OK;
}

std::shared_ptr<NatsClient::Channel> NatsClient::subscribe(const std::string& channel) {
    auto made = std::make_shared<Channel>(connection_, channel);
    flush();
    return made;
}

std::optional<NatsClient::Message> NatsClient::next(Channel& channel,
                                                    std::chrono::milliseconds patience) {
    natsMsg* received = nullptr;
    if (natsSubscription_NextMsg(&received, channel.subscription,
                                 std::max<std::int64_t>(1, patience.count())) != NATS_OK) {
        return std::nullopt;
    }
    const std::unique_ptr<natsMsg, decltype(&natsMsg_Destroy)> message(received, natsMsg_Destroy);
    return Message{natsMsg_GetSubject(received),
                   std::string(natsMsg_GetData(received),
                               static_cast<std::size_t>(natsMsg_GetDataLength(received)))};
}

void NatsClient::flush() {
    natsConnection_FlushTimeout(connection_, 10'000);
}

std::optional<std::string> NatsClient::ask(const std::string& requests,
                                           const std::string& responses, Channel& answers,
                                           json::Object request,
                                           std::chrono::milliseconds patience) {
    const Clock::time_point deadline = Clock::now() + patience;
    const std::string id = name_ + "." + std::to_string(++asked_);
    request["rtcId"] = id;
    publish(requests, json::serialize(std::move(request)));
    while (Clock::now() < deadline) {
        std::optional<Message> message =
            next(answers,
                 std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now()));
        if (message && message->channel == responses + id) {
            return std::move(message->payload);
        }
    }
    return std::nullopt;
}

}  // namespace test
