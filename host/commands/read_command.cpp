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
#include "host/commands/file_faults.h"
#include "host/commands/package_text.h"
#include "host/commands/progress.h"
#include "host/commands/text_file.h"
#include "host/exit_status.h"
#include "host/standard_streams.h"
#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/posix/file_in_memory.h"

namespace host {

namespace {

using platform::messaging::JsonMessage;

// The number of requests sent before the first of their responses is printed: enough to keep every
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

// The "rtcId" of the request for `file`, an element of the command line's list of files.
std::string rtcIdOf(const ReadOptions& options, const std::string& file) {
    return std::to_string(&file - options.files.data());
}

// The member `key` of `object` when it is a T, else nullptr.
template <typename T>
const T* find(const json::Object& object, const char* key) {
    const auto member = object.find(key);
    return member != object.end() && member->second.is<T>() ? &member->second.get<T>() : nullptr;
}

// A file in memory that holds what `input` does. The bundle finds it by its path as any other.
platform::FileInMemory copyInput(int input) {
    platform::FileInMemory copy("standard input");
    std::string piece(std::size_t{1} << 20U, '\0');
    std::size_t size = 0;
    while (const std::size_t count = readSome(input, piece.data(), piece.size())) {
        size += count;
        copy.reserve(size);
        writeAll(copy.descriptor().get(), {std::string_view(piece).substr(0, count)});
    }
    return copy;
}

// The kind of file that `text` seems to be by its beginning; empty when it may be a text.
std::string otherKindOf(std::string_view text) {
    return text.starts_with("PK\3\4") ? "a zip archive, as document packages are"
           : text.starts_with("\xD0\xCF\x11\xE0\xA1\xB1\x1A\xE1")
               ? "a document of an older kind, or one with a password"
           : text.starts_with("%PDF-") ? "a PDF document"
                                       : "";
}

// `value` with all its strings in valid UTF-8.
json::Value inUtf8(const json::Value& value) {
    if (value.is<std::string>()) {
        return json::Value(asValidUtf8(value.get<std::string>()));
    }
    if (value.is<json::Array>()) {
        json::Array array;
        for (const json::Value& element : value.get<json::Array>()) {
            array.push_back(inUtf8(element));
        }
        return json::Value(std::move(array));
    }
    if (value.is<json::Object>()) {
        json::Object object;
        for (const auto& [key, member] : value.get<json::Object>()) {
            object.emplace(asValidUtf8(key), inUtf8(member));
        }
        return json::Value(std::move(object));
    }
    return value;
}

// One run of the command.
class Reading {
public:
    Reading(const ReadOptions& options, int input, int output)
        : options_(options),
          output_(output),
          input_(std::find(options.files.begin(), options.files.end(), standardInput) !=
                         options.files.end()
                     ? std::optional(copyInput(input))
                     : std::nullopt),
          host_(options.bundle, largestRequest,
                [this](const JsonMessage& message) { responses_.add(message); }) {}

    // Reads the files of one batch. Returns whether all could be read.
    bool read(std::span<const std::string> batch) {
        progress_.tell("reading file " +
                       std::to_string(&batch.front() - options_.files.data() + 1) + " of " +
                       std::to_string(options_.files.size()));
        for (const std::string& file : batch) {
            if (isUtf8(file)) {
                host_.publish(platform::messaging::readRequestChannel,
                              platform::DataBuffer::copyOf(requestFor(file)));
            }
        }
        host_.waitUntilIdle(options_.timeout, [this, batch] {
            printAll(batch,
                     "no answer within " + std::to_string(options_.timeout.count()) + " seconds");
        });
        return printAll(batch, "no answer");
    }

private:
    static constexpr const char* standardInput = "-";

    std::string pathOf(const std::string& file) const {
        return file == standardInput ? input_->path() : file;
    }

    std::string requestFor(const std::string& file) const {
        const std::string path = pathOf(file);
        const std::string contentType = !options_.contentType.empty() ? options_.contentType
                                        : isDocumentPackage(path)     ? "text/xml"
                                                                      : "text/plain";
        return json::serialize(json::Value(json::Object{
            {"rtcId", rtcIdOf(options_, file)}, {"contentType", contentType}, {"filePath", path}}));
    }

