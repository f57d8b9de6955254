// SPDX-License-Identifier: Apache-2.0
// The JSON libraries that the parser and the writer are measured beside.
//
// Each parses a text that it must leave as it is to a tree of values, and writes such a tree as
// compact text, in the way its manual gives first. What a parse or a write has made is freed within
// it.
#pragma once

#include <functional>
#include <string>
#include <vector>

namespace benchmarks {

struct JsonPeer {
    std::string name;

    /// Makes what parses `text` once each time it is called. `text` outlives it.
    std::function<std::function<void()>(const std::string& text)> parsing;

    /// Makes what writes the tree of `text` once each time it is called. Empty when the peer has no
    /// writer.
    std::function<std::function<void()>(const std::string& text)> writing;
};

/// This project first, then its peers.
std::vector<JsonPeer> jsonPeers();

}  // namespace benchmarks
