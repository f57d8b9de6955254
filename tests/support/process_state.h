// SPDX-License-Identifier: Apache-2.0
// What the system says of a process, in /proc.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <cstddef>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <string>
#include <thread>

#include "tests/support/wait_until.h"

namespace test {

inline std::size_t entriesOf(const std::filesystem::path& folder) {
    using Entries = std::filesystem::directory_iterator;
    return static_cast<std::size_t>(std::distance(Entries(folder), Entries()));
}

/// The descriptors that this process has open, and the one that it takes to list them.
inline std::size_t openDescriptors() {
    return entriesOf("/proc/self/fd");
}

/// The threads of this process. The system lists one that has been joined a moment longer.
inline std::size_t listedThreads() {
    return entriesOf("/proc/self/task");
}

/// Waits until this process has `count` threads; returns whether it came to that.
inline bool comesToThreads(std::size_t count) {
    return waitUntil([&] { return listedThreads() == count; });
}

/// The threads of this process, once their number has been the same for a while.
inline std::size_t settledThreads() {
    std::size_t count = 0;
    for (int same = 0; same < 20; ++same) {
        const std::size_t now = listedThreads();
        same = now == count ? same : 0;
        count = now;
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return count;
}

/// The value of `field` in the status of `process` ("self", or a number), in bytes: "VmRSS" is the
/// memory that it has now, "VmHWM" the most that it has had. 0 when there is no such process.
inline std::size_t memoryOf(const std::string& process, const std::string& field) {
    std::ifstream status("/proc/" + process + "/status");
    for (std::string line; std::getline(status, line);) {
        if (line.starts_with(field + ":")) {
            return std::stoul(line.substr(field.size() + 1)) * 1024;
        }
    }
    return 0;
}

/// Whether `library` is loaded in this process.
inline bool isLoaded(const std::filesystem::path& library) {
    std::ostringstream maps;
    maps << std::ifstream("/proc/self/maps").rdbuf();
    return maps.str().find("/" + library.filename().string()) != std::string::npos;
}

}  // namespace test
