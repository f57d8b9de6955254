// SPDX-License-Identifier: Apache-2.0
#include "host/commands/read_command.h"

#include <simdjson.h>
#include <spdlog/spdlog.h>

#include <algorithm>
#include <cstddef>
#include <map>
#include <mutex>
#include <optional>
#include <span>
#include <string_view>
#include <utility>

#include "host/bus/bundle_host.h"
#include "host/commands/document_kind.h"
#include "host/commands/exit_status.h"
#include "host/commands/standard_streams.h"
#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"

namespace host {

namespace {

using platform::messaging::JsonMessage;

// Requests that are sent before the first of their responses is printed: enough to keep every
// processor busy, few enough that their responses fit in memory.
constexpr std::size_t batchSize = 16;

constexpr std::size_t largestRequest = std::size_t{16} * 1024 * 1024;

// The responses that have come, by the "rtcId" of their requests.
class Responses {
public:
    void add(const JsonMessage& message) {
        std::string_view channel = message.channel();
        if (channel.starts_with(platform::messaging::readResponsePrefix)) {
            channel.remove_prefix(std::string_view(platform::messaging::readResponsePrefix).size());
            const std::lock_guard lock(mutex_);
            byRtcId_.emplace(channel, message);
        }
    }

    std::optional<JsonMessage> take(const std::string& rtcId) {
        const std::lock_guard lock(mutex_);
        const auto node = byRtcId_.extract(rtcId);
        return node ? std::optional(std::move(node.mapped())) : std::nullopt;
    }

private:
    std::mutex mutex_;
    std::map<std::string, JsonMessage> byRtcId_;  // guarded by mutex_
};

bool isUtf8(std::string_view text) {
    return simdjson::validate_utf8(text.data(), text.size());
}

// The "rtcId" of the request for `file`, which lies in the command line's list of files.
std::string rtcIdOf(const ReadOptions& options, const std::string& file) {
    return std::to_string(&file - options.files.data());
}

std::string requestFor(const ReadOptions& options, const std::string& file) {
    const std::string contentType = !options.contentType.empty() ? options.contentType
                                    : isDocumentPackage(file)    ? "text/xml"
                                                                 : "text/plain";
    return json::serialize(json::Value(json::Object{
        {"rtcId", rtcIdOf(options, file)}, {"contentType", contentType}, {"filePath", file}}));
}

// Whether the response tells of success; tells of a failure on standard error.
bool tellsOfSuccess(const std::string& file, std::string_view response) {
    json::Object result = json::parse(response);
    if (result["status"] == json::Value(true)) {
        return true;
    }
    const json::Value& exception = result["exception"];
    spdlog::error("{}: {}", file,
                  exception.is<std::string>() ? exception.get<std::string>() : "cannot be read");
    return false;
}

// One run of the command.
class Reading {
public:
    Reading(const ReadOptions& options, int output)
        : options_(options),
          output_(output),
          host_(options.bundle, largestRequest,
                [this](const JsonMessage& message) { responses_.add(message); }) {}

    // Reads the files of one batch. Returns whether all could be read.
    bool read(std::span<const std::string> batch) {
        for (const std::string& file : batch) {
            if (isUtf8(file)) {
                host_.publish(platform::messaging::readRequestChannel,
                              platform::DataBuffer::copyOf(requestFor(options_, file)));
            }
        }
        host_.waitUntilIdle(options_.timeout, [this, batch] {
            printResponses(
                batch, "no answer within " + std::to_string(options_.timeout.count()) + " seconds");
        });
        return printResponses(batch, "no answer");
    }

private:
    bool printResponses(std::span<const std::string> batch, const std::string& reasonForNone) {
        bool allSucceeded = true;
        for (const std::string& file : batch) {
            const std::optional<JsonMessage> response = responses_.take(rtcIdOf(options_, file));
            if (response) {
                writeAll(output_, {response->payload(), "\n"});
                allSucceeded &= tellsOfSuccess(file, response->payload());
            } else {
                spdlog::error(
                    "{}: {}", file,
                    isUtf8(file) ? reasonForNone : "the name is not UTF-8, as a request needs it");
                allSucceeded = false;
            }
        }
        return allSucceeded;
    }

    const ReadOptions& options_;
    int output_;
    Responses responses_;
    BundleHost host_;
};

}  // namespace

int runRead(const ReadOptions& options, int output) {
    Reading reading(options, output);
    bool allRead = true;
    for (std::span<const std::string> rest(options.files); !rest.empty();) {
        const auto batch = rest.first(std::min(batchSize, rest.size()));
        allRead &= reading.read(batch);
        rest = rest.subspan(batch.size());
    }
    return allRead ? exitDone : exitRequestFailed;
}

}  // namespace host
