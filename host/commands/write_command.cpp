// SPDX-License-Identifier: Apache-2.0
#include "host/commands/write_command.h"

#include <malloc.h>
#include <spdlog/spdlog.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdlib>
#include <memory>
#include <mutex>
#include <new>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>

#include "host/bus/bundle_host.h"
#include "host/commands/document_kind.h"
#include "host/commands/exit_status.h"
#include "host/commands/package_text.h"
#include "host/commands/standard_streams.h"
#include "host/commands/stop_signals.h"
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

// Whether `file` is named as the document packages of office programs are.
bool hasDocumentName(const std::filesystem::path& file) {
    constexpr std::array extensions{".docm", ".docx", ".dotm", ".dotx", ".potm", ".potx", ".ppam",
                                    ".ppsm", ".ppsx", ".pptm", ".pptx", ".sldm", ".sldx", ".vsdm",
                                    ".vsdx", ".xlam", ".xlsb", ".xlsm", ".xlsx", ".xltm", ".xltx"};
    std::string extension = file.extension();
    std::transform(extension.begin(), extension.end(), extension.begin(),
                   [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + 32) : c; });
    return std::find(extensions.begin(), extensions.end(), extension) != extensions.end();
}

// Whether `file`, or what symbolic links lead to from there, is a document package or named as one.
bool isForADocument(std::filesystem::path file) {
    if (isDocumentPackage(file)) {
        return true;
    }
    constexpr int mostLinks = 40;  // as many as the system follows
    std::error_code isNoLink;
    for (int links = 0; links < mostLinks && !isNoLink; ++links) {
        if (hasDocumentName(file)) {
            return true;
        }
        file = file.parent_path() / std::filesystem::read_symlink(file, isNoLink);
    }
    return false;
}

// The package in `content`; nothing when it is to be written as a text. Throws std::runtime_error
// when it may be written as neither: a text in the place of a document would destroy that.
std::optional<std::string_view> packageToWrite(const WriteOptions& options,
                                               std::string_view content) {
    if (!options.contentType.empty() && options.contentType != packageContentType) {
        return std::nullopt;
    }
    PackageText package = findPackage(content);
    if (package.fault.empty()) {
        return package.json;
    }
    if (options.contentType == packageContentType) {
        throw std::runtime_error("the content is no document package: " + package.fault);
    }
    if (isForADocument(options.file)) {
        throw std::runtime_error(options.file +
                                 " is a document package, or named as one, and the content is "
                                 "none: " +
                                 package.fault +
                                 ". To write it as a text nevertheless: --content-type text/plain");
    }
    return std::nullopt;
}

platform::DataBuffer requestFor(const WriteOptions& options, const Content& content) {
    json::Object request{{"rtcId", "0"}, {"filePath", options.file}};
    if (const auto package = packageToWrite(options, content.text())) {
        request["contentType"] = packageContentType;
        return withContent(std::move(request), *package);
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
    const Guard guard = makeGuard(options.guard, {});
    BundleHost host(
        options.bundle, request.length(),
        [&](const JsonMessage& message) {
            if (message.channel().starts_with(platform::messaging::writeResponsePrefix)) {
                const std::lock_guard lock(mutex);
                answer = message;
            }
        },
        guard);
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
