// SPDX-License-Identifier: Apache-2.0
// Owners of what libnats creates, and its failures as exceptions.
#pragma once

#include <nats/nats.h>

#include <memory>
#include <stdexcept>
#include <string>

namespace platform::messaging::nats {

struct Destroy {
    void operator()(natsOptions* options) const noexcept { natsOptions_Destroy(options); }
    void operator()(natsMsg* message) const noexcept { natsMsg_Destroy(message); }
};

using OptionsHandle = std::unique_ptr<natsOptions, Destroy>;

/// A failure that libnats reports.
class NatsError : public std::runtime_error {
public:
    NatsError(const std::string& text, natsStatus status)
        : std::runtime_error(text), status_(status) {}

    natsStatus status() const noexcept { return status_; }

private:
    natsStatus status_;
};

/// Throws NatsError "<failure>: <the reason that libnats gives>." unless `status` is NATS_OK. To be
/// called on the thread of the call that returned `status`.
inline void check(natsStatus status, const std::string& failure) {
    if (status == NATS_OK) {
        return;
    }
    natsStatus detailed = NATS_OK;
    const char* detail = nats_GetLastError(&detailed);
    std::string reason = natsStatus_GetText(status);
    if (detail != nullptr && *detail != '\0' && detailed == status && reason != detail) {
        reason += std::string(" (") + detail + ")";
    }
    throw NatsError(failure + ": " + reason + ".", status);
}

}  // namespace platform::messaging::nats
