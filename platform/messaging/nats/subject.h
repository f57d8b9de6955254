// SPDX-License-Identifier: Apache-2.0
// Which channels can be NATS subjects.
#pragma once

#include <string_view>

namespace platform::messaging::nats {

/// Throws std::invalid_argument, with a text that names the channel, unless `channel` can stand in
/// the protocol as the subject of one message: text in UTF-8, without blanks and controls, of
/// tokens between dots of which none is empty or a wildcard ("*", ">"), and short enough for a
/// server's protocol line. A channel that breaks this could reach other subscribers than its own,
/// or make the server close the connection.
void requireSubject(std::string_view channel);

}  // namespace platform::messaging::nats
