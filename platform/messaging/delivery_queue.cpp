// The queue is a plain deque under a mutex; its threads take messages off it until it is closed.
#include "platform/messaging/delivery_queue.h"

#include <condition_variable>
#include <deque>
#include <mutex>
#include <optional>
#include <utility>

#include "platform/messaging/log.h"
#include "platform/messaging/revocable_function.h"

namespace platform::messaging {

struct DeliveryQueue::State {
    explicit State(MessageHandler messageHandler) : handler(std::move(messageHandler)) {}

    // Waits for the next message; none when the queue has been closed.
    std::optional<QueuedMessage> next() {
        std::unique_lock lock(mutex);
        changed.wait(lock, [this] { return closed || !messages.empty(); });
        if (closed) {
            return std::nullopt;
        }
        std::optional<QueuedMessage> message(std::move(messages.front()));
        messages.pop_front();
        return message;
    }

    RevocableFunction<const JsonMessage&> handler;

    std::mutex mutex;  // guards what follows
    std::condition_variable changed;
    std::deque<QueuedMessage> messages;  // of the closing thread alone once closed
    bool closed = false;
};

DeliveryQueue::DeliveryQueue(MessageHandler handler, std::size_t threads)
    : state_(std::make_shared<State>(std::move(handler))) {
    try {
        threads_.reserve(threads);
        while (threads_.size() < threads) {
            threads_.emplace_back([state = state_] { deliver(*state); });
        }
    } catch (...) {
        close();
        throw;
    }
}

DeliveryQueue::~DeliveryQueue() {
    close();
}

void DeliveryQueue::push(QueuedMessage message) {
    {
        const std::lock_guard lock(state_->mutex);
        if (state_->closed) {
            return;
        }
        state_->messages.push_back(std::move(message));
    }
    state_->changed.notify_one();
}

void DeliveryQueue::close() {
    {
        const std::lock_guard lock(state_->mutex);
        if (state_->closed) {
            return;
        }
        state_->closed = true;
    }
    state_->changed.notify_all();
    // Nobody else touches the messages of a closed queue, and what their senders want released may
    // take locks of its own. (Another deque to move them to would take memory, as few would expect;
    // this must not fail.)
    state_->messages.clear();
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

void DeliveryQueue::deliver(State& state) {
    while (std::optional<QueuedMessage> queued = state.next()) {
        queued->whileQueued.reset();
        try {
            state.handler(queued->message);
        } catch (...) {
            logFailure("handler", queued->message.channel());
        }
    }
}

}  // namespace platform::messaging
