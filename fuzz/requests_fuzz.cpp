// SPDX-License-Identifier: Apache-2.0
// Any message to either request channel, about files of any bytes. A request that has what it needs
// is answered once, on the caller's channel; a write is announced before its answer; nothing else
// is published.
//
// An input is a message, a zero, and the bytes of the file that it is about. The message's
// "filePath" is replaced by one of a few, so that nothing but the target's own folder is touched:
// the last bits of its length say which.
#include <spdlog/spdlog.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <mutex>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "json/parser.h"
#include "json/serialize.h"
#include "platform/i18n/codecvt.h"
#include "platform/messaging/channels.h"
#include "serialization/serialization.h"
#include "tests/support/bundle_on_bus.h"
#include "tests/support/temporary_directory.h"

namespace {

using platform::messaging::JsonMessage;
using platform::messaging::notificationChannel;
using platform::messaging::readRequestChannel;
using platform::messaging::readResponsePrefix;
using platform::messaging::writeRequestChannel;
using platform::messaging::writeResponsePrefix;

class Target {
public:
    Target() {
        // Failed requests are logged, which is expected here and slow.
        spdlog::set_level(spdlog::level::off);
        std::filesystem::create_directory(folder_ / "folder");
    }

    void check(const char* channel, std::string_view message, std::string_view file) {
        const std::array<std::string, 4> paths = {folder_ / "file", folder_ / "missing",
                                                  folder_ / "folder", folder_ / "missing/file"};
        std::filesystem::remove(paths[1]);
        test::writeFile(paths[0], file);

        json::Object request = json::parse(message);
        std::string payload(message);
        if (const auto path = request.find("filePath");
            path != request.end() && path->second.is<std::string>()) {
            path->second = paths[message.size() % paths.size()];
            payload = json::serialize(json::Value(request));
            request = json::parse(payload);
        }
        service_.sendAndWait(channel, payload);
        checkPublished(channel, request);
    }

private:
    static bool hasText(const json::Object& request, const char* key) {
        const auto found = request.find(key);
        return found != request.end() && found->second.is<std::string>();
    }

    void checkPublished(std::string_view channel, const json::Object& request) {
        std::vector<std::pair<std::string, std::string>> published;
        {
            const std::lock_guard lock(mutex_);
            published.swap(published_);
        }
        const bool isRead = channel == readRequestChannel;
        const bool isRequest = hasText(request, "rtcId") && hasText(request, "contentType") &&
                               hasText(request, "filePath");
        if (!isRequest || (published.empty() && !isRead)) {
            require(published.empty());
            return;
        }
        if (!isRead) {
            require(published.size() == 2);
            require(published[0].first == notificationChannel);
            require(json::parse(published[0].second).at("filePath") == request.at("filePath"));
        }
        require(published.size() == (isRead ? 1 : 2));
        const auto& [answered, answer] = published.back();
        require(answered == (isRead ? readResponsePrefix : writeResponsePrefix) +
                                request.at("rtcId").get<std::string>());
        require(isRead ? json::parse(answer).at("status").is<bool>()
                       : answer == "true" || answer == "false");
    }

    static void require(bool holds) {
        if (!holds) {
            std::abort();
        }
    }

    const test::TemporaryDirectory folder_;
    std::mutex mutex_;
    std::vector<std::pair<std::string, std::string>> published_;  // guarded by mutex_
    test::BundleOnBus<EditorServices::Serialization> service_{[this](const JsonMessage& message) {
        const std::lock_guard lock(mutex_);
        published_.emplace_back(message.channel(), message.payload());
    }};
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    static Target target;
    const std::string_view input(reinterpret_cast<const char*>(data), size);
    const std::size_t end = std::min(input.find('\0'), size);
    const std::string_view file = input.substr(std::min(end + 1, size));
    target.check(readRequestChannel, input.substr(0, end), file);
    target.check(writeRequestChannel, input.substr(0, end), file);
    return 0;
}
