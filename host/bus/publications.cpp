// SPDX-License-Identifier: Apache-2.0
#include "host/bus/publications.h"

#include <utility>

namespace host {

namespace {

// Where the calling thread's publications are collected; null when they go out. The bundle
// publishes on the thread that calls its handler.
thread_local std::vector<Publication>* keptBack = nullptr;

class KeepingBack {
public:
    explicit KeepingBack(std::vector<Publication>& publications)
        : before_(std::exchange(keptBack, &publications)) {}
    KeepingBack(const KeepingBack&) = delete;
    KeepingBack& operator=(const KeepingBack&) = delete;
    ~KeepingBack() { keptBack = before_; }

private:
    std::vector<Publication>* const before_;
};

}  // namespace

std::vector<Publication> publicationsOf(const std::function<void()>& work) {
    std::vector<Publication> publications;
    const KeepingBack keepingBack(publications);
    work();
    return publications;
}

bool keepBack(const std::string& channel, platform::DataBuffer& payload) {
    if (keptBack == nullptr) {
        return false;
    }
    keptBack->push_back({channel, std::move(payload)});
    return true;
}

}  // namespace host
