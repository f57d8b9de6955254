// SPDX-License-Identifier: Apache-2.0
// The channels on which the bundle and its clients meet (docs/protocol.md).
#pragma once

namespace platform::messaging {

/// The channel on which the bundle takes read requests.
inline constexpr const char* readRequestChannel = "/zpr/service/readRequest_cpp";

/// The prefix of the channel of a read response; the request's "rtcId" follows.
inline constexpr const char* readResponsePrefix = "/zpr/service/readResponse/";

/// The channel on which the bundle takes write requests.
inline constexpr const char* writeRequestChannel = "/zpr/service/writeRequest_cpp";

/// The prefix of the channel of a write response; the request's "rtcId" follows.
inline constexpr const char* writeResponsePrefix = "/zpr/service/writeResponse/";

/// The channel on which the bundle announces that a file may have changed.
inline constexpr const char* notificationChannel = "/zpr/service/notifyFileSystemRequest";

/// The channel on which the host takes requests about files.
inline constexpr const char* filesRequestChannel = "/zpr/service/filesRequest_host";

/// The prefix of the channel of its answer; the request's "rtcId" follows.
inline constexpr const char* filesResponsePrefix = "/zpr/service/filesResponse/";

/// Appended to a request channel, the channel for offers of requests that are too long for one
/// message.
inline constexpr const char* offerSuffix = "/offer";

/// The prefix of the channel on which a client speaks to one worker about a message in pieces;
/// "<worker>.<rtcId>" follows.
inline constexpr const char* piecesPrefix = "/zpr/service/piece.";

}  // namespace platform::messaging
