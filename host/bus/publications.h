// SPDX-License-Identifier: Apache-2.0
// Collects what the bundle publishes while it handles one message.
#pragma once

#include <cstddef>
#include <functional>
#include <limits>
#include <optional>
#include <string>
#include <vector>

#include "platform/data_buffer.h"

namespace host {

struct Publication {
    std::string channel;
    platform::DataBuffer payload;
};

/// Does `work`, and returns what the calling thread published meanwhile through clients that call
/// keepBack(). Such clients give `longest` as the length of the longest payload. What `work` throws
/// is passed on.
std::vector<Publication> publicationsOf(
    const std::function<void()>& work,
    std::size_t longest = std::numeric_limits<std::size_t>::max());

/// To be called by a client before it publishes. Within publicationsOf() it takes the message over
/// and returns true.
bool keepBack(const std::string& channel, platform::DataBuffer& payload);

/// What a client has to give as the length of the longest payload within publicationsOf(); nothing
/// outside.
std::optional<std::size_t> longestKeptBack();

}  // namespace host
