// SPDX-License-Identifier: Apache-2.0
#include "host/server/nats_configuration.h"

#include <sys/random.h>

#include <array>
#include <map>
#include <regex>
#include <string_view>

#include "platform/messaging/channels.h"
#include "platform/posix/system_error.h"

namespace host {

namespace {

// In megabytes, as the server takes them. Longer messages travel in pieces. What waits for one
// client may be several of the longest, but not more than the machine can bear from a client that
// does not read.
constexpr const char* largestMessage = "8MB";
constexpr const char* mostPending = "256MB";

// A string of the configuration language.
std::string asString(std::string_view text) {
    std::string result = "\"";
    for (const char character : text) {
        if (character == '"' || character == '\\') {
            result += '\\';
        }
        result += character;
    }
    return result + '"';
}

template <typename Items>
std::string list(const Items& items) {
    std::string result = "[";
    for (const std::string& item : items) {
        result += (result.size() > 1 ? ", " : "") + asString(item);
    }
    return result + "]";
}

// A port as the configuration names it.
std::string portText(std::uint16_t port) {
    return port == 0 ? "-1" : std::to_string(port);
}

std::string userText(const Login& login, const std::string& permissions = {}) {
    return "    {user: " + asString(login.user) + ", password: " + asString(login.password) +
           permissions + "}\n";
}

std::string editorPermissions(const std::string& user) {
    using platform::messaging::filesRequestChannel;
    using platform::messaging::offerSuffix;
    using platform::messaging::readRequestChannel;
    using platform::messaging::writeRequestChannel;
    const std::array<std::string, 7> publish = {
        readRequestChannel,
        writeRequestChannel,
        filesRequestChannel,
        std::string(readRequestChannel) + offerSuffix,
        std::string(writeRequestChannel) + offerSuffix,
        std::string(filesRequestChannel) + offerSuffix,
        platform::messaging::piecesPrefix + ("*." + user) + ".>"};
    const std::array<std::string, 4> subscribe = {
        platform::messaging::notificationChannel,
        platform::messaging::readResponsePrefix + user + ".>",
        platform::messaging::writeResponsePrefix + user + ".>",
        platform::messaging::filesResponsePrefix + user + ".>"};
    return ", permissions: {\n      publish: " + list(publish) +
           "\n      subscribe: " + list(subscribe) + "\n    }";
}

// Without a list of origins, the server accepts pages of any origin; but no page has the server's.
std::string originText(const std::vector<std::string>& origins) {
    return origins.empty() ? "same_origin: true" : "allowed_origins: " + list(origins);
}

// Scheme, host and port.
const std::regex& originPattern() {
    static const std::regex pattern(
        R"((https?)://([a-z0-9.-]{1,253}|\[[0-9a-f:.]{2,45}\])(?::([0-9]{1,5}))?)");
    return pattern;
}

}  // namespace

std::string configurationText(const NatsConfiguration& configuration) {
    return "server_name: \"serialization_host\"\n"
           "host: \"127.0.0.1\"\n"
           "port: " +
           portText(configuration.port) +
           "\n"
           "ports_file_dir: " +
           asString(configuration.runtimeFolder.string()) +
           "\n"
           "logtime: false\n"
           "max_payload: " +
           largestMessage +
           "\n"
           "max_pending: " +
           mostPending +
           "\n"
           "max_subscriptions: 1000\n"
           "websocket {\n"
           "  host: \"127.0.0.1\"\n"
           "  port: " +
           portText(configuration.webSocketPort) +
           "\n"
           "  no_tls: true\n"
           "  " +
           originText(configuration.allowedOrigins) +
           "\n"
           "}\n"
           "authorization {\n"
           "  timeout: 10\n"
           "  users: [\n" +
           userText(configuration.users.worker) +
           userText(configuration.users.editor,
                    editorPermissions(configuration.users.editor.user)) +
           "  ]\n"
           "}\n";
}

std::string makePassword() {
    std::array<unsigned char, 32> bytes{};
    if (::getentropy(bytes.data(), bytes.size()) != 0) {
        platform::throwSystemError("cannot make a password");
    }
    constexpr std::string_view digits = "0123456789abcdef";
    std::string password;
    for (const unsigned char byte : bytes) {
        password += digits[byte >> 4];
        password += digits[byte & 15];
    }
    return password;
}

bool isOrigin(const std::string& text) {
    std::smatch match;
    return text.size() < 300 && std::regex_match(text, match, originPattern()) &&
           (!match[3].matched || (std::stoul(match[3]) > 0 && std::stoul(match[3]) < 65536));
}

std::string commonHost(const std::vector<std::string>& origins) {
    std::map<std::string, std::string> originOfHost;
    for (const std::string& origin : origins) {
        std::smatch match;
        if (!std::regex_match(origin, match, originPattern())) {
            continue;
        }
        const auto [known, isNew] = originOfHost.emplace(match[2], origin);
        if (!isNew && known->second != origin) {
            return known->first;
        }
    }
    return {};
}

}  // namespace host
