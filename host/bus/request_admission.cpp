// SPDX-License-Identifier: Apache-2.0
// The thread that delivers a large message goes on to handle those that arrive meanwhile. So the
// bus's own threads handle everything, and once the bus has waited for them, nothing is left
// undone.
#include "host/bus/request_admission.h"

#include <spdlog/spdlog.h>

#include <algorithm>
#include <exception>
#include <mutex>
#include <optional>
#include <queue>
#include <string>
#include <string_view>
#include <utility>

#include "host/bus/failed_reads.h"
#include "host/bus/forwarding_client.h"
#include "host/bus/request_kind.h"
#include "host/limits/freed_memory.h"
#include "json/find_string.h"
#include "json/parse_memory.h"
#include "platform/messaging/channels.h"

namespace host {

namespace {

using platform::DataBuffer;
using platform::messaging::JsonMessage;
using platform::messaging::MemoryBudget;
using platform::messaging::MessageHandler;
using platform::messaging::MessageService;
using platform::messaging::Subscription;

// What each thread may take without asking, of a budget of that size: hundreds of times the values
// of a read request, but of all threads together a small share.
std::size_t smallWork(const MemoryBudget& budget) {
    constexpr std::size_t usual = std::size_t{4} << 20U;
    constexpr std::size_t share = 64;
    return std::min(usual, budget.size() / share);
}

// The share of the budget that all waiting messages may have together.
constexpr std::size_t waitingShare = 8;

// What is reserved for the document of the message that the thread handles; null between messages.
thread_local MemoryBudget::Reservation* documentOfThread = nullptr;

// Calls `handler` with `message`, and gives back what was reserved for its document.
void handleOne(const MessageHandler& handler, const JsonMessage& message) {
    class Document {
    public:
        Document() { documentOfThread = &reservation_; }
        Document(const Document&) = delete;
        Document& operator=(const Document&) = delete;
        ~Document() { documentOfThread = nullptr; }

    private:
        MemoryBudget::Reservation reservation_;
    };
    const Document document;
    handler(message);
}

// The requests on one channel.
class Admission {
public:
    Admission(std::shared_ptr<MessageService> client, std::shared_ptr<MemoryBudget> budget,
              std::shared_ptr<RequestMetrics> metrics, std::string channel, MessageHandler handler)
        : client_(std::move(client)),
          budget_(std::move(budget)),
          metrics_(std::move(metrics)),
          kind_(requestKindOf(channel)),
          channel_(std::move(channel)),
          handler_(std::move(handler)) {}

    void handle(const JsonMessage& message) {
        const std::size_t smallest = smallWork(*budget_);
        const std::size_t length = message.payload().size();
        // Most messages are so short that nothing has to be counted.
        if (length + json::mostMemoryToParse(length) <= smallest) {
            handleOne(handler_, message);
            return;
        }
        const std::size_t memory = length + json::memoryToParse(message.payload());
        if (memory <= smallest) {
            handleOne(handler_, message);
        } else if (memory > budget_->size()) {
            refuse(message, "The request is too large: it would take " + std::to_string(memory) +
                                " bytes of memory, and requests may take " +
                                std::to_string(budget_->size()));
        } else {
            handleInTurn({message, memory});
        }
    }

private:
    struct LargeRequest {
        JsonMessage message;
        std::size_t memory;
    };

    // Handles the request and all that arrive until it is done, or leaves it to the thread that is
    // already doing so.
    void handleInTurn(LargeRequest request) {
        std::unique_lock lock(mutex_);
        const std::size_t length = request.message.payload().size();
        if (isHandling_ && waitingBytes_ + length > budget_->size() / waitingShare) {
            lock.unlock();
            refuse(request.message, "Too many large requests are waiting");
            return;
        }
        if (kind_) {
            metrics_->wait(*kind_);
        }
        waiting_.push(std::move(request));
        waitingBytes_ += length;
        if (std::exchange(isHandling_, true)) {
            return;
        }
        lock.unlock();
        while (std::optional<LargeRequest> next = takeNext()) {
            handleLarge(std::move(*next));
        }
    }

