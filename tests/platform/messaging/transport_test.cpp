// SPDX-License-Identifier: Apache-2.0
// Where createMessageService gets its clients from.

#include "platform/messaging/transport.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <stdexcept>
#include <string>

#include "platform/messaging/in_process_bus.h"
#include "tests/platform/messaging/bus_test_support.h"

namespace platform::messaging {
namespace {

using testing::ElementsAre;
using testing::Pair;
using testing::StrEq;
using testing::ThrowsMessage;

class TransportTest : public testing::Test {
protected:
    ~TransportTest() override { setTransport(nullptr); }
};

TEST_F(TransportTest, IsOneBusForTheWholeProcessByDefault) {
    const auto publisher = createMessageService("publisher", {}).get();
    const auto subscriber = createMessageService("subscriber", {}).get();
    futures::Promise<std::string> received;
    futures::Future<std::string> text = received.getFuture();
    const auto subscription = subscribe(
        *subscriber, "/default", [&](const JsonMessage& m) { received.setValue(textOf(m)); });
    publish(*publisher, "/default", "over the process's bus");
    EXPECT_EQ(text.get(), "over the process's bus");
}

TEST_F(TransportTest, IsCalledWithTheNameAndTheOptions) {
    const auto bus = InProcessBus::create();
    std::string name;
    MessageServiceOptions given;
    setTransport([&](const std::string& clientName, const MessageServiceOptions& options) {
        name = clientName;
        given = options;
        return bus->connect(clientName);
    });
    const auto client = createMessageService("EditorSerialization", {{"key", "value"}}).get();
    EXPECT_EQ(name, "EditorSerialization");
    EXPECT_THAT(given, ElementsAre(Pair("key", "value")));

    std::string publishedBy;
    const auto observation = bus->observe(
        [&](std::string_view clientName, const JsonMessage&) { publishedBy = clientName; });
    publish(*client, "/channel", "");
    EXPECT_EQ(publishedBy, "EditorSerialization");
}

TEST_F(TransportTest, LetsTheFailureOfATransportPass) {
    setTransport(
        [](const std::string&,
           const MessageServiceOptions&) -> futures::Future<std::shared_ptr<MessageService>> {
            throw std::runtime_error("no server");
        });
    EXPECT_THAT([] { createMessageService("client", {}); },
                ThrowsMessage<std::runtime_error>(StrEq("no server")));
}

TEST_F(TransportTest, MayResolveLater) {
    futures::Promise<std::shared_ptr<MessageService>> promise;
    setTransport(
        [&](const std::string&, const MessageServiceOptions&) { return promise.getFuture(); });
    bool connected = false;
    createMessageService("client", {}).then([&](futures::Future<std::shared_ptr<MessageService>>) {
        connected = true;
    });
    EXPECT_FALSE(connected);
    promise.setValue(nullptr);
    EXPECT_TRUE(connected);
}

TEST_F(TransportTest, ReturnsToTheDefaultWithAnEmptyFunction) {
    const auto held = std::make_shared<int>(1);
    setTransport(
        [held](const std::string&,
               const MessageServiceOptions&) -> futures::Future<std::shared_ptr<MessageService>> {
            throw std::runtime_error("must not be used");
        });
    EXPECT_EQ(held.use_count(), 2);
    setTransport(nullptr);
    EXPECT_EQ(held.use_count(), 1) << "a transport that was replaced is gone";
    EXPECT_NE(createMessageService("client", {}).get(), nullptr);
}

TEST_F(TransportTest, MayChangeTheTransportItself) {
    setTransport([](const std::string& name, const MessageServiceOptions& options) {
        setTransport(nullptr);
        return createMessageService(name, options);
    });
    EXPECT_NE(createMessageService("client", {}).get(), nullptr);
}

}  // namespace
}  // namespace platform::messaging
