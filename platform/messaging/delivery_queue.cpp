// SPDX-License-Identifier: Apache-2.0
// The queue is a plain deque under a mutex; the threads take messages from it until it is closed.
#include "platform/messaging/delivery_queue.h"

#include <condition_variable>
#include <deque>
#include <mutex>
#include <optional>
#include <utility>

namespace platform::messaging {

class DeliveryQueue::Messages final : public MessageSource {
public:
    void push(QueuedMessage message) {
        {
            const std::lock_guard lock(mutex_);
            if (ended_) {
                return;
            }
            messages_.push_back(std::move(message));
        }
        changed_.notify_one();
    }

    std::optional<QueuedMessage> next() override {
        std::unique_lock lock(mutex_);
        changed_.wait(lock, [this] { return ended_ || !messages_.empty(); });
        if (ended_) {
            return std::nullopt;
        }
        std::optional<QueuedMessage> message(std::move(messages_.front()));
        messages_.pop_front();
        return message;
    }

    void end() override {
        {
            const std::lock_guard lock(mutex_);
            if (ended_) {
                return;
            }
            ended_ = true;
            dropped_.swap(messages_);
        }
        changed_.notify_all();
        dropped_.clear();
    }

private:
    std::mutex mutex_;  // guards what follows
    std::condition_variable changed_;
    std::deque<QueuedMessage> messages_;
    bool ended_ = false;

    // The messages left at the end, to be destroyed without the mutex. Made with the queue, because
    // even an empty deque allocates, and closing a queue must not.
    std::deque<QueuedMessage> dropped_;
};

DeliveryQueue::DeliveryQueue(MessageHandler handler, std::size_t threads)
    : messages_(std::make_shared<Messages>()), threads_(std::move(handler), messages_, threads) {}

DeliveryQueue::~DeliveryQueue() = default;

void DeliveryQueue::push(QueuedMessage message) {
    messages_->push(std::move(message));
}

void DeliveryQueue::close() {
    threads_.close();
}

}  // namespace platform::messaging
