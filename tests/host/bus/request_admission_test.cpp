// SPDX-License-Identifier: Apache-2.0
#include "host/bus/request_admission.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <latch>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "platform/messaging/channels.h"
#include "platform/messaging/in_process_bus.h"

namespace host {
namespace {

using namespace platform::messaging;
using platform::DataBuffer;
using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::MatchesRegex;

constexpr std::size_t budgetSize = std::size_t{64} << 20U;

/// Requests of a few bytes, of values that take about 10 MB, and of more than the budget.
std::string request(const std::string& id, std::size_t depth = 0) {
    return R"({"rtcId":")" + id + R"(","a":)" + std::string(depth, '[');
}
constexpr std::size_t large = 90'000;
constexpr std::size_t tooLarge = 800'000;

class RequestAdmission : public testing::Test {
protected:
    void handleReadsWith(MessageHandler handler) { subscribe(readRequestChannel, handler); }

    void subscribe(const std::string& channel, MessageHandler handler) {
        subscriptions_.push_back(client_->subscribe(channel, std::move(handler)).get());
    }

    /// What is answered to "1" on `prefix`.
    void collectAnswers(const std::string& prefix) {
        subscriptions_.push_back(bus_->connect("receiver")
                                     .get()
                                     ->subscribe(prefix + std::string("1"),
                                                 [this](const JsonMessage& message) {
                                                     answers_.emplace_back(message.payload());
                                                     ++answerCount_;
                                                 })
                                     .get());
    }

    void send(const std::string& text, const std::string& channel = readRequestChannel) {
        sender_->publish(channel, DataBuffer::copyOf(text)).get();
    }

    std::vector<std::string> answers() {
        bus_->waitUntilIdle();
        return answers_;
    }

