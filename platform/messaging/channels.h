// SPDX-License-Identifier: Apache-2.0
// The channels on which the bundle and its clients meet (docs/protocol.md).
#pragma once

namespace platform::messaging {

/// The channel on which the bundle takes read requests.
inline constexpr const char* readRequestChannel = "/zpr/service/readRequest_cpp";

/// What precedes the "rtcId" of a read request in the channel of its response.
inline constexpr const char* readResponsePrefix = "/zpr/service/readResponse/";

/// The channel on which the bundle takes write requests.
inline constexpr const char* writeRequestChannel = "/zpr/service/writeRequest_cpp";

/// What precedes the "rtcId" of a write request in the channel of its response.
inline constexpr const char* writeResponsePrefix = "/zpr/service/writeResponse/";

/// The channel on which the bundle tells that a file may have changed.
inline constexpr const char* notificationChannel = "/zpr/service/notifyFileSystemRequest";

/// The channel on which the host takes questions about files.
inline constexpr const char* filesRequestChannel = "/zpr/service/filesRequest_host";

/// What precedes the "rtcId" of such a question in the channel of its answer.
inline constexpr const char* filesResponsePrefix = "/zpr/service/filesResponse/";

/// What follows a request channel in the one on which requests are offered that are too long for
/// one message.
inline constexpr const char* offerSuffix = "/offer";

/// What precedes "<worker>.<rtcId>" in the channel on which a client speaks to one worker about a
/// message in pieces.
inline constexpr const char* piecesPrefix = "/zpr/service/piece.";

}  // namespace platform::messaging
