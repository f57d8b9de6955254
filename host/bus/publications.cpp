// SPDX-License-Identifier: Apache-2.0
#include "host/bus/publications.h"

#include <utility>

namespace host {

namespace {

struct Collection {
    std::vector<Publication> publications;
    std::size_t longest;
};

// Where the calling thread's publications are collected; null when they go out. The bundle
// publishes on the thread that calls its handler.
thread_local Collection* keptBack = nullptr;

class KeepingBack {
public:
    explicit KeepingBack(Collection& collection) : before_(std::exchange(keptBack, &collection)) {}
    KeepingBack(const KeepingBack&) = delete;
    KeepingBack& operator=(const KeepingBack&) = delete;
    ~KeepingBack() { keptBack = before_; }

private:
    Collection* const before_;
};

}  // namespace

std::vector<Publication> publicationsOf(const std::function<void()>& work, std::size_t longest) {
    Collection collection{{}, longest};
    {
        const KeepingBack keepingBack(collection);
        work();
    }
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
