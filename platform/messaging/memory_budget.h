// SPDX-License-Identifier: Apache-2.0
// A budget for the memory of requests and messages: what is large reserves its bytes before it
// allocates them.
#pragma once

#include <cstddef>
#include <functional>
#include <memory>
#include <optional>

#include "platform/messaging/message_service.h"

namespace platform::messaging {

/// A number of bytes from which reservations are taken. It allocates nothing itself.
///
/// Reserve everything that a piece of work needs at once: two that each hold a part of the budget
/// while they wait for the rest would deadlock.
///
/// All operations may be called from any thread. Reservations may outlive the budget.
class [[gnu::visibility("default")]] MemoryBudget {
    struct State;

public:
    /// Bytes of the budget, which are given back when this object ends. Move-only.
    class [[gnu::visibility("default")]] Reservation {
    public:
        /// Reserves nothing.
        Reservation() noexcept = default;
        Reservation(Reservation && other) noexcept;
        Reservation& operator=(Reservation&& other) noexcept;
        Reservation(const Reservation&) = delete;
        Reservation& operator=(const Reservation&) = delete;
        ~Reservation();

        std::size_t bytes() const noexcept {
            return bytes_;
        }

        /// Gives back all but `bytes`; does nothing when fewer are reserved.
        void shrink(std::size_t bytes) noexcept;

    private:
        friend class MemoryBudget;
        Reservation(std::shared_ptr<State> state, std::size_t bytes) noexcept;

        std::shared_ptr<State> state_;
        std::size_t bytes_ = 0;
    };

    /// A budget of `size` bytes, all of them free.
    explicit MemoryBudget(std::size_t size);

    MemoryBudget(const MemoryBudget&) = delete;
    MemoryBudget& operator=(const MemoryBudget&) = delete;
    ~MemoryBudget();

    std::size_t size() const noexcept;

    /// The bytes that are reserved now.
    std::size_t reserved() const;

    /// Reserves `bytes` if they are free and no call of `reserve` is waiting.
    std::optional<Reservation> tryReserve(std::size_t bytes);

    /// Reserves `bytes` as soon as they are free. Calls are served in the order in which they come,
    /// so that small ones cannot delay a large one for ever. Throws std::length_error when the
    /// budget has fewer bytes altogether.
    Reservation reserve(std::size_t bytes);

    /// Calls `callback` whenever bytes have been given back, on the thread that gives them back:
    /// whoever was refused by `tryReserve` may try again. It must neither throw nor end the
    /// handle, and it must not take a lock that is held while bytes are given back. It lasts as
    /// long as the returned handle: when the handle's destruction returns, it is not running and
    /// will not run again.
    [[nodiscard]] std::shared_ptr<Subscription> onRoom(std::function<void()> callback);

private:
    std::shared_ptr<State> state_;
};

}  // namespace platform::messaging
