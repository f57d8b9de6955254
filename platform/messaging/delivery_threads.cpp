// SPDX-License-Identifier: Apache-2.0
#include "platform/messaging/delivery_threads.h"

#include <algorithm>
#include <utility>

#include "platform/messaging/log.h"
#include "platform/messaging/revocable_function.h"

namespace platform::messaging {

struct DeliveryThreads::State {
    State(MessageHandler messageHandler, std::shared_ptr<MessageSource> messageSource)
        : handler(std::move(messageHandler)), source(std::move(messageSource)) {}

    RevocableFunction<const JsonMessage&> handler;
    const std::shared_ptr<MessageSource> source;
};

DeliveryThreads::DeliveryThreads(MessageHandler handler, std::shared_ptr<MessageSource> source,
                                 std::size_t count)
    : state_(std::make_shared<State>(std::move(handler), std::move(source))) {
    try {
        threads_.reserve(count);
        while (threads_.size() < count) {
            threads_.emplace_back([state = state_] { deliver(*state); });
        }
    } catch (...) {
        close();
        throw;
    }
}

DeliveryThreads::~DeliveryThreads() {
    close();
}

void DeliveryThreads::close() {
    if (std::exchange(closed_, true)) {
        return;
    }
    state_->source->end();
    state_->handler.revoke();
    for (std::thread& thread : threads_) {
        if (thread.get_id() == std::this_thread::get_id()) {
            thread.detach();
        } else {
            thread.join();
        }
    }
    threads_.clear();
}

void DeliveryThreads::deliver(State& state) {
    for (;;) {
        std::optional<QueuedMessage> queued;
        try {
            queued = state.source->next();
        } catch (...) {
            logLoss();
            continue;
        }
        if (!queued) {
            return;
        }
        queued->whileQueued.reset();
        try {
            state.handler(queued->message);
        } catch (...) {
            logFailure("handler", queued->message.channel());
        }
    }
}

std::size_t deliveryThreadCount(const std::string& channel,
                                const std::vector<std::string>& concurrentChannels,
                                std::size_t concurrency) {
    if (std::find(concurrentChannels.begin(), concurrentChannels.end(), channel) ==
        concurrentChannels.end()) {
        return 1;
    }
    return concurrency != 0 ? concurrency
                            : std::max<std::size_t>(2, std::thread::hardware_concurrency());
}

}  // namespace platform::messaging
