// SPDX-License-Identifier: Apache-2.0
#include "platform/messaging/memory_budget.h"

#include <condition_variable>
#include <cstdint>
#include <list>
#include <mutex>
#include <stdexcept>
#include <string>
#include <utility>

namespace platform::messaging {

struct MemoryBudget::State {
    explicit State(std::size_t bytes) : size(bytes) {}

    bool fits(std::size_t bytes) const { return bytes <= size - reserved; }

    // Allocates nothing: memory may have run out.
    void release(std::size_t bytes) noexcept {
        {
            const std::lock_guard lock(mutex);
            reserved -= bytes;
        }
        changed.notify_all();
        const std::lock_guard lock(calling);
        for (const auto& callback : callbacks) {
            callback();
        }
    }

    const std::size_t size;

    std::recursive_mutex calling;  // guards the list, and is held while callbacks run
    std::list<std::function<void()>> callbacks;

    std::mutex mutex;  // guards what follows
    std::condition_variable changed;
    std::size_t reserved = 0;
    std::uint64_t nextTicket = 0;     // of the next call of reserve
    std::uint64_t servedTickets = 0;  // the call whose ticket this is comes next
};

MemoryBudget::Reservation::Reservation(std::shared_ptr<State> state, std::size_t bytes) noexcept
    : state_(std::move(state)), bytes_(bytes) {}

MemoryBudget::Reservation::Reservation(Reservation&& other) noexcept
    : state_(std::move(other.state_)), bytes_(std::exchange(other.bytes_, 0)) {}

MemoryBudget::Reservation& MemoryBudget::Reservation::operator=(Reservation&& other) noexcept {
    Reservation taken(std::move(other));
    state_.swap(taken.state_);
    std::swap(bytes_, taken.bytes_);
    return *this;
}

MemoryBudget::Reservation::~Reservation() {
    shrink(0);
}

void MemoryBudget::Reservation::shrink(std::size_t bytes) noexcept {
    if (bytes < bytes_) {
        state_->release(std::exchange(bytes_, bytes) - bytes);
    }
}

MemoryBudget::MemoryBudget(std::size_t size) : state_(std::make_shared<State>(size)) {}

MemoryBudget::~MemoryBudget() = default;

std::size_t MemoryBudget::size() const noexcept {
    return state_->size;
}

std::size_t MemoryBudget::reserved() const {
    const std::lock_guard lock(state_->mutex);
    return state_->reserved;
}

std::optional<MemoryBudget::Reservation> MemoryBudget::tryReserve(std::size_t bytes) {
    const std::lock_guard lock(state_->mutex);
    if (state_->nextTicket != state_->servedTickets || !state_->fits(bytes)) {
        return std::nullopt;
    }
    state_->reserved += bytes;
    return Reservation(state_, bytes);
}

MemoryBudget::Reservation MemoryBudget::reserve(std::size_t bytes) {
    if (bytes > state_->size) {
        throw std::length_error(std::to_string(bytes) + " bytes do not fit in a budget of " +
                                std::to_string(state_->size));
    }
    {
        std::unique_lock lock(state_->mutex);
        const std::uint64_t ticket = state_->nextTicket++;
        state_->changed.wait(
            lock, [&] { return ticket == state_->servedTickets && state_->fits(bytes); });
        state_->reserved += bytes;
        ++state_->servedTickets;
    }
    state_->changed.notify_all();
    return {state_, bytes};
}

std::shared_ptr<Subscription> MemoryBudget::onRoom(std::function<void()> callback) {
    class Watch final : public Subscription {
    public:
        Watch(std::shared_ptr<State> state, std::function<void()> callback)
            : state_(std::move(state)) {
            const std::lock_guard lock(state_->calling);
            callback_ = state_->callbacks.insert(state_->callbacks.end(), std::move(callback));
        }

        ~Watch() override {
            const std::lock_guard lock(state_->calling);
            state_->callbacks.erase(callback_);
        }

    private:
        const std::shared_ptr<State> state_;
        std::list<std::function<void()>>::iterator callback_;
    };
    return std::make_shared<Watch>(state_, std::move(callback));
}

}  // namespace platform::messaging
