// SPDX-License-Identifier: Apache-2.0
// Makes the saves of one document wait for each other, within a process and between workers.
#pragma once

#include <array>
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
    /// log says so.
    explicit SaveLocks(const std::filesystem::path& file);

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
        Held(int file, std::size_t number, std::mutex& mutex);

        int file_;
        std::size_t number_;
        std::unique_lock<std::mutex> lock_;
    };

    /// Waits for the lock of the document at `path`. Throws std::runtime_error when another process
    /// has held it for a minute and a half.
    Held hold(const std::string& path);

private:
    static constexpr std::size_t count = 1024;

    platform::FileDescriptor file_;
    std::array<std::mutex, count> mutexes_;
};

}  // namespace host
