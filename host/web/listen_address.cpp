// SPDX-License-Identifier: Apache-2.0
#include "host/web/listen_address.h"

#include <charconv>
#include <cstddef>
#include <stdexcept>
#include <system_error>

namespace host {

ListenAddress ListenAddress::parse(const std::string& text) {
    const auto fail = [&text] {
        throw std::invalid_argument("\"" + text + "\" is not an address such as 127.0.0.1:8080");
    };
    const std::size_t colon = text.rfind(':');
    if (colon == std::string::npos || colon == 0) {
        fail();
    }
    ListenAddress address{text.substr(0, colon), 0};
    const char* const end = text.data() + text.size();
    const auto [parsed, error] = std::from_chars(text.data() + colon + 1, end, address.port);
    if (error != std::errc() || parsed != end) {
        fail();
    }
    if (address.host.starts_with('[') && address.host.ends_with(']')) {
        address.host = address.host.substr(1, address.host.size() - 2);
    } else if (address.host.find(':') != std::string::npos) {
        fail();
    }
    return address;
}

bool ListenAddress::isLoopback() const {
    return host == "localhost" || host == "::1" || host.starts_with("127.");
}

std::string ListenAddress::authority() const {
    const std::string name = host.find(':') == std::string::npos ? host : "[" + host + "]";
    return name + (port == 80 ? "" : ":" + std::to_string(port));
}

}  // namespace host
