// SPDX-License-Identifier: Apache-2.0
// The two request handlers.

#include <cstddef>
#include <utility>

#include "json/parser.h"
#include "platform/filesystem/filesystem.h"
#include "platform/i18n/codecvt.h"
#include "serialization/serialization.h"

namespace EditorServices {

using platform::filesystem::exists;
using platform::i18n::to_ustring;
using platform::messaging::JsonMessage;

json::Object Serialization::parseMessage(const JsonMessage& message) const {
    return json::parse(message.payload());
}

void Serialization::handleReadRequest(const JsonMessage& message) {
    json::Object request = parseMessage(message);
    const std::string rtcId = request[rtcIdKey].get<std::string>();
    const std::string contentType = request[contentTypeKey].get<std::string>();
    const std::string filePath = request[filePathKey].get<std::string>();

    std::u16string path = to_ustring(filePath);
    const std::string channel = readResponsePrefix + rtcId;
    const std::size_t longestAnswer = messageService->maxPayload(channel);
    json::Object result = contentType == packageContentType
                              ? readPackageDocument(std::move(path), longestAnswer)
                              : readTextDocument(std::move(path), longestAnswer);
    publishReadResult(channel, std::move(result), longestAnswer);
}

void Serialization::handleWriteRequest(const JsonMessage& message) {
    json::Object request = parseMessage(message);
    const std::string rtcId = request[rtcIdKey].get<std::string>();
    const std::string contentType = request[contentTypeKey].get<std::string>();
    const std::string filePath = request[filePathKey].get<std::string>();
    json::Value content = std::move(request[contentKey]);

    std::u16string path = to_ustring(filePath);
    // Asked before anything is written, so that the notification can tell a new file from a
    // replaced one.
    const bool existed = exists(path);

    bool written = false;
    if (contentType == packageContentType) {
        written = writePackageDocument(std::move(path), std::move(content.get<json::Object>()));
    } else {
        // The encoding is read first: when both keys are wrong, it is the one that the failure
        // names.
        std::string encoding = request[encodingKey].get<std::string>();
        written = writeTextDocument(std::move(path), std::move(content.get<std::string>()),
                                    std::move(encoding));
    }
    // Sent whatever the result: a writer that answers false may still have changed the file.
    notifyFileSystem(filePath, existed);
    publish(writeResponsePrefix + rtcId, written);
}

}  // namespace EditorServices
