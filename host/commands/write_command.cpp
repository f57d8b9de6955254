// SPDX-License-Identifier: Apache-2.0
#include "host/commands/write_command.h"

#include <simdjson.h>
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
#include "host/commands/file_faults.h"
#include "host/commands/package_text.h"
#include "host/commands/progress.h"
#include "host/commands/stop_signals.h"
#include "host/commands/text_file.h"
#include "host/exit_status.h"
#include "host/limits/freed_memory.h"
#include "host/standard_streams.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/data_buffer.h"
#include "platform/i18n/codecvt.h"
#include "platform/text/case.h"

namespace host {

namespace {

using platform::i18n::codecvt_string_to_ustring;
using platform::messaging::JsonMessage;

struct Free {
    void operator()(char* memory) const noexcept { std::free(memory); }
};

// All of the standard input. Grows without copies where the system can move memory.
class Content {
public:
    Content(int input, Progress& progress) {
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
            progress.tell("reading the input, " + std::to_string(length_ >> 20U) + " MB");
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
// may be large, becomes part of the request unchanged.
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
    const std::string extension = platform::text::toLowerAscii(file.extension().string());
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

// Throws std::runtime_error when a text may not take the place of `file`, for the reason `why`.
void requireNoDocument(const WriteOptions& options, const std::string& why) {
    if (options.contentType.empty() && isForADocument(options.file)) {
        throw std::runtime_error(options.file +
                                 " is a document package, or named as one, and the content is "
                                 "none: " +
                                 why +
                                 ". To write it as a text nevertheless: --content-type text/plain");
    }
}

struct Request {
    platform::DataBuffer text;  // empty when it is known to fail
    std::string refusal;        // why it fails; empty when no reason is known
};

Request makePackageRequest(const WriteOptions& options, PackageText package) {
    if (!package.refusal.empty()) {
        return {platform::DataBuffer(), std::move(package.refusal)};
    }
    return {withContent(
                {{"rtcId", "0"}, {"filePath", options.file}, {"contentType", packageContentType}},
                package.json),
            ""};
}

// A request for a text of `bytes` in `encoding`.
Request makeTextRequest(const WriteOptions& options, std::string bytes,
                        const std::string& encoding) {
    if (std::string fault = faultOfText(bytes, encoding); !fault.empty()) {
        // Not sent: the bundle would make an empty file of a text that decodes and does not encode
        // again.
        return {platform::DataBuffer(), std::move(fault)};
    }
    const std::string contentType =
        options.contentType.empty() ? "text/plain" : options.contentType;
    return {withContent({{"rtcId", "0"},
                         {"filePath", options.file},
                         {"contentType", contentType},
                         {"encoding", encoding}},
                        json::serialize(json::Value(std::move(bytes)))),
            ""};
}

// A request for a text that came in as UTF-8.
Request makeUtf8TextRequest(const WriteOptions& options, std::string_view content) {
    codecvt_string_to_ustring utf8("UTF-8", true);
    std::u16string text = platform::i18n::to_ustring(content, utf8);
    TextFile file = readTextFile(options.file);
    constexpr std::u16string_view mark = u"\uFEFF";
    // Some programs put a mark before what they print. Whether the file has one is its own affair.
    if (!file.bytes.empty() && text.starts_with(mark) && !file.withoutMark().starts_with(mark)) {
        text.erase(0, 1);
    }
    const std::string& charset = options.encoding.empty() ? file.charset : options.encoding;
    if (charset == file.charset && text == file.withoutMark()) {
        // Some charsets have several spellings of one text. ISO-8859-1 stores bytes as they are, so
        // the file keeps its own spelling.
        return makeTextRequest(options, std::move(file.bytes), "ISO-8859-1");
    }
    if (file.hasMark() && (charset == file.charset || canHold(mark, charset))) {
        text.insert(0, mark);
    }
    return makeTextRequest(options, encode(text, charset), charset);
}

// Throws std::runtime_error when the content is not what the options say.
Request makeRequest(const WriteOptions& options, std::string_view content) {
    if (options.isUtf8Text) {
        requireNoDocument(options, "--text was given");
        return makeUtf8TextRequest(options, content);
    }
    if (options.contentType.empty() || options.contentType == packageContentType) {
        PackageText package = findPackage(content);
        if (package.fault.empty()) {
            return makePackageRequest(options, std::move(package));
        }
        if (options.contentType == packageContentType) {
            throw std::runtime_error("the content is not a document package: " + package.fault);
        }
        requireNoDocument(options, package.fault);
    }
    return makeTextRequest(options, std::string(content),
                           options.encoding.empty() ? "UTF-8" : options.encoding);
}

// Why the bundle answered false; `refusal` is what was wrong with the request, if anything.
std::string whyRefused(const std::string& refusal, const WriteOptions& options) {
    const std::string reason = refusal.empty() ? whyNotWritable(options.file) : refusal;
    return reason.empty() ? "cannot be written" : "cannot be written: " + reason;
}

std::string whyNoAnswer(const std::string& file) {
    const std::string reason = simdjson::validate_utf8(file.data(), file.size())
                                   ? whyNotWritable(file)
                                   : "the name is not UTF-8, as a request needs it";
    return reason.empty() ? "no answer" : "no answer: " + reason;
}

// Sends `request` to the bundle. Returns its answer; nothing when there is none.
std::optional<std::string> send(const WriteOptions& options, platform::DataBuffer request) {
    // The threads that answer the request cannot use the memory that parsing the content has taken.
    returnFreedMemory();
    // A first signal to end does not cut a save short; a second one does.
    blockStopSignals();
    const StopSignals signals([] {});
    std::mutex mutex;
    std::optional<std::string> answer;  // guarded by mutex
    BundleHost host(
        options.bundle, request.length(),
        [&](const JsonMessage& message) {
            if (message.channel().starts_with(platform::messaging::writeResponsePrefix)) {
                const std::lock_guard lock(mutex);
                answer = message.payload();
            }
        },
        makeGuard(options.guard, {}));
    host.publish(platform::messaging::writeRequestChannel, std::move(request));
    host.waitUntilIdle(options.timeout, [&options] {
        spdlog::error("{}: no answer within {} seconds", options.file, options.timeout.count());
    });
    const std::lock_guard lock(mutex);
    return answer;
}

}  // namespace

int runWrite(const WriteOptions& options, int input, int output) {
    Progress progress("reading the input");
    Request request = makeRequest(options, Content(input, progress).text());
    std::optional<std::string> answer = "false";
    if (request.text.length() > 0) {
        progress.tell("writing");
        answer = send(options, std::move(request.text));
    }
    progress.clear();
    if (!answer) {
        spdlog::error("{}: {}", options.file, whyNoAnswer(options.file));
        return exitRequestFailed;
    }
    writeAll(output, {*answer, "\n"});
    if (*answer == "true") {
        return exitDone;
    }
    spdlog::error("{}: {}", options.file, whyRefused(request.refusal, options));
    return exitRequestFailed;
}

}  // namespace host
