// SPDX-License-Identifier: Apache-2.0
#include "host/bus/serving_client.h"

#include <limits.h>
#include <spdlog/spdlog.h>

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <exception>
#include <optional>
#include <string_view>
#include <utility>

#include "host/bus/forwarding_client.h"
#include "host/bus/request_kind.h"
#include "host/guard/history.h"
#include "json/find_string.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/resolved.h"

namespace host {

namespace {

using Clock = std::chrono::steady_clock;
using platform::DataBuffer;
using platform::messaging::JsonMessage;
using platform::messaging::MessageHandler;
using platform::messaging::MessageService;
using platform::messaging::Subscription;

// Whether an answer to a request of `kind` reports success. A document that holds the text has its
// quotes escaped.
bool isSuccess(RequestKind kind, std::string_view answer) {
    constexpr std::size_t longestFailure = 4096;
    return kind == RequestKind::write
               ? answer == "true"
               : answer.size() > longestFailure ||
                     answer.find(R"("status":false)") == std::string_view::npos;
}

// The request that a thread is handling; it counts the request when it is done.
class HandledRequest {
public:
    HandledRequest(const JsonMessage& message, RequestKind kind, RequestMetrics& metrics);
    HandledRequest(const HandledRequest&) = delete;
    HandledRequest& operator=(const HandledRequest&) = delete;
    ~HandledRequest();

    const JsonMessage& message() const noexcept { return message_; }

    void answered(std::string_view answer) noexcept {
        outcome_ = isSuccess(kind_, answer) ? RequestOutcome::success : RequestOutcome::failure;
        answerBytes_ = answer.size();
    }

private:
    const JsonMessage& message_;
    RequestMetrics& metrics_;
    const RequestKind kind_;
    const Clock::time_point start_ = Clock::now();
    RequestOutcome outcome_ = RequestOutcome::noAnswer;
    std::size_t answerBytes_ = 0;
};

// A request is answered on the thread that handles it.
thread_local HandledRequest* requestOfThread = nullptr;

HandledRequest::HandledRequest(const JsonMessage& message, RequestKind kind,
                               RequestMetrics& metrics)
    : message_(message), metrics_(metrics), kind_(kind) {
    metrics_.begin(kind_, message_.payload().size());
    requestOfThread = this;
}

HandledRequest::~HandledRequest() {
    requestOfThread = nullptr;
    metrics_.end(kind_, outcome_, answerBytes_, Clock::now() - start_);
}

bool isAnswer(const std::string& channel) {
    return channel.starts_with(platform::messaging::readResponsePrefix) ||
           channel.starts_with(platform::messaging::writeResponsePrefix);
}

// Whether `answer` may be one to a request that was refused. An answer with a document is longer
// than the others, so requests are not looked at for most answers.
bool mayBeRefusal(const std::string& channel, std::string_view answer) {
    constexpr std::size_t longestRefusal = 4096;
    return (channel.starts_with(platform::messaging::readResponsePrefix) &&
            answer.size() <= longestRefusal) ||
           (channel.starts_with(platform::messaging::writeResponsePrefix) && answer != "true");
}

class ServingClient final : public ForwardingClient {
public:
    ServingClient(std::shared_ptr<MessageService> client, ServingOptions options)
        : ForwardingClient(std::move(client)), options_(std::move(options)) {
        for (std::filesystem::path& root : options_.roots) {
            root = History::nameOf(root);
        }
    }

    futures::Future<std::shared_ptr<Subscription>> subscribe(const std::string& channel,
                                                             MessageHandler handler) override {
        return platform::messaging::resolved([&] {
            try {
                return next()->subscribe(channel, prepared(channel, std::move(handler))).get();
            } catch (const std::exception& error) {
                options_.subscriptionFailure->set(error.what());
                throw;
            }
        });
    }

    futures::Future<void> publish(const std::string& channel, DataBuffer payload) override {
        if (requestOfThread != nullptr && isAnswer(channel)) {
            requestOfThread->answered(payload.view());
            if (!options_.roots.empty() && mayBeRefusal(channel, payload.view())) {
                logIfOutside(requestOfThread->message());
            }
        }
        return next()->publish(channel, std::move(payload));
    }

private:
    MessageHandler prepared(const std::string& channel, MessageHandler handler) const {
        return
            [kind = requestKindOf(channel), prepareThread = options_.prepareThread,
             metrics = options_.metrics, handler = std::move(handler)](const JsonMessage& message) {
                // Subscriptions have threads of their own, so they are this client's.
                thread_local bool isPrepared = false;
                if (prepareThread && !isPrepared) {
                    prepareThread();
                    isPrepared = true;
                }
                if (!kind) {
                    return handler(message);
                }
                const HandledRequest request(message, *kind, *metrics);
                handler(message);
            };
    }

    void logIfOutside(const JsonMessage& request) const {
        // There may be no memory to parse a large request once more.
        const std::optional<std::string> path = json::findString(request.payload(), "filePath");
        if (!path || path->empty() || path->size() >= PATH_MAX) {
            return;  // It names no file, inside or outside.
        }
        const std::string name = History::nameOf(*path);
        if (std::none_of(options_.roots.begin(), options_.roots.end(),
                         [&name](const auto& root) { return History::isBelow(name, root); })) {
            spdlog::warn(
                "refused {}, which is in no folder of --root; workers of other folders need a "
                "group and message servers, or an account, of their own",
                *path);
        }
    }

    ServingOptions options_;
};

}  // namespace

std::shared_ptr<MessageService> servingClient(std::shared_ptr<MessageService> client,
                                              ServingOptions options) {
    return std::make_shared<ServingClient>(std::move(client), std::move(options));
}

}  // namespace host
