// SPDX-License-Identifier: Apache-2.0
// Lets several sources of one subscription take turns, so that messages are handled one at a time.
#pragma once

#include <condition_variable>
#include <memory>
#include <mutex>
#include <optional>
#include <utility>

#include "platform/messaging/delivery_threads.h"

namespace platform::messaging {

/// Which source's message is being handled. Shared by the sources.
class Turns : public std::enable_shared_from_this<Turns> {
public:
    /// Waits until no message is being handled. The result ends the turn when it is destroyed; null
    /// when there will be no more.
    std::shared_ptr<const void> take() {
        std::unique_lock lock(mutex_);
        changed_.wait(lock, [this] { return ended_ || !taken_; });
        if (ended_) {
            return nullptr;
        }
        taken_ = true;
        return {this, [self = shared_from_this()](const void*) { self->give(); }};
    }

    void end() {
        {
            const std::lock_guard lock(mutex_);
            ended_ = true;
        }
        changed_.notify_all();
    }

private:
    void give() {
        {
            const std::lock_guard lock(mutex_);
            taken_ = false;
        }
        changed_.notify_one();
    }

    std::mutex mutex_;  // guards what follows
    std::condition_variable changed_;
    bool taken_ = false;
    bool ended_ = false;
};

/// A source that gives out messages when it is its turn.
class TurnTakingSource final : public MessageSource {
public:
    TurnTakingSource(std::shared_ptr<MessageSource> source, std::shared_ptr<Turns> turns)
        : source_(std::move(source)), turns_(std::move(turns)) {}

    std::optional<QueuedMessage> next() override {
        std::optional<QueuedMessage> message = source_->next();
        if (message) {
            message->untilDone = turns_->take();
            if (!message->untilDone) {
                return std::nullopt;
            }
        }
        return message;
    }

    /// Ends the turns of the others, too: they belong to the same subscription.
    void end() override {
        turns_->end();
        source_->end();
    }

private:
    const std::shared_ptr<MessageSource> source_;
    const std::shared_ptr<Turns> turns_;
};

}  // namespace platform::messaging
