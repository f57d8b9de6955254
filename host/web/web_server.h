// SPDX-License-Identifier: Apache-2.0
// Serves a folder over HTTP: the page through which a browser reaches the bundle.
#pragma once

#include <filesystem>
#include <functional>
#include <string>

#include "host/web/http_server.h"
#include "host/web/listen_address.h"
#include "host/web/web_folder.h"

namespace host {

/// A web server for files, which answers GET and HEAD and knows nothing of the bundle.
class WebServer {
public:
    /// Listens at `address` for requests of the files in `folder`, which are not answered yet.
    /// Throws std::runtime_error when there is no such folder, or the address is taken.
    WebServer(const std::filesystem::path& folder, const ListenAddress& address,
              const HttpLimits& limits = {});

    /// "http://127.0.0.1:8080": the origin of the pages. When it is on the loopback address,
    /// requests with another Host are refused, so that no other site can point its name at this
    /// machine and read what is served.
    std::string origin() const { return server_.address().origin(); }

    /// Begins to answer, on a thread that calls `prepare` first. Must be called once. Throws what
    /// `prepare` throws.
    void start(std::function<void()> prepare);

private:
    HttpAnswer answer(const HttpRequest& request) const;

    const WebFolder folder_;
    HttpServer server_;  // Destroyed first: its thread uses the folder.
};

}  // namespace host
