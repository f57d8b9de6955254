// SPDX-License-Identifier: Apache-2.0
// Which requests come on a channel.
#pragma once

#include <optional>
#include <string_view>

#include "host/metrics/request_metrics.h"
#include "platform/messaging/channels.h"

namespace host {

/// The kind of the bundle's requests that come on `channel`; none for another channel.
inline std::optional<RequestKind> requestKindOf(std::string_view channel) {
    if (channel == platform::messaging::readRequestChannel) {
        return RequestKind::read;
    }
    if (channel == platform::messaging::writeRequestChannel) {
        return RequestKind::write;
    }
    return std::nullopt;
}

}  // namespace host
