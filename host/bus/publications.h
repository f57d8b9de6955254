// SPDX-License-Identifier: Apache-2.0
// Collects what the bundle publishes while it handles one message.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "platform/data_buffer.h"

namespace host {

struct Publication {
    std::string channel;
    platform::DataBuffer payload;
};

/// Does `work`, and returns what the calling thread published meanwhile through clients that call
/// keepBack(). What `work` throws is passed on.
std::vector<Publication> publicationsOf(const std::function<void()>& work);

/// To be called by a client before it publishes. Within publicationsOf() it takes the message over
/// and returns true.
bool keepBack(const std::string& channel, platform::DataBuffer& payload);

}  // namespace host
