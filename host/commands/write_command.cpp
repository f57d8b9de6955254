// SPDX-License-Identifier: Apache-2.0
#include "host/commands/write_command.h"

#include <malloc.h>
#include <spdlog/spdlog.h>

#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <memory>
#include <mutex>
#include <new>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>

#include "host/bus/bundle_host.h"
#include "host/commands/exit_status.h"
#include "host/commands/standard_streams.h"
#include "host/commands/stop_signals.h"
#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/data_buffer.h"

namespace host {

namespace {

using platform::messaging::JsonMessage;

constexpr const char* packageContentType = "text/xml";

struct Free {
    void operator()(char* memory) const noexcept { std::free(memory); }
};

// All that the standard input holds. Grows without copies where the system can move memory.
class Content {
public:
    explicit Content(int input) {
        constexpr std::size_t smallestRoom = std::size_t{64} * 1024;
        for (std::size_t room = 0;;) {
            if (length_ == room) {
                room = std::max(room * 2, smallestRoom);
                grow(room);
            }
            const std::size_t count = readSome(input, memory_.get() + length_, room - length_);
            if (count == 0) {
                return;
            }
            length_ += count;
        }
    }

    std::string_view text() const { return {memory_.get(), length_}; }

private:
    void grow(std::size_t size) {
        char* const grown = static_cast<char*>(std::realloc(memory_.get(), size));
        if (grown == nullptr) {
            throw std::bad_alloc();
        }
        static_cast<void>(memory_.release());
        memory_.reset(grown);
    }

    std::unique_ptr<char, Free> memory_;
    std::size_t length_ = 0;
};

// The text of the document package that `content` begins with, as a read request is answered with
// it; or nothing.
std::optional<std::string_view> packageIn(std::string_view content) {
    json::Input input{content.data(), content.data() + content.size()};
    json::Object document;
    if (json::parseObject(input, document) == json::Status::success &&
        document["parts"].is<json::Array>() && document["relationships"].is<json::Array>()) {
        return content.substr(0, static_cast<std::size_t>(input.position - content.data()));
    }
    return std::nullopt;
}

// The text of `request` with a last member "content" of the JSON text `content`. The package, which
// may be large, becomes part of the request as it stands.
platform::DataBuffer withContent(json::Object request, std::string_view content) {
    std::string begin = json::serialize(std::move(request));
    begin.back() = ',';
    begin += "\"content\":";
    platform::DataBuffer text(begin.size() + content.size() + 1);
    char* end = std::copy(begin.begin(), begin.end(), text.data());
    end = std::copy(content.begin(), content.end(), end);
    *end = '}';
    text.setLength(text.capacity());
    return text;
}

platform::DataBuffer requestFor(const WriteOptions& options, const Content& content) {
    json::Object request{{"rtcId", "0"}, {"filePath", options.file}};
    const bool mayBePackage =
        options.contentType.empty() || options.contentType == packageContentType;
    if (const auto document = mayBePackage ? packageIn(content.text()) : std::nullopt) {
        request["contentType"] = packageContentType;
        return withContent(std::move(request), *document);
    }
    if (options.contentType == packageContentType) {
        throw std::runtime_error(
            "The content is no document package: JSON with the arrays \"parts\" "
            "and \"relationships\" is expected");
    }
    request["contentType"] = options.contentType.empty() ? "text/plain" : options.contentType;
    request["encoding"] = options.encoding;
    return withContent(std::move(request),
                       json::serialize(json::Value(std::string(content.text()))));
}

}  // namespace

int runWrite(const WriteOptions& options, int input, int output) {
    platform::DataBuffer request = requestFor(options, Content(input));
    // What the look at the content took, the threads that answer the request cannot use.
    ::malloc_trim(0);
    // A save is not left half done by who asks the program to end, unless asking again.
    blockStopSignals();
    const StopSignals signals([] {});
    std::mutex mutex;
    std::optional<JsonMessage> answer;  // guarded by mutex
    BundleHost host(options.bundle, request.length(), [&](const JsonMessage& message) {
        if (message.channel().starts_with(platform::messaging::writeResponsePrefix)) {
            const std::lock_guard lock(mutex);
            answer = message;
        }
    });
    host.publish(platform::messaging::writeRequestChannel, std::move(request));
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
