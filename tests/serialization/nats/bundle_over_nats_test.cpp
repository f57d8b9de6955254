// SPDX-License-Identifier: Apache-2.0
// The real bundle behind a NATS server, asked by a plain client of libnats.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <memory>
#include <string>

#include "framework/bundle_runner.h"
#include "json/parser.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/nats/nats_bus.h"
#include "platform/messaging/transport.h"
#include "tests/serialization/documents.h"
#include "tests/support/nats_client.h"
#include "tests/support/nats_server.h"
#include "tests/support/temporary_directory.h"

namespace {

using namespace test;
using namespace platform::messaging;

constexpr std::chrono::minutes longestWait{2};

class BundleOverNats : public testing::Test {
protected:
    BundleOverNats() : server_("max_payload: 64MB\nmax_pending: 256MB") {
        NatsOptions options;
        options.servers = {server_.url()};
        options.queueGroup = "workers";
        options.queueChannels = {readRequestChannel, writeRequestChannel};
        options.concurrentChannels = {readRequestChannel};
        bus_ = NatsBus::create(options);
        service_ = bus_->connect("host").get();
        setTransport([bus = bus_](const std::string& name, const MessageServiceOptions&) {
            return bus->connect(name);
        });
        bundle_ = std::make_unique<framework::BundleRunner>(SERIALIZATION_BUNDLE);
        client_ = std::make_unique<NatsClient>(std::vector{server_.url()}, "anna");
    }
    ~BundleOverNats() override { setTransport({}); }

    std::string path(const std::string& name) const { return folder_ / name; }

    std::string read(const std::string& file, const std::string& type) {
        return client_->read(fileRequest(file, type), longestWait).value_or("no answer");
    }
    std::string write(json::Object request) {
        return client_->write(std::move(request), longestWait).value_or("no answer");
    }

    NatsServer server_;
    TemporaryDirectory folder_;
    std::shared_ptr<NatsBus> bus_;
    std::shared_ptr<MessageService> service_;
    std::unique_ptr<framework::BundleRunner> bundle_;
    std::unique_ptr<NatsClient> client_;
};

TEST_F(BundleOverNats, ReadsAndWritesTexts) {
    writeFile(path("a.txt"), "as it was");
    EXPECT_EQ(read(path("a.txt"), "text/plain"), textAnswer("as it was"));
    EXPECT_EQ(write(writeText(path("a.txt"), "as it is \xC3\xA9")), "true");
    EXPECT_EQ(readFile(path("a.txt")), "as it is \xC3\xA9");
    EXPECT_EQ(read(path("none.txt"), "text/plain"),
              R"({"exception":"File does not exist","status":false})");
}

TEST_F(BundleOverNats, ReadsAndWritesPackages) {
    EXPECT_EQ(read(path("a.docx"), "text/xml"), R"({"status":false})");
    EXPECT_EQ(write(writePackage(path("a.docx"), "<a/>")), "true");
    EXPECT_EQ(read(path("a.docx"), "text/xml"), packageAnswer("<a/>"));
    EXPECT_EQ(write(writePackage(path("nowhere/a.docx"), "<a/>")), "false");
}

TEST_F(BundleOverNats, TellsEveryoneOfAWriteBeforeItsAnswer) {
    const auto both = client_->subscribe(">");
    EXPECT_EQ(write(writeText(path("a.txt"), "x")), "true");
    std::vector<std::string> channels;
    for (int i = 0; i < 3; ++i) {
        channels.push_back(NatsClient::next(*both, longestWait)->channel);
    }
    EXPECT_THAT(channels, testing::ElementsAre(writeRequestChannel, notificationChannel,
                                               "/zpr/service/writeResponse/anna.1"));
}

TEST_F(BundleOverNats, ServesOnAfterRequestsThatNameNoSubject) {
    for (const std::string id : {"", "a b", "x\\r\\nPUB y 1", "a..b", ".", ">", "a.>", "\\u0000"}) {
        client_->publish(readRequestChannel,
                         R"({"rtcId":")" + id + R"(","contentType":"text/plain","filePath":"x"})");
        client_->publish(writeRequestChannel, R"({"rtcId":")" + id +
                                                  R"(","contentType":"text/plain",)"
                                                  R"("filePath":"/nowhere/x",)"
                                                  R"("content":"","encoding":"UTF-8"})");
    }
    client_->publish(readRequestChannel, "no JSON");
    writeFile(path("a.txt"), "x");
    EXPECT_EQ(read(path("a.txt"), "text/plain"), textAnswer("x"));
    EXPECT_TRUE(bus_->isConnected());
}

TEST_F(BundleOverNats, AnswersThatADocumentIsTooLargeForTheServerAndServesOn) {
    writeFile(path("large.txt"), std::string(70'000'000, 'x'));
    writeFile(path("small.txt"), "x");
    EXPECT_EQ(read(path("large.txt"), "text/plain"),
              R"({"exception":"The document is too large: its message would be longer than the )"
              R"(67108864 bytes that can be sent","status":false})");
    EXPECT_EQ(read(path("small.txt"), "text/plain"), textAnswer("x"));
    EXPECT_TRUE(bus_->isConnected());
}

TEST_F(BundleOverNats, CarriesTextsOf45MegabytesBothWays) {
    const std::string text = noise(45'000'000, 1);
    EXPECT_EQ(write(writeText(path("a.txt"), text)), "true");
    EXPECT_TRUE(readFile(path("a.txt")) == text);
    EXPECT_TRUE(read(path("a.txt"), "text/plain") == textAnswer(text));
}

TEST_F(BundleOverNats, CarriesPackagesOf45MegabytesBothWays) {
    const std::string text = noise(45'000'000, 2);
    EXPECT_EQ(write(writePackage(path("a.docx"), text)), "true");
    EXPECT_TRUE(read(path("a.docx"), "text/xml") == packageAnswer(text));
}

TEST_F(BundleOverNats, FinishesTheRequestsThatItTookWhenItLeaves) {
    const std::string text = noise(2'000'000, 3);
    writeFile(path("a.txt"), text);
    const auto answers = client_->subscribe("/zpr/service/readResponse/bob.*");
    constexpr int count = 20;
    for (int i = 0; i < count; ++i) {
        client_->publish(readRequestChannel, R"({"rtcId":"bob.)" + std::to_string(i) +
                                                 R"(","contentType":"text/plain",)"
                                                 R"("filePath":")" +
                                                 path("a.txt") + "\"}");
    }
    client_->flush();  // the server has them all, and the worker's connection gets them in order
    EXPECT_EQ(read(path("none.txt"), "text/plain"),
              R"({"exception":"File does not exist","status":false})");
    EXPECT_TRUE(bus_->drain(longestWait));
    const std::string expected = textAnswer(text);
    for (int i = 0; i < count; ++i) {
        const auto answer = NatsClient::next(*answers, std::chrono::seconds(30));
        ASSERT_TRUE(answer) << i;
        EXPECT_TRUE(answer->payload == expected);
    }
}

}  // namespace
