// SPDX-License-Identifier: Apache-2.0
#include "host/bus/failed_reads.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <new>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/messaging/channels.h"
#include "platform/messaging/in_process_bus.h"

namespace host {
namespace {

using platform::DataBuffer;
using platform::messaging::InProcessBus;
using platform::messaging::JsonMessage;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::MatchesRegex;
using testing::ThrowsMessage;

const std::string readAnswers = platform::messaging::readResponsePrefix + std::string("1");
const std::string writeAnswers = platform::messaging::writeResponsePrefix + std::string("1");

class UnsentAnswers : public testing::Test {
protected:
    UnsentAnswers() {
        for (const std::string& channel : {readAnswers, writeAnswers}) {
            subscriptions_.push_back(receiver_
                                         ->subscribe(channel,
                                                     [this](const JsonMessage& message) {
                                                         received_.emplace_back(message.payload());
                                                     })
                                         .get());
        }
    }

    futures::Future<void> publish(const std::string& channel, std::string_view payload) {
        return client_->publish(channel, DataBuffer::copyOf(payload));
    }

    /// What has come on either channel.
    std::vector<std::string> received() {
        bus_->waitUntilIdle();
        return received_;
    }

private:
    std::shared_ptr<InProcessBus> bus_ =
        InProcessBus::create({.maxQueuedBytes = 300, .concurrentChannels = {}, .concurrency = 0});
    std::vector<std::string> received_;
    std::shared_ptr<platform::messaging::MessageService> receiver_ =
        bus_->connect("receiver").get();

protected:
    std::vector<std::shared_ptr<platform::messaging::Subscription>> subscriptions_;
    std::shared_ptr<platform::messaging::MessageService> client_ =
        answeringFailedReads(bus_->connect("bundle").get());
};

TEST_F(UnsentAnswers, AreReplacedByTheReason) {
    auto future = publish(readAnswers, std::string(301, 'x'));
    EXPECT_THAT(
        received(),
        ElementsAre(MatchesRegex(
            R"(\{"exception":"Message of 301 bytes on .* was not accepted.*","status":false\})")));
    EXPECT_THROW(future.get(), std::runtime_error);
}

TEST_F(UnsentAnswers, AreLeftAloneWhenTheyAreSent) {
    publish(readAnswers, "answer").get();
    EXPECT_THAT(received(), ElementsAre("answer"));
}

TEST_F(UnsentAnswers, ToWritesHaveNoFormForAReason) {
    auto future = publish(writeAnswers, std::string(301, 'x'));
    EXPECT_THAT(received(), IsEmpty());
    EXPECT_THROW(future.get(), std::runtime_error);
}

class FailedReads : public UnsentAnswers {
protected:
    /// Sends `request` on `channel` to a handler that throws `error`.
    template <typename Error>
    void fail(const std::string& channel, const std::string& text, const Error& error) {
        subscriptions_.push_back(
            client_->subscribe(channel, [error](const JsonMessage&) { throw error; }).get());
        client_->publish(channel, DataBuffer::copyOf(text)).get();
    }

    const std::string readRequests = platform::messaging::readRequestChannel;
    const std::string request = R"({"contentType":"text/plain","filePath":"/a","rtcId":"1"})";
};

TEST_F(FailedReads, AreAnsweredWhenMemoryRunsOut) {
    fail(readRequests, request, std::bad_alloc());
    EXPECT_THAT(received(), ElementsAre(R"({"exception":"Out of memory!","status":false})"));
}

TEST_F(FailedReads, AreAnsweredWhenThereIsNoMemoryForTheMessage) {
    fail(readRequests, request, std::runtime_error("Out of memory!"));
    EXPECT_THAT(received(), ElementsAre(R"({"exception":"Out of memory!","status":false})"));
}

TEST_F(FailedReads, AreNotAnsweredWhenTheyAreFaulty) {
    fail(readRequests, request, std::runtime_error("invalid conversion: undefined to string"));
    EXPECT_THAT(received(), IsEmpty());
}

TEST_F(FailedReads, AreNotAnsweredWhenNobodyKnowsWhere) {
    fail(readRequests, R"({"contentType":"text/plain"})", std::bad_alloc());
    EXPECT_THAT(received(), IsEmpty());
}

TEST_F(FailedReads, AreNoWrites) {
    fail(platform::messaging::writeRequestChannel, request, std::bad_alloc());
    EXPECT_THAT(received(), IsEmpty());
}

}  // namespace
}  // namespace host
