// SPDX-License-Identifier: Apache-2.0
#include "host/web/web_server.h"

#include <optional>
#include <utility>

namespace host {

namespace {

// Pages run only their own scripts, cannot be framed by other sites, and may connect to message
// servers.
constexpr const char* contentPolicy =
    "default-src 'self'; img-src 'self' data: blob:; font-src 'self' data:; "
    "style-src 'self' 'unsafe-inline'; worker-src 'self' blob:; connect-src 'self' ws: wss:; "
    "object-src 'none'; base-uri 'none'; form-action 'none'; frame-ancestors 'none'";

}  // namespace

WebServer::WebServer(const std::filesystem::path& folder, const ListenAddress& address,
                     const HttpLimits& limits)
    : folder_(folder), server_(address, limits) {}

void WebServer::start(std::function<void()> prepare) {
    server_.start(std::move(prepare), [this](const HttpRequest& request) {
        HttpAnswer result = answer(request);
        const auto add = [&result](const char* name, const char* value) {
            result.headers.emplace_back(name, value);
        };
        add("Content-Security-Policy", contentPolicy);
        add("X-Content-Type-Options", "nosniff");
        add("Referrer-Policy", "no-referrer");
        add("Cross-Origin-Resource-Policy", "same-origin");
        add("Cache-Control", "no-cache");
        add("Accept-Ranges", "none");
        return result;
    });
}

HttpAnswer WebServer::answer(const HttpRequest& request) const {
    if (request.method != "GET" && request.method != "HEAD") {
        HttpAnswer refusal = plainText(405, "Only GET and HEAD are supported.\n");
        refusal.headers.emplace_back("Allow", "GET, HEAD");
        return refusal;
    }
    const ListenAddress& own = server_.address();
    if (own.isLoopback() && request.host != own.authority()) {
        return plainText(421, "This is " + own.authority() + " and no other server.\n");
    }
    std::optional<WebFolder::File> file = folder_.open(request.path);
    if (!file) {
        return plainText(404, "There is no such file.\n");
    }
    HttpAnswer result;
    result.type = std::move(file->type);
    result.file = std::move(file->content);
    return result;
}

}  // namespace host
