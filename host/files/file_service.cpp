// SPDX-License-Identifier: Apache-2.0
#include "host/files/file_service.h"

#include <limits.h>
#include <spdlog/spdlog.h>

#include <cerrno>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <exception>
#include <filesystem>
#include <map>
#include <mutex>
#include <sstream>
#include <stdexcept>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

#include "host/bus/publications.h"
#include "host/files/folder_list.h"
#include "host/guard/document_version.h"
#include "host/guard/file_content.h"
#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/i18n/codecvt.h"
#include "platform/i18n/detect_charset.h"
#include "platform/messaging/channels.h"
#include "platform/posix/file_descriptor.h"
#include "platform/posix/file_in_memory.h"
#include "platform/posix/open_regular_file.h"
#include "platform/posix/system_error.h"

namespace host {

namespace {

using platform::DataBuffer;
using platform::FileDescriptor;
using platform::FileInMemory;
using platform::messaging::JsonMessage;
using platform::messaging::MessageService;

constexpr std::size_t entriesOfAPage = 1000;

// The regular file at `path`; none where there is none.
FileDescriptor openDocument(const std::string& path) {
    platform::OpenedFile opened = platform::openRegularFile(path);
    if (opened.error != 0 && opened.error != ENOENT) {
        throw std::system_error(opened.error, std::generic_category(), "The file cannot be opened");
    }
    if (opened.error == 0 && !opened.descriptor) {
        throw std::runtime_error("It is not a regular file");
    }
    return std::move(opened.descriptor);
}

bool hasMark(const std::string& bytes, const std::string& charset) {
    try {
        platform::i18n::codecvt_ustring_to_string converter(charset, true);
        return bytes.starts_with(platform::i18n::to_string(u"\uFEFF", converter));
    } catch (const std::runtime_error&) {
        return false;  // Most charsets have none.
    }
}

// A number of milliseconds, which JSON has as a double.
std::int64_t timeIn(const json::Value& value) {
    const double time = value.get<double>();
    if (!(time >= 0 && time < 1e15)) {
        throw std::runtime_error("\"time\" is none");
    }
    return std::llround(time);
}

using Roots = std::vector<std::filesystem::path>;

// One request. Each operation returns the members of its answer beside "status".
class Request {
public:
    Request(json::Object members, const std::string& answerChannel, MessageService& client,
            const Guard& guard, const Roots& roots)
        : members_(std::move(members)),
          answerChannel_(answerChannel),
          client_(client),
          guard_(guard),
          roots_(roots) {}

    std::string answer() {
        const std::string operation = text("operation");
        if (operation == "readVersion") {
            return readVersion();
        }
        json::Object answer = perform(operation);
        answer["status"] = true;
        return json::serialize(json::Value(std::move(answer)));
    }

private:
    json::Object perform(const std::string& operation) {
        static const std::map<std::string, json::Object (Request::*)()> operations = {
            {"roots", &Request::roots},       {"list", &Request::list},
            {"charset", &Request::charset},   {"version", &Request::version},
            {"versions", &Request::versions}, {"restore", &Request::restore}};
        const auto found = operations.find(operation);
        if (found == operations.end()) {
            throw std::runtime_error("There is no such \"operation\"");
        }
        return (this->*found->second)();
    }

    json::Object roots() {
        json::Array paths;
        for (const std::filesystem::path& root : roots_) {
            paths.emplace_back(root.string());
        }
        return {{"roots", std::move(paths)}};
    }

    json::Object list() {
        const std::string after = members_.contains("after") ? text("after") : std::string();
        const FolderPage page = listFolder(path(), after, entriesOfAPage);
        json::Array entries;
        for (const FolderEntry& entry : page.entries) {
            entries.emplace_back(json::Object{{"name", entry.name},
                                              {"kind", entry.kind},
                                              {"size", static_cast<double>(entry.size)},
                                              {"time", static_cast<double>(entry.time)}});
        }
        return {{"entries", std::move(entries)}, {"isLast", page.isLast}};
    }

    json::Object charset() {
        const FileDescriptor file =
            members_.contains("time") ? earlierVersion() : openDocument(path());
        if (!file) {
            throw std::runtime_error("File does not exist");
        }
        const std::string bytes = bytesOf(file);
        std::ostringstream ignored;
        const std::string charset =
            platform::i18n::detect_charset(bytes.data(), bytes.size(), ignored, u"");
        return {{"charset", charset}, {"byteOrderMark", hasMark(bytes, charset)}};
    }