    std::optional<LargeRequest> takeNext() {
        const std::lock_guard lock(mutex_);
        if (waiting_.empty()) {
            isHandling_ = false;
            return std::nullopt;
        }
        LargeRequest next = std::move(waiting_.front());
        waiting_.pop();
        waitingBytes_ -= next.message.payload().size();
        return next;
    }

    void handleLarge(LargeRequest request) {
        const MemoryBudget::Reservation reservation = budget_->reserve(request.memory);
        if (kind_) {
            metrics_->endWait(*kind_);
        }
        // Failures do not reach the bus, which would log them for another message.
        try {
            handleOne(handler_, request.message);
        } catch (const std::exception& error) {
            logFailure(request, error.what());
        } catch (...) {
            logFailure(request, "an exception that is not derived from std::exception");
        }
        if (request.memory - request.message.payload().size() > keptMemory) {
            returnFreedMemory();
        }
    }

    void logFailure(const LargeRequest& request, std::string_view reason) {
        spdlog::error("A request of {} bytes on channel \"{}\" failed: {}",
                      request.message.payload().size(), channel_, reason);
    }

    void refuse(const JsonMessage& message, const std::string& reason) {
        spdlog::error("A request of {} bytes on channel \"{}\" is refused: {}",
                      message.payload().size(), channel_, reason);
        if (!kind_) {
            return;
        }
        metrics_->refuse(*kind_);
        if (*kind_ == RequestKind::read) {
            answerFailedRead(*client_, message.payload(), reason);
        } else if (const auto rtcId = json::findString(message.payload(), "rtcId")) {
            client_->publish(platform::messaging::writeResponsePrefix + *rtcId,
                             DataBuffer::copyOf("false"));
        }
    }

    const std::shared_ptr<MessageService> client_;
    const std::shared_ptr<MemoryBudget> budget_;
    const std::shared_ptr<RequestMetrics> metrics_;
    const std::optional<RequestKind> kind_;
    const std::string channel_;
    const MessageHandler handler_;

    std::mutex mutex_;  // guards what follows
    std::queue<LargeRequest> waiting_;
    std::size_t waitingBytes_ = 0;
    bool isHandling_ = false;  // a thread handles large requests
};

class AdmittingClient final : public ForwardingClient {
public:
    AdmittingClient(std::shared_ptr<MessageService> client, RequestBudgets budgets,
                    std::shared_ptr<RequestMetrics> metrics)
        : ForwardingClient(std::move(client)),
          budgets_(std::move(budgets)),
          metrics_(std::move(metrics)) {}

    futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string& channel,
                                                             MessageHandler handler) override {
        const auto admission = std::make_shared<Admission>(next(), budgets_.requests, metrics_,
                                                           channel, std::move(handler));
        return next()->subscribe(
            channel, [admission](const JsonMessage& message) { admission->handle(message); });
    }

    // A thread that waits here holds nothing that others wait for. One that asks for more than the
    // budget gets all of it and goes on, since `bytes` is only an upper bound.
    void awaitMemory(std::size_t bytes) override {
        MemoryBudget& budget = *budgets_.documents;
        if (documentOfThread != nullptr) {
            *documentOfThread = {};
            if (bytes > smallWork(budget)) {
                *documentOfThread = budget.reserve(std::min(bytes, budget.size()));
            }
        }
    }

private:
    const RequestBudgets budgets_;
    const std::shared_ptr<RequestMetrics> metrics_;
};

}  // namespace

RequestBudgets::RequestBudgets(std::size_t requestBytes, std::size_t documentBytes)
    : requests(std::make_shared<MemoryBudget>(requestBytes)),
      documents(std::make_shared<MemoryBudget>(documentBytes)) {}

std::shared_ptr<MessageService> admittingRequests(std::shared_ptr<MessageService> client,
                                                  RequestBudgets budgets,
                                                  std::shared_ptr<RequestMetrics> metrics) {
    return std::make_shared<AdmittingClient>(std::move(client), std::move(budgets),
                                             std::move(metrics));
}

}  // namespace host