    std::shared_ptr<InProcessBus> bus_ =
        InProcessBus::create({.maxQueuedBytes = 1U << 30U,
                              .concurrentChannels = {readRequestChannel},
                              .concurrency = 2});
    const RequestBudgets budgets_{budgetSize, budgetSize / 4 * 3};
    const std::shared_ptr<MemoryBudget> budget_ = budgets_.requests;
    std::shared_ptr<RequestMetrics> metrics_ = std::make_shared<RequestMetrics>();
    std::vector<std::string> answers_;
    std::atomic<int> answerCount_ = 0;
    std::shared_ptr<MessageService> sender_ = bus_->connect("sender").get();
    std::shared_ptr<MessageService> client_ =
        admittingRequests(bus_->connect("bundle").get(), budgets_, metrics_);

private:
    std::vector<std::shared_ptr<Subscription>> subscriptions_;
};

TEST_F(RequestAdmission, ReservesTheMemoryOfALargeRequestWhileItIsHandled) {
    std::vector<std::size_t> reserved;
    handleReadsWith([&](const JsonMessage&) { reserved.push_back(budget_->reserved()); });
    send(request("1"));
    bus_->waitUntilIdle();
    send(request("1", large));
    bus_->waitUntilIdle();
    ASSERT_EQ(reserved.size(), 2u);
    EXPECT_EQ(reserved[0], 0u);
    EXPECT_GT(reserved[1], 50 * large);
    EXPECT_EQ(budget_->reserved(), 0u);
}

TEST_F(RequestAdmission, HandlesSmallRequestsBesideLargeOnesThatWait) {
    std::latch smallDone(3);
    std::atomic<int> largeDone = 0;
    std::atomic<int> largeAtOnce = 0;
    std::atomic<bool> overlapped = false;
    handleReadsWith([&](const JsonMessage& message) {
        if (message.payload().size() < large) {
            smallDone.count_down();
            return;
        }
        overlapped = overlapped || ++largeAtOnce > 1;
        smallDone.wait();  // would wait for ever if a large one had the other thread
        --largeAtOnce;
        ++largeDone;
    });
    for (int i = 0; i < 3; ++i) {
        send(request("1", large));
    }
    for (int i = 0; i < 3; ++i) {
        send(request("1"));
    }
    bus_->waitUntilIdle();
    EXPECT_EQ(largeDone, 3);
    EXPECT_FALSE(overlapped);
}

TEST_F(RequestAdmission, HasALargeRequestWaitUntilThereIsMemoryForIt) {
    std::atomic<int> handled = 0;
    handleReadsWith([&](const JsonMessage&) { ++handled; });
    {
        const auto others = budget_->tryReserve(budgetSize);
        ASSERT_TRUE(others);
        send(request("1", large));
        send(request("1"));
        while (handled == 0) {
            std::this_thread::yield();
        }
        EXPECT_EQ(handled, 1);
    }
    bus_->waitUntilIdle();
    EXPECT_EQ(handled, 2);
}

TEST_F(RequestAdmission, KeepsTheOrderOfWrites) {
    std::vector<std::string> handled;
    subscribe(writeRequestChannel, [&](const JsonMessage& message) {
        handled.emplace_back(message.payload().substr(0, 12));
    });
    send(request("1", large), writeRequestChannel);
    send(request("2"), writeRequestChannel);
    send(request("3", large), writeRequestChannel);
    bus_->waitUntilIdle();
    EXPECT_THAT(handled, ElementsAre(R"({"rtcId":"1")", R"({"rtcId":"2")", R"({"rtcId":"3")"));
}

TEST_F(RequestAdmission, AnswersAReadThatIsBeyondTheBudget) {
    bool handled = false;
    handleReadsWith([&](const JsonMessage&) { handled = true; });
    collectAnswers(readResponsePrefix);
    send(request("1", tooLarge));
    EXPECT_THAT(
        answers(),
        ElementsAre(MatchesRegex(R"(\{"exception":"The request is too large: it would take .*)")));
    EXPECT_FALSE(handled);
}

TEST_F(RequestAdmission, AnswersFalseToAWriteThatIsBeyondTheBudget) {
    subscribe(writeRequestChannel, [](const JsonMessage&) { FAIL(); });
    collectAnswers(writeResponsePrefix);
    send(request("1", tooLarge), writeRequestChannel);
    EXPECT_THAT(answers(), ElementsAre("false"));
    EXPECT_THAT(metrics_->text(), HasSubstr("\neditor_requests_refused_total{kind=\"write\"} 1\n"));
}

TEST_F(RequestAdmission, RefusesWhatComesWhileTooMuchWaits) {
    std::latch begun(1);
    std::latch refused(1);
    bool isFirst = true;
    handleReadsWith([&](const JsonMessage&) {
        if (std::exchange(isFirst, false)) {
            begun.count_down();
            refused.wait();
        }
    });
    collectAnswers(readResponsePrefix);
    send(request("1", large));
    begun.wait();
    // Beside it an eighth of the budget may wait.
    const std::size_t fitting = budgetSize / 8 / request("1", large).size();
    for (std::size_t i = 0; i < fitting + 1; ++i) {
        send(request("1", large));
    }
    while (answerCount_ == 0) {
        std::this_thread::yield();
    }
    EXPECT_THAT(metrics_->text(),
                AllOf(HasSubstr("\neditor_requests_waiting{kind=\"read\"} " +
                                std::to_string(fitting) + "\n"),
                      HasSubstr("\neditor_requests_refused_total{kind=\"read\"} 1\n")));
    refused.count_down();
    EXPECT_THAT(
        answers(),
        ElementsAre(R"({"exception":"Too many large requests are waiting","status":false})"));
    EXPECT_THAT(metrics_->text(), HasSubstr("\neditor_requests_waiting{kind=\"read\"} 0\n"));
}

TEST_F(RequestAdmission, GoesOnAfterHandlersThatThrow) {
    int handled = 0;
    handleReadsWith([&](const JsonMessage&) {
        if (++handled == 1) {
            throw std::runtime_error("a failure");
        }
        if (handled == 2) {
            throw 1;
        }
    });
    for (int i = 0; i < 3; ++i) {
        send(request("1", large));
        bus_->waitUntilIdle();
    }
    EXPECT_EQ(handled, 3);
    EXPECT_EQ(budget_->reserved(), 0u);
}

TEST_F(RequestAdmission, ReservesTheMemoryOfADocumentUntilItsRequestIsHandled) {
    constexpr std::size_t document = budgetSize / 8;
    std::vector<std::size_t> reserved;
    handleReadsWith([&](const JsonMessage&) {
        client_->awaitMemory(document);
        reserved.push_back(budgets_.documents->reserved());
        client_->awaitMemory(2 * document);
        reserved.push_back(budgets_.documents->reserved());
        client_->awaitMemory(100);
        reserved.push_back(budgets_.documents->reserved());
        client_->awaitMemory(document);
        throw std::runtime_error("a failure");
    });
    send(request("1"));
    bus_->waitUntilIdle();
    EXPECT_THAT(reserved, ElementsAre(document, 2 * document, 0U));
    EXPECT_EQ(budgets_.documents->reserved(), 0U);
}

TEST_F(RequestAdmission, HasDocumentsWaitForEachOther) {
    const std::size_t document = budgets_.documents->size() / 3 * 2;
    std::atomic<int> atOnce = 0;
    std::atomic<bool> overlapped = false;
    std::atomic<int> handled = 0;
    handleReadsWith([&](const JsonMessage&) {
        client_->awaitMemory(document);
        overlapped = overlapped || ++atOnce > 1;
        std::this_thread::sleep_for(std::chrono::milliseconds(20));  // time to overlap
        --atOnce;
        ++handled;
    });
    for (int i = 0; i < 4; ++i) {
        send(request("1"));
    }
    bus_->waitUntilIdle();
    EXPECT_FALSE(overlapped);
    EXPECT_EQ(handled, 4);
}

TEST_F(RequestAdmission, GivesADocumentBeyondTheBudgetAllOfIt) {
    std::size_t reserved = 0;
    handleReadsWith([&](const JsonMessage&) {
        client_->awaitMemory(10 * budgetSize);
        reserved = budgets_.documents->reserved();
    });
    send(request("1"));
    bus_->waitUntilIdle();
    EXPECT_EQ(reserved, budgets_.documents->size());
}

TEST_F(RequestAdmission, ReservesNothingForADocumentOutsideOfARequest) {
    client_->awaitMemory(budgetSize / 2);
    EXPECT_EQ(budgets_.documents->reserved(), 0U);
}

}  // namespace
}  // namespace host
