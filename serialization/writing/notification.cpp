// SPDX-License-Identifier: Apache-2.0
// Tells the host's file views what changed on disk.

#include <utility>

#include "serialization/serialization.h"

namespace EditorServices {

void Serialization::notifyFileSystem(std::string filePath, const bool& existed) const {
    json::Object notification;
    notification[filePathKey] = std::move(filePath);
    notification[isExistingFileKey] = existed;
    publish(notifyFileSystemChannel, std::move(notification));
}

}  // namespace EditorServices
