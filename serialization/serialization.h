// SPDX-License-Identifier: Apache-2.0
// Serialization: the bundle's one service object. It answers the read and write requests that
// arrive on the host's message service and holds, as constant members, every name that goes on the
// wire.
#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "json/value.h"
#include "platform/messaging/channels.h"
#include "platform/messaging/message_service.h"
#include "platform/package/quillet_file_package.h"

namespace EditorServices {

/// Lives at one address from construction to destruction, because the subscribed handlers hold a
/// pointer to it. Its constants never change and its handlers keep no state, so requests may be
/// handled on several threads at once.
class Serialization {
public:
    /// Starts the asynchronous connection to the message service and returns without waiting for
    /// it. Throws what initializeMessageService throws.
    Serialization();

    /// Releases the subscriptions, the write channel's first, and then the message service;
    /// disconnecting takes no more than that.
    ~Serialization() = default;

    Serialization(const Serialization&) = delete;
    Serialization& operator=(const Serialization&) = delete;

    // The members are made in this order and released in the reverse one.

    const std::string serviceName{"EditorSerialization"};

    const std::string readRequestChannel{platform::messaging::readRequestChannel};
    const std::string readResponsePrefix{platform::messaging::readResponsePrefix};
    const std::string writeRequestChannel{platform::messaging::writeRequestChannel};
    const std::string writeResponsePrefix{platform::messaging::writeResponsePrefix};

    const std::string rtcIdKey{"rtcId"};
    const std::string contentTypeKey{"contentType"};
    const std::string packageContentType{"text/xml"};
    const std::string filePathKey{"filePath"};
    const std::string contentKey{"content"};
    const std::string encodingKey{"encoding"};

    const std::string partsKey{"parts"};
    const std::string relationshipsKey{"relationships"};
    const std::string partUriKey{"partUri"};
    const std::string relationshipKey{"relationship"};
    const std::string relationshipTypeKey{"relationshipType"};
    const std::string targetKey{"target"};
    const std::string targetModeKey{"targetMode"};
    const std::string relationshipIdKey{"relationshipId"};

    /// What cleaned text carries in place of each code unit that it must not contain.
    const char16_t replacementChar{u'\uFFFD'};

    const std::string applicationPrefix{"application/"};
    const std::string dataUriPrefix{"data:"};
    const std::string imagePrefix{"image/"};

    /// A valid character, but office programs fail on it inside a package's text.
    const char16_t zeroWidthSpace{u'\u200B'};

    /// Code units are compared with it as signed 32-bit integers.
    const std::int32_t firstNonCharacter{0xFFFE};

    const std::string notifyFileSystemChannel{platform::messaging::notificationChannel};
    const std::string isExistingFileKey{"isExistingFile"};

    // Which code units cleaned text must not contain.

    /// Whether `unit` is U+FFFE or U+FFFF.
    bool isNonCharacter(char16_t unit) const noexcept;

    /// Whether `unit` is the zero-width space.
    bool isZeroWidthSpace(char16_t unit) const noexcept;

    /// Whether `unit` is a C0 control other than tab, line feed and carriage return, DEL or a C1
    /// control.
    bool isDisallowedControl(char16_t unit) const noexcept;

    /// Whether `unit` is any C0 control, DEL or a C1 control.
    bool isControl(char16_t unit) const noexcept;

    // Start-up and stop.

    /// Asks for the client `serviceName` and, once it is there, subscribes the two request channels
    /// on the thread that delivers it. Later failures are silent: the bundle then answers no
    /// requests. Throws std::runtime_error when it cannot even ask for the client.
    void initializeMessageService();

    /// Called when the host stops the bundle. Does nothing on purpose: requests are answered until
    /// the object is destroyed.
    void stop() noexcept {}

    /// No limit to the length of an answer.
    static constexpr std::size_t anyLength = std::numeric_limits<std::size_t>::max();

    // Reading. An exception that leaves a request handler means that the request gets no answer.

    /// The payload as an object; empty when it is not one whole JSON object.
    json::Object parseMessage(const platform::messaging::JsonMessage& message) const;

    /// Reads the document that the request names and publishes it, or what stopped the reading, on
    /// the caller's read response channel. Throws std::runtime_error, with nothing published, when
    /// a key is missing or has the wrong kind or the path is not UTF-8.
    void handleReadRequest(const platform::messaging::JsonMessage& message);

    // Reading a text file. Paths are passed by value down the chain, so that each step owns its
    // own.

    /// The result object of a read: "status" with "data", or with "exception", as always for a file
    /// that is longer than `longestAnswer` bytes. Throws nothing that derives from std::exception.
    /// Linear in the size of the file, which is held in memory whole.
    json::Object readTextDocument(std::u16string path, std::size_t longestAnswer = anyLength) const;

    /// The text of the file at `path` in the file's own charset, without a byte-order mark.
    /// Throws what readTextFile throws.
    std::string readTextFileContent(std::u16string path) const;

    /// The file's text, decoded and without its byte-order mark; `charset` becomes the detected
    /// charset. Throws std::runtime_error when the file breaks off with an input error.
    std::u16string readTextFile(std::u16string path, std::string& charset) const;

    /// The bytes of the file at `path`; none when it cannot be opened or is not a regular file,
    /// whose end might never come. Throws std::runtime_error when the file is larger than a text
    /// may be, and when reading fails half-way, since a part of a document must not be mistaken for
    /// the whole.
    std::string readFileBytes(std::u16string path) const;