    bool printAll(std::span<const std::string> batch, const std::string& reasonForNone) {
        progress_.clear();
        bool allSucceeded = true;
        for (const std::string& file : batch) {
            const std::optional<JsonMessage> response = responses_.take(rtcIdOf(options_, file));
            const std::string fault =
                response ? print(file, response->payload())
                         : printNone(file, isUtf8(file)
                                               ? reasonForNone
                                               : "the name is not UTF-8, as a request needs it");
            if (!fault.empty()) {
                spdlog::error("{}: {}", file, fault);
                allSucceeded = false;
            }
        }
        return allSucceeded;
    }

    // Prints, in place of a response that did not come, one that says so.
    std::string printNone(const std::string& file, const std::string& reason) {
        if (options_.form != ReadOptions::Form::text) {
            json::Object result{{"exception", reason}, {"status", false}};
            printObject(file, std::move(result));
        }
        return reason;
    }

    // Prints the response to the request for `file` in the form that is wanted. Returns what is
    // wrong with it; nothing when it reports success.
    std::string print(const std::string& file, std::string_view response) {
        if (options_.form == ReadOptions::Form::response) {
            writeAll(output_, {response, "\n"});
            return faultOf(file, json::parse(response));
        }
        json::Object result = json::parse(response);
        std::string fault = faultOf(file, result);
        if (const std::string* const text = find<std::string>(result, "data")) {
            try {
                const std::string charset = charsetOf(readRegularFile(pathOf(file)).value_or(""));
                result["data"] = toUtf8(*text, charset);
                result["encoding"] = charset;
            } catch (const std::runtime_error&) {
                return printNone(file, "the file has changed while it was read");
            }
        }
        if (options_.form == ReadOptions::Form::utf8) {
            printObject(file, std::move(result));
            return fault;
        }
        return fault.empty() ? printText(result) : fault;
    }

    std::string printText(const json::Object& result) {
        const std::string* const text = find<std::string>(result, "data");
        if (text == nullptr) {
            return "is a document package, which is more than one text; read it without --text";
        }
        writeAll(output_, {*text});
        return "";
    }

    void printObject(const std::string& file, json::Object result) {
        if (options_.form == ReadOptions::Form::utf8) {
            result["filePath"] = file;
            noteBrokenParts(result);
        }
        writeAll(output_, {json::serialize(inUtf8(json::Value(std::move(result)))), "\n"});
    }

    // Names the parts of a package whose bytes will not be printed as they are. Who wrote them back
    // would destroy them, so they are refused then.
    static void noteBrokenParts(json::Object& package) {
        json::Array broken;
        if (const auto* const parts = find<json::Array>(package, "parts")) {
            for (const json::Value& part : *parts) {
                const auto& members = part.get<json::Object>();
                if (!isUtf8(members.at("content").get<std::string>())) {
                    broken.push_back(members.at("partUri"));
                }
            }
        }
        if (!broken.empty()) {
            package[brokenPartsKey] = std::move(broken);
        }
    }

    // What is wrong with the response; nothing when it reports success. Warns of a text that is
    // probably some other kind of file.
    std::string faultOf(const std::string& file, const json::Object& result) const {
        if (const bool* const status = find<bool>(result, "status");
            status == nullptr || !*status) {
            const std::string* const exception = find<std::string>(result, "exception");
            return exception != nullptr ? *exception : "cannot be read";
        }
        const std::string* const text = find<std::string>(result, "data");
        if (text == nullptr) {
            return "";
        }
        if (const std::string kind = otherKindOf(*text); !kind.empty()) {
            spdlog::warn("{} is {}, and was read as a text", file, kind);
        }
        // What cannot be opened reads as an empty text.
        const std::string reason = text->empty() ? whyNotReadable(pathOf(file)) : "";
        return reason.empty() ? "" : "nothing could be read: " + reason;
    }

    const ReadOptions& options_;
    int output_;
    std::optional<platform::FileInMemory> input_;  // none unless a file is the standard input
    Responses responses_;
    BundleHost host_;
    Progress progress_{"reading"};
};

}  // namespace

int runRead(const ReadOptions& options, int input, int output) {
    Reading reading(options, input, output);
    bool allRead = true;
    for (std::span<const std::string> rest(options.files); !rest.empty();) {
        const auto batch = rest.first(std::min(batchSize, rest.size()));
        allRead &= reading.read(batch);
        rest = rest.subspan(batch.size());
    }
    return allRead ? exitDone : exitRequestFailed;
}

}  // namespace host
