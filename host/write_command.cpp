#include "host/write_command.h"

#include <spdlog/spdlog.h>

#include <algorithm>
#include <cstddef>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <string_view>
#include <utility>

#include "host/bundle_host.h"
#include "host/exit_status.h"
#include "host/standard_streams.h"
#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/data_buffer.h"

namespace host {

namespace {

using platform::messaging::JsonMessage;

constexpr const char* packageContentType = "text/xml";

std::string readToEnd(int input) {
    constexpr std::size_t piece = 64 * 1024;
    std::string content;
    for (std::size_t length = 0;;) {
        content.resize(std::max(length * 2, piece));
        const std::size_t count = readSome(input, content.data() + length, content.size() - length);
        length += count;
        if (count == 0) {
            content.resize(length);
            return content;
        }
    }
}

// The JSON of a document package, as a read request is answered with it, or nothing.
std::optional<json::Object> packageIn(std::string_view content) {
    json::Object document = json::parse(content);
    if (document["parts"].is<json::Array>() && document["relationships"].is<json::Array>()) {
        return document;
    }
    return std::nullopt;
}

platform::DataBuffer requestFor(const WriteOptions& options, std::string content) {
    json::Object request{{"rtcId", "0"}, {"filePath", options.file}};
    const bool mayBePackage =
        options.contentType.empty() || options.contentType == packageContentType;
    if (std::optional<json::Object> document = mayBePackage ? packageIn(content) : std::nullopt) {
        request["contentType"] = packageContentType;
        request["content"] = std::move(*document);
        content = {};
    } else if (options.contentType == packageContentType) {
        throw std::runtime_error(
            "The content is no document package: JSON with the arrays \"parts\" "
            "and \"relationships\" is expected");
    } else {
        request["contentType"] = options.contentType.empty() ? "text/plain" : options.contentType;
        request["content"] = std::move(content);
        request["encoding"] = options.encoding;
    }
    return platform::DataBuffer::copyOf(json::serialize(std::move(request)));
}

}  // namespace

int runWrite(const WriteOptions& options, int input, int output) {
    platform::DataBuffer request = requestFor(options, readToEnd(input));
    std::mutex mutex;
    std::optional<JsonMessage> answer;  // guarded by mutex
    BundleHost host(options.bundle, request.length(), [&](const JsonMessage& message) {
        if (message.channel().starts_with(writeResponsePrefix)) {
            const std::lock_guard lock(mutex);
            answer = message;
        }
    });
    host.publish(writeRequestChannel, std::move(request));
    host.waitUntilIdle(options.timeout, [&options] {
        spdlog::error("{}: no answer within {} seconds", options.file, options.timeout.count());
    });

    const std::lock_guard lock(mutex);
    if (!answer) {
        spdlog::error("{}: no answer", options.file);
        return exitRequestFailed;
    }
    writeAll(output, {answer->payload(), "\n"});
    if (answer->payload() == "true") {
        return exitDone;
    }
    spdlog::error("{}: cannot be written", options.file);
    return exitRequestFailed;
}

}  // namespace host
