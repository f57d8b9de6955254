// SPDX-License-Identifier: Apache-2.0
#include "host/bus/publications.h"

#include <utility>

namespace host {

namespace {

class Collection;

// Where the calling thread's publications are collected; null when they go out. The bundle
// publishes on the thread that calls its handler.
thread_local Collection* keptBack = nullptr;

// Collects what this thread publishes while it lives.
class Collection {
public:
    explicit Collection(std::size_t longestPayload)
        : longest(longestPayload), before_(std::exchange(keptBack, this)) {}
    Collection(const Collection&) = delete;
    Collection& operator=(const Collection&) = delete;
    ~Collection() { keptBack = before_; }

    const std::size_t longest;
    std::vector<Publication> publications;

private:
    Collection* const before_;
};

}  // namespace

std::vector<Publication> publicationsOf(const std::function<void()>& work, std::size_t longest) {
    Collection collection(longest);
    work();
    return std::move(collection.publications);
}

bool keepBack(const std::string& channel, platform::DataBuffer& payload) {
    if (keptBack == nullptr) {
        return false;
    }
    keptBack->publications.push_back({channel, std::move(payload)});
    return true;
}

std::optional<std::size_t> longestKeptBack() {
    return keptBack == nullptr ? std::nullopt : std::optional(keptBack->longest);
}

}  // namespace host
