// SPDX-License-Identifier: Apache-2.0
// Makes the saves of one document wait for each other, within a process and between workers.
#pragma once

#include <array>
#include <chrono>
#include <cstddef>
#include <filesystem>
#include <mutex>
#include <string>

#include "platform/posix/file_descriptor.h"

namespace host {

/// Locks for documents. Each document has one of a fixed number of locks, chosen by a digest of its
/// path, so some documents share one. Between processes they are locks on single bytes of one file
/// that all of them open, which end with the process that holds them, however it ends. Only
/// programs that use this class respect them.
class SaveLocks {
public:
    /// Without a `file`, or where it cannot be opened, the locks work within this process only; the
    /// log says so. Another process is waited for up to `longestWait`: longer than a save waits for
    /// a lease on its file.
    explicit SaveLocks(const std::filesystem::path& file,
                       std::chrono::milliseconds longestWait = std::chrono::seconds(90));

    /// A lock, until the end of its life.
    class Held {
    public:
        Held(Held&&) noexcept = default;
        Held& operator=(Held&&) = delete;
        Held(const Held&) = delete;
        Held& operator=(const Held&) = delete;
        ~Held();

    private:
        friend class SaveLocks;
        Held(int file, std::size_t number, std::unique_lock<std::mutex> lock);

        int file_;
        std::size_t number_;
        std::unique_lock<std::mutex> lock_;
    };

    /// Waits for the lock of the document at `path`. Throws std::runtime_error when another process
    /// holds it for too long. Then nobody waits long for it until it could be had again: that
    /// process has stopped, perhaps, and everybody's saves would wait with those of this document.
    Held hold(const std::string& path);

private:
    static constexpr std::size_t count = 1024;

    struct Lock {
        std::mutex mutex;
        bool isStuck = false;  // guarded by mutex: another process has held it for too long
    };

    platform::FileDescriptor file_;
    const std::chrono::milliseconds longestWait_;
    std::array<Lock, count> locks_;
};

}  // namespace host
