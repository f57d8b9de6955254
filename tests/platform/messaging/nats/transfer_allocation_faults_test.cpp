// SPDX-License-Identifier: Apache-2.0
// What is left of transfers when any of their allocations fails.
#include <gtest/gtest.h>

#include <chrono>
#include <new>
#include <stdexcept>
#include <string>

#include "platform/messaging/nats/incoming_transfers.h"
#include "platform/messaging/nats/outgoing_transfers.h"
#include "tests/platform/messaging/nats/transfers_support.h"
#include "tests/support/failing_malloc.h"

namespace platform::messaging::nats {
namespace {

constexpr Time start = Time(std::chrono::hours(1));
constexpr std::size_t length = 100;

// Does `work`, which may run out of memory. What is left then is looked at later.
template <typename Work>
void attempt(Work work) {
    try {
        work();
    } catch (const std::bad_alloc&) {
        return;
    } catch (const std::runtime_error&) {  // of a DataBuffer
        return;
    }
}

TEST(TransferAllocationFaults, LeaveRequestsThatCanBeOfferedAgain) {
    for (long failing = 0, allocations = 1; failing < allocations; ++failing) {
        SCOPED_TRACE("allocation " + std::to_string(failing));
        TestMemory memory(2 * length);  // for two of the requests at a time
        IncomingTransfers transfers("w1", {}, memory.reserve());
        const std::string bytes = randomBytes(length);
        const auto ids = {"ada.1", "ada.2", "ada.3", "ben.1", "ben.2"};
        test::failAllocation(failing, test::Failing::one);
        for (const char* id : ids) {
            attempt([&] { transfers.offer("/write", address(id), length, start); });
        }
        attempt([&] { transfers.piece("ada.1", 0, bytes, start); });
        attempt([&] { transfers.stop("ada.2", start); });
        attempt([&] { transfers.tick(start + std::chrono::seconds(6)); });
        allocations = test::stopFailing();
        for (const char* id : ids) {
            transfers.stop(id, start);
        }
        EXPECT_EQ(transfers.count(), 0U);
        EXPECT_EQ(memory.used(), 0U);
        for (const char* id : ids) {
            transfers.offer("/write", address(id), length, start);
            EXPECT_TRUE(transfers.piece(id, 0, bytes, start).request) << id;
        }
    }
}

TEST(TransferAllocationFaults, LeaveAnswersThatCanBeGivenAgain) {
    for (long failing = 0, allocations = 1; failing < allocations; ++failing) {
        SCOPED_TRACE("allocation " + std::to_string(failing));
        TestMemory memory(2 * length);  // for two of the answers at a time
        OutgoingTransfers transfers("w1", memory.reserve());
        const std::string bytes = randomBytes(length);
        const auto ids = {"ben.1", "ada.1", "ada.2"};
        test::failAllocation(failing, test::Failing::one);
        for (const char* id : ids) {
            attempt([&] { transfers.answer(address(id), DataBuffer::copyOf(bytes), start); });
        }
        attempt([&] { transfers.room("ben.1", length, start); });
        attempt([&] { transfers.tick(start + std::chrono::seconds(60)); });
        allocations = test::stopFailing();
        for (const char* id : ids) {
            transfers.stop(id);
        }
        EXPECT_EQ(transfers.count(), 0U);
        EXPECT_EQ(memory.used(), 0U);
        for (const char* id : ids) {
            transfers.answer(address(id), DataBuffer::copyOf(bytes), start);
            EXPECT_EQ(transfers.room(id, length, start).size(), 1U) << id;
        }
    }
}

}  // namespace
}  // namespace platform::messaging::nats
