// SPDX-License-Identifier: Apache-2.0
// Requests that have come whole in pieces, on their way to their handler, without a server.
#include <gtest/gtest.h>
#include <nats/nats.h>

#include <atomic>
#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <thread>

#include "platform/messaging/channels.h"
#include "platform/messaging/nats/long_messages.h"

namespace platform::messaging::nats {
namespace {

ReceivedMessage message(const std::string& subject, const std::string& word,
                        const std::string& payload = "") {
    natsMsg* made = nullptr;
    EXPECT_EQ(natsMsg_Create(&made, subject.c_str(), "/answer/ada.1", payload.data(),
                             static_cast<int>(payload.size())),
              NATS_OK);
    EXPECT_EQ(natsMsgHeader_Set(made, piecesHeader, word.c_str()), NATS_OK);
    return ReceivedMessage(made);
}

// Some of these rounds ask at the moment at which the request goes over to its handler.
TEST(WholeRequests, AreWaitedForUntilTheyHaveBeenHandled) {
    ASSERT_EQ(nats_Open(-1), NATS_OK);
    for (int round = 0; round < 1000; ++round) {
        LongMessageOptions options;
        options.answerPrefixes = {{"/ask", "/answer/"}};
        const auto all = std::make_shared<LongMessages>(options, [](const Note&) {});
        const std::shared_ptr<MessageSource> source = all->wholeRequests("/ask");
        std::atomic<bool> isHandling = false;
        std::atomic<bool> mayEnd = false;
        std::thread handler([&] {
            const std::optional<QueuedMessage> request = source->next();
            isHandling = true;
            while (!mayEnd) {
                std::this_thread::yield();
            }
        });
        all->takeOffer("/ask", message("/ask/offer", "offer 7").get());
        std::string subject = all->subject();
        subject.replace(subject.size() - 1, 1, "ada.1");
        all->takeWord(message(subject, "piece 0", "request").get());
        bool isDrained = false;
        while (!isHandling && !isDrained) {
            isDrained = all->drain(std::chrono::steady_clock::now());
        }
        mayEnd = true;
        handler.join();
        ASSERT_FALSE(isDrained) << "in round " << round;
        EXPECT_TRUE(all->drain(std::chrono::steady_clock::now()));
    }
}

}  // namespace
}  // namespace platform::messaging::nats