    json::Object version() {
        const FileDescriptor file = openDocument(path());
        return {{"version", file ? versionOf(file.get()) : std::string()}};
    }

    json::Object versions() {
        json::Array versions;
        for (const EarlierVersion& version : history().versionsOf(History::nameOf(path()))) {
            versions.emplace_back(json::Object{{"time", static_cast<double>(version.time)},
                                               {"size", static_cast<double>(version.size)}});
        }
        return {{"versions", std::move(versions)}};
    }

    json::Object restore() {
        const std::string file = path();
        const FileDescriptor current = openDocument(file);
        const bool existed = static_cast<bool>(current);
        client_.awaitMemory(existed ? sizeOf(current.get()) : 0);  // for a copy, if done in place
        guard_.saves->restore(file, earlierVersion().get());
        json::Object notification{{"filePath", file}, {"isExistingFile", existed}};
        client_.publish(platform::messaging::notificationChannel,
                        DataBuffer::copyOf(json::serialize(json::Value(std::move(notification)))));
        return {};
    }

    // The bundle's answer to a read request for the version. The bundle's thread may not open the
    // version in its folder, but it can open a copy in memory. There is one copy at a time: what is
    // reserved for it is given back when the bundle waits for memory of its own.
    std::string readVersion() {
        static std::mutex oneAtATime;
        const std::lock_guard lock(oneAtATime);
        const FileDescriptor version = earlierVersion();
        FileInMemory copy("earlier version");
        const std::size_t size = sizeOf(version.get());
        client_.awaitMemory(size);
        copy.reserve(size);
        copyContent(version.get(), copy.descriptor().get());
        json::Object request{
            {"rtcId", ""}, {"contentType", text("contentType")}, {"filePath", copy.path()}};
        const auto payload =
            std::make_shared<const std::string>(json::serialize(json::Value(std::move(request))));
        const std::vector<Publication> publications = publicationsOf(
            [&] {
                (*guard_.read)(JsonMessage(
                    std::make_shared<const std::string>(platform::messaging::readRequestChannel),
                    std::string_view(*payload), payload));
            },
            client_.maxPayload(answerChannel_));
        return std::string(publications.at(0).payload.view());
    }

    // Finding its charset takes up to three times a text's bytes beside them.
    std::string bytesOf(const FileDescriptor& file) {
        const std::size_t size = sizeOf(file.get());
        platform::i18n::requireTextLength(size);
        client_.awaitMemory(4 * size);
        return readContent(file.get());
    }

    FileDescriptor earlierVersion() {
        return history().open(History::nameOf(path()), timeIn(members_["time"]));
    }

    History& history() const {
        if (!guard_.history) {
            throw std::runtime_error("No earlier versions are kept");
        }
        return *guard_.history;
    }

    const std::string& text(const std::string& key) { return members_[key].get<std::string>(); }

    std::string path() {
        const std::string& path = text("filePath");
        if (path.find('\0') != std::string::npos) {
            throw std::runtime_error("\"filePath\" holds a zero");
        }
        if (path.size() >= PATH_MAX) {
            throw std::runtime_error("\"filePath\" is too long");
        }
        return path;
    }

    json::Object members_;
    const std::string& answerChannel_;
    MessageService& client_;
    const Guard& guard_;
    const Roots& roots_;
};

std::string failure(const char* reason) {
    return json::serialize(json::Value(json::Object{{"exception", reason}, {"status", false}}));
}

void answer(const JsonMessage& message, MessageService& client, const Guard& guard,
            const Roots& roots) {
    json::Object members = json::parse(message.payload());
    const std::string channel =
        platform::messaging::filesResponsePrefix + members["rtcId"].get<std::string>();
    std::string answer;
    try {
        answer = Request(std::move(members), channel, client, guard, roots).answer();
    } catch (const std::exception& error) {
        answer = failure(error.what());
    }
    try {
        client.publish(channel, DataBuffer::copyOf(answer)).get();
    } catch (const std::exception& error) {  // as when it is too large for the servers
        client.publish(channel, DataBuffer::copyOf(failure(error.what())));
    }
}

}  // namespace

FileService::FileService(std::shared_ptr<MessageService> client, Guard guard, Roots roots)
    : subscription_(client
                        ->subscribe(platform::messaging::filesRequestChannel,
                                    [client, guard = std::move(guard),
                                     roots = std::move(roots)](const JsonMessage& message) {
                                        answer(message, *client, guard, roots);
                                    })
                        .get()) {}

}  // namespace host
