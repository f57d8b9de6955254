// SPDX-License-Identifier: Apache-2.0
// Admission control: the bundle is given a request when there is memory for it, so that no request
// takes the memory of another one.
#pragma once

#include <cstddef>
#include <memory>

#include "host/metrics/request_metrics.h"
#include "platform/messaging/memory_budget.h"
#include "platform/messaging/message_service.h"

namespace host {

/// The memory that is shared out. A document waits for memory while its request holds some, so each
/// has a budget of its own: nothing that holds memory for documents waits for memory for requests.
struct RequestBudgets {
    RequestBudgets(std::size_t requestBytes, std::size_t documentBytes);

    std::shared_ptr<platform::messaging::MemoryBudget> requests;   ///< and the values in them
    std::shared_ptr<platform::messaging::MemoryBudget> documents;  ///< that they ask for
};

/// A client that does what `client` does, except that the handler of a subscription gets a large
/// message only when `budgets.requests` has the memory for it: its bytes, and what its JSON values
/// take when they are parsed (json::memoryToParse). What is large is up to the size of the budget.
///
/// Of the large messages of a channel one is handled at a time, in the order in which they come, so
/// that other threads stay free for small ones. A message that exceeds the whole budget, or arrives
/// when too many bytes wait, is refused: the log says so, and the answer is an "exception" for a
/// read request and `false` for a write request whose "rtcId" is known.
///
/// Requests that wait for others to be done, and those that are refused, are counted in `metrics`.
///
/// The memory of a large message's values is given back to the system when they have been handled.
/// What the handler throws for a large message is logged.
///
/// awaitMemory() takes what it is asked for from `budgets.documents`; what goes beyond that
/// altogether waits until it has all of it.
std::shared_ptr<platform::messaging::MessageService> admittingRequests(
    std::shared_ptr<platform::messaging::MessageService> client, RequestBudgets budgets,
    std::shared_ptr<RequestMetrics> metrics = std::make_shared<RequestMetrics>());

}  // namespace host
