// SPDX-License-Identifier: Apache-2.0
// Several clients at once over the real bundle and bus: mixed reads and writes of texts and
// packages, on files of their own and on files that all of them use.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <deque>
#include <map>
#include <memory>
#include <mutex>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "json/parser.h"
#include "tests/serialization/documents.h"
#include "tests/support/running_bundle.h"
#include "tests/support/temporary_directory.h"

namespace {

using namespace platform::messaging;
using test::Message;
using test::notificationChannel;
using test::packageAnswer;
using test::packageDocument;
using test::readRequestChannel;
using test::readResponsePrefix;
using test::RunningBundle;
using test::textAnswer;
using test::writeRequestChannel;
using test::writeResponsePrefix;

constexpr int clientCount = 5;
constexpr int roundCount = 150;

/// A text that contains its version, long enough that a reader may meet it half-written.
std::string sharedText(unsigned version) {
    return "version " + std::to_string(version) +
           std::string(20'000, static_cast<char>('a' + version % 26));
}

/// One client with a connection of its own, which receives the answers to its requests.
class Client {
public:
    Client(InProcessBus& bus, int number)
        : rtcId_("client-" + std::to_string(number)),
          service_(bus.connect(rtcId_).get()),
          reads_(service_->subscribe(readResponsePrefix + rtcId_, receiver("read")).get()),
          writes_(service_->subscribe(writeResponsePrefix + rtcId_, receiver("write")).get()) {}

    const std::string& rtcId() const { return rtcId_; }

    void read(const std::string& path, const std::string& contentType) {
        publish(readRequestChannel, RunningBundle::request(path, contentType, rtcId_));
    }

    void write(const std::string& path, const std::string& contentType, json::Value content) {
        json::Object request;
        request["rtcId"] = rtcId_;
        request["contentType"] = contentType;
        request["filePath"] = path;
        request["content"] = std::move(content);
        request["encoding"] = "UTF-8";
        publish(writeRequestChannel, json::serialize(std::move(request)));
    }

    /// The next answer to a read or a write, in the order in which they came; "no answer" when none
    /// comes for a minute.
    std::string next(const std::string& kind) {
        std::unique_lock lock(mutex_);
        if (!received_.wait_for(lock, std::chrono::minutes(1),
                                [&] { return !answers_[kind].empty(); })) {
            return "no answer";
        }
        std::string answer = std::move(answers_[kind].front());
        answers_[kind].pop_front();
        return answer;
    }

    bool hasMore() {
        const std::lock_guard lock(mutex_);
        return !answers_["read"].empty() || !answers_["write"].empty();
    }

private:
    MessageHandler receiver(const std::string& kind) {
        return [this, kind](const JsonMessage& message) {
            const std::lock_guard lock(mutex_);
            answers_[kind].emplace_back(message.payload());
            received_.notify_all();
        };
    }

    void publish(const std::string& channel, const std::string& payload) {
        service_->publish(channel, platform::DataBuffer::copyOf(payload)).get();
    }

    const std::string rtcId_;
    std::mutex mutex_;
    std::condition_variable received_;
    std::map<std::string, std::deque<std::string>> answers_;  // guarded by mutex_
    const std::shared_ptr<MessageService> service_;
    const std::shared_ptr<Subscription> reads_;
    const std::shared_ptr<Subscription> writes_;
};

class Soak : public testing::Test {
protected:
    /// What one client does: on its own files every answer is known to the byte; on the shared ones
    /// it has to be one that some client's write explains.
    void run(Client& client, unsigned seed) {
        std::mt19937 random(seed);
        const std::string ownText = (folder / (client.rtcId() + ".txt")).string();
        const std::string ownPackage = (folder / (client.rtcId() + ".docx")).string();
        for (int round = 0; round < roundCount; ++round) {
            const std::string text = client.rtcId() + " round " + std::to_string(round);
            client.write(ownText, "text/plain", text);
            ASSERT_EQ(client.next("write"), "true");
            client.read(ownText, "text/plain");
            ASSERT_EQ(client.next("read"), textAnswer(text));

            client.write(ownPackage, "text/xml", packageDocument(text));
            ASSERT_EQ(client.next("write"), "true");
            client.read(ownPackage, "text/xml");
            ASSERT_EQ(client.next("read"), packageAnswer(text));

            // Several at once, answered in the order of asking on each channel.
            const unsigned version = static_cast<unsigned>(random());
            client.write(sharedTextPath(), "text/plain", sharedText(version % versionCount));
            client.write((folder / "missing/file.txt").string(), "text/plain", "never");
            client.write(sharedPackagePath(), "text/xml",
                         packageDocument(sharedText(version % versionCount)));
            client.read(sharedTextPath(), "text/plain");
            client.read((folder / "no-such-file").string(), "text/plain");
            client.read(sharedPackagePath(), "text/xml");
            ASSERT_EQ(client.next("write"), "true");
            ASSERT_EQ(client.next("write"), "false");
            ASSERT_EQ(client.next("write"), "true");
            expectPartsOfVersions(client.next("read"));
            ASSERT_EQ(client.next("read"), R"({"exception":"File does not exist","status":false})");
            expectWholeVersion(client.next("read"));
        }
    }

    std::string sharedTextPath() const { return (folder / "shared.txt").string(); }
    std::string sharedPackagePath() const { return (folder / "shared.docx").string(); }

    // Texts are written in place: a reader may meet the beginning of one, or, when it is overtaken
    // while it reads, pages of several. Each byte is one that some version has at that place.
    static void expectPartsOfVersions(const std::string& answer) {
        const json::Object object = json::parse(answer);
        ASSERT_TRUE(object.at("status").get<bool>()) << answer;
        const std::string& data = object.at("data").get<std::string>();
        ASSERT_LE(data.size(), sharedText(0).size());
        for (std::size_t place = 0; place < data.size(); ++place) {
            const bool known = std::ranges::any_of(sharedVersions, [&](const std::string& text) {
                return text[place] == data[place];
            });
            ASSERT_TRUE(known) << "at " << place << ": " << data.substr(place, 40);
        }
    }

    // Packages are replaced as a whole: a reader never meets anything else.
    static void expectWholeVersion(const std::string& answer) {
        for (unsigned version = 0; version < versionCount; ++version) {
            if (answer == packageAnswer(sharedText(version))) {
                return;
            }
        }
        ADD_FAILURE() << "not any version: " << answer.substr(0, 80);
    }

    static constexpr unsigned versionCount = 7;
    static inline const std::vector<std::string> sharedVersions = [] {
        std::vector<std::string> texts;
        for (unsigned version = 0; version < versionCount; ++version) {
            texts.push_back(sharedText(version));
        }
        return texts;
    }();

    test::TemporaryDirectory folder;
    RunningBundle bundle;
};

TEST_F(Soak, EveryRequestIsAnsweredOnceInOrderAndAfterItsNotification) {
    test::writeFile(sharedTextPath(), sharedText(0));
    std::vector<std::unique_ptr<Client>> clients;
    for (int number = 0; number < clientCount; ++number) {
        clients.push_back(std::make_unique<Client>(bundle.bus(), number));
    }
    // The first version, so that the shared package is there from the start.
    clients[0]->write(sharedPackagePath(), "text/xml", packageDocument(sharedText(0)));
    ASSERT_EQ(clients[0]->next("write"), "true");

    std::vector<std::thread> threads;
    for (unsigned number = 0; number < clientCount; ++number) {
        threads.emplace_back([&, number] { run(*clients[number], number); });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    bundle.bus().waitUntilIdle();
    for (const auto& client : clients) {
        EXPECT_FALSE(client->hasMore()) << client->rtcId();
    }

    std::size_t notifications = 0;
    std::size_t writeAnswers = 0;
    std::size_t readAnswers = 0;
    for (const Message& message : bundle.published()) {
        if (message.channel == notificationChannel) {
            ++notifications;
        } else if (message.channel.starts_with(writeResponsePrefix)) {
            ++writeAnswers;
            // Writes are handled one at a time, so that each answer comes right after its
            // notification.
            ASSERT_EQ(notifications, writeAnswers);
        } else {
            ASSERT_THAT(message.channel, testing::StartsWith(readResponsePrefix));
            ++readAnswers;
        }
    }
    EXPECT_EQ(writeAnswers, std::size_t{clientCount} * roundCount * 5 + 1);
    EXPECT_EQ(readAnswers, std::size_t{clientCount} * roundCount * 5);
}

}  // namespace
