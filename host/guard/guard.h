// SPDX-License-Identifier: Apache-2.0
// How a command saves documents safely, and where it keeps locks and earlier versions.
#pragma once

#include <cstddef>
#include <filesystem>
#include <memory>
#include <vector>

#include "host/guard/history.h"
#include "host/guard/saves.h"
#include "platform/messaging/message_service.h"

namespace host {

struct GuardOptions {
    explicit GuardOptions(bool on = true) : isOn(on) {}

    bool isOn;
    bool keepsVersions = true;
    std::filesystem::path folder;  ///< Of locks and earlier versions; empty: the user's own.
    std::size_t versions = 20;     ///< Of each document.
};

/// The safe saves of a process.
struct Guard {
    std::shared_ptr<History> history;  // null: no earlier versions are kept
    std::shared_ptr<Saves> saves;      // null: saves are the bundle's alone

    /// The bundle's handler of read requests, once it is there. It publishes on the calling thread.
    std::shared_ptr<platform::messaging::MessageHandler> read =
        std::make_shared<platform::messaging::MessageHandler>();
};

/// The guard for clients that may use the folders `roots`, or all folders when there are none. Its
/// own folder must be outside of them. Without a folder, or where the user's own cannot be used,
/// there are no earlier versions and no locks between processes, and the log says so. Throws
/// std::runtime_error when a folder that was named cannot be used. Must be called before the thread
/// is confined.
Guard makeGuard(const GuardOptions& options, const std::vector<std::filesystem::path>& roots);

}  // namespace host