    // Reading a document package.

    /// The result object of a read: "status" with the package's parts and relationships, or with
    /// "exception", as always for a package whose parts have more than `longestAnswer` bytes;
    /// "status" alone when nothing is at `path`. Throws nothing that derives from std::exception.
    json::Object readPackageDocument(std::u16string path,
                                     std::size_t longestAnswer = anyLength) const;

    /// The document JSON of `package`: its parts under "parts", its own relationships under
    /// "relationships". This and the conversions below throw std::runtime_error for text that is
    /// not valid UTF-16, and are linear in the size of what they convert.
    json::Object packageToJson(platform::package::QuilletFilePackage package) const;

    /// One object for each part, in order.
    json::Array partsToJson(std::vector<platform::package::QuilletFilePackage::Part> parts) const;

    /// The part with its content type, its URI, its content as encodePartContent gives it, and its
    /// relationships under the singular "relationship".
    json::Object partToJson(platform::package::QuilletFilePackage::Part part) const;

    /// One object for each relationship, in order.
    json::Array relationshipsToJson(
        const std::vector<platform::package::QuilletFilePackage::Relationship>& relationships)
        const;

    /// The relationship, with an empty "targetMode" whatever its mode is.
    json::Object relationshipToJson(
        const platform::package::QuilletFilePackage::Relationship& relationship) const;

    /// The "content" of a part: its bytes as they are, or a base64 data URI for the "image/" types,
    /// unless the bytes are such a URI already. Throws std::runtime_error "Out of memory!".
    std::string encodePartContent(std::vector<std::uint8_t> bytes,
                                  const std::string& contentType) const;

    // Writing.

    /// Reads the content of a write request, writes it to the file that the request names,
    /// announces the change and answers with a boolean, in this order. Throws std::runtime_error,
    /// with nothing written, announced or answered, when a key is missing or has the wrong kind or
    /// the path is not UTF-8.
    void handleWriteRequest(const platform::messaging::JsonMessage& message);

    /// Writes `text`, which is in `charset`, over the file at `path`. False, with the file
    /// untouched, when the charset is unknown or the text is not valid in it; else what
    /// writeTextFileContent answers, or false when that throws a std::exception. Linear in the
    /// text's length.
    bool writeTextDocument(std::u16string path, std::string text, std::string charset) const;

    /// Truncates the file at `path` and writes `text` to it in `charset`, in place and without a
    /// byte-order mark. True when the file could be opened, even if writing fails after that.
    /// Throws std::runtime_error, with the file truncated, when the charset cannot hold the text.
    bool writeTextFileContent(std::u16string path, std::u16string text, std::string charset) const;

    /// Writes the package that `document` describes to `path`, replacing what is there as a whole
    /// or not at all. False when the path is empty, an element of the document is faulty or the
    /// package cannot be written. Throws std::runtime_error when "parts" or "relationships" is not
    /// an array.
    bool writePackageDocument(std::u16string path, json::Object document) const;

    /// The parts that the objects of `array` describe. This and the conversions below throw
    /// std::runtime_error when a key is missing, has the wrong kind or holds text that is not
    /// UTF-8, and are linear in the size of what they convert.
    std::vector<platform::package::QuilletFilePackage::Part> partsFromJson(json::Array array) const;

    /// The relationships that the objects of `array` describe; external are those whose
    /// "targetMode" begins with "External", and all of them unless `allowInternal`.
    std::vector<platform::package::QuilletFilePackage::Relationship> relationshipsFromJson(
        json::Array array, bool allowInternal) const;

    /// The bytes of a part. "application/" content is text and is cleaned; "image/" content that is
    /// a data URI is decoded, and throws std::runtime_error where it is not base64; all other
    /// content is taken as it stands.
    std::vector<std::uint8_t> decodePartContent(std::string content,
                                                const std::string& contentType) const;

    /// `text` in UTF-8 with replacementChar in place of each code unit that a package's text must
    /// not contain.
    std::vector<std::uint8_t> cleanTextToUtf8(std::string text) const;

    /// Announces to the host's file views that the file at `filePath` (UTF-8, as the request gave
    /// it) may have changed; `existed` says whether something was there before. Returns without
    /// waiting for anyone. Throws std::runtime_error "Out of memory!" when the message's buffer
    /// cannot be allocated.
    void notifyFileSystem(std::string filePath, const bool& existed) const;

private:
    /// Publishes the JSON text of `value` on `channel`, without waiting for its delivery.
    /// Throws std::runtime_error "Out of memory!" when the message's buffer cannot be allocated.
    void publish(const std::string& channel, json::Value value) const;

    /// The same for the result of a read. A result that is longer than `longestAnswer` is replaced
    /// by one that says so, {"exception": ..., "status": false}, without taking the memory for its
    /// text.
    void publishReadResult(const std::string& channel, json::Value result,
                           std::size_t longestAnswer) const;

    /// Waits until there is memory for a document of `bytes` bytes, its answer, and `more` bytes
    /// besides. Throws std::runtime_error when no answer of up to `longestAnswer` bytes
    /// can hold it.
    void awaitMemory(std::uintmax_t bytes, std::uintmax_t more, std::size_t longestAnswer) const;

    std::shared_ptr<platform::messaging::MessageService> messageService;
    std::shared_ptr<platform::messaging::Subscription> readSubscription;
    std::shared_ptr<platform::messaging::Subscription> writeSubscription;
};

}  // namespace EditorServices
