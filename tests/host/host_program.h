// SPDX-License-Identifier: Apache-2.0
// The host's program, as the tests run it.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <initializer_list>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "host/commands/framing.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/messaging/channels.h"
#include "tests/support/message.h"
#include "tests/support/subprocess.h"

namespace test {

/// The command line of the program with `arguments`.
inline std::vector<std::string> hostCommand(std::initializer_list<std::string> arguments) {
    std::vector<std::string> command{SERIALIZATION_HOST};
    command.insert(command.end(), arguments);
    return command;
}

/// A read request of a text file.
inline std::string readRequest(const std::string& rtcId, const std::string& file) {
    json::Object request;
    request["rtcId"] = rtcId;
    request["contentType"] = "text/plain";
    request["filePath"] = file;
    return json::serialize(request);
}

/// `payload` framed as a message on `channel`.
inline std::string framed(std::string_view channel, std::string_view payload) {
    return host::frameHeaders(channel, payload.size()).append(payload);
}

/// A read request of a text file, framed.
inline std::string framedReadRequest(const std::string& rtcId, const std::string& file) {
    return framed(platform::messaging::readRequestChannel, readRequest(rtcId, file));
}

/// The messages that `frames` consists of. Throws host::FramingError when it is anything else.
inline std::vector<Message> messagesIn(std::string_view frames) {
    host::FrameReader reader(
        [&frames](char* to, std::size_t room) {
            const std::size_t count = std::min(room, frames.size());
            std::memcpy(to, frames.data(), count);
            frames.remove_prefix(count);
            return count;
        },
        frames.size());
    std::vector<Message> messages;
    while (std::optional<host::Frame> frame = reader.next()) {
        messages.push_back({std::move(frame->channel), std::string(frame->payload.view())});
    }
    return messages;
}

}  // namespace test
