// SPDX-License-Identifier: Apache-2.0
// Earlier versions of documents: what saves have replaced, for some time.
//
// They are files in a folder that clients cannot reach by a path:
//
//     <folder>/<root>/<aa>/<document>-<milliseconds>-<bytes>
//
//     root          digest of the root's path; each root has its share of the disk
//     aa            the first two digits of `document`, so that no folder becomes too long to list
//     document      digest of the document's path, links followed
//     milliseconds  since 1970, when the version was replaced; 13 digits
//     bytes         its size; a file of another size was left incomplete and does not count
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <filesystem>
#include <functional>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "platform/posix/file_descriptor.h"

namespace host {

/// An earlier version of a document.
struct EarlierVersion {
    std::int64_t time = 0;  // when it was replaced, in milliseconds since 1970; no two are the same
    std::uint64_t size = 0;  // in bytes
};

struct HistoryOptions {
    std::filesystem::path folder;  // made where it is missing

    /// Only documents below these have versions; empty: all documents have.
    std::vector<std::filesystem::path> roots;

    std::size_t versions = 20;  // of each document

    /// The share of the root's file system that the versions of all documents below the root may
    /// take, and of that of `folder` that those of all roots together may.
    double share = 0.1;
};

/// Keeps earlier versions, and finds them. A thread of its own, with the rights of the thread that
/// makes the object, handles all its files, so the threads that use it may be confined.
class History {
public:
    /// Throws std::filesystem::filesystem_error when the folder cannot be made.
    explicit History(HistoryOptions options);
    History(const History&) = delete;
    History& operator=(const History&) = delete;

    /// Finishes the copies that are under way.
    ~History();

    /// The name of the document at `path`: its absolute path, links followed.
    static std::string nameOf(const std::string& path);

    /// Whether `name` is `folder` or below it, both as `nameOf` gives them.
    static bool isBelow(const std::filesystem::path& name, const std::filesystem::path& folder);

    /// Copies the content of `old` as the newest version of `document`, without waiting for that.
    /// Versions that are too many, older than 30 days, or beyond the share of the disk are removed,
    /// the oldest first. What is larger than the share is not kept. Failures are logged. When
    /// copies are much slower than saves, versions are left out.
    void keep(platform::FileDescriptor old, std::string document);

    /// The same, but returns when the copy is made and safe on disk, or has failed.
    void keepNow(const platform::FileDescriptor& old, const std::string& document);

    /// The versions of `document`, the newest first. Throws std::runtime_error where it is below no
    /// root.
    std::vector<EarlierVersion> versionsOf(const std::string& document);

    /// The version of `document` that was replaced at `time`, opened to be read. Throws
    /// std::runtime_error when there is none.
    platform::FileDescriptor open(const std::string& document, std::int64_t time);

    /// Waits until all versions that were handed over are kept.
    void waitUntilIdle();

private:
    struct File {
        std::filesystem::path path;
        std::string document;  // its digest
        EarlierVersion version;
    };

    void run();
    void post(std::function<void()> task);
    template <typename Work>
    auto done(Work work);
    std::filesystem::path rootOf(const std::string& document) const;
    std::vector<std::filesystem::path> foldersOf(const std::string& document) const;
    std::vector<File> filesOf(const std::string& document) const;
    enum class Sync { no, yes };

    void copy(const platform::FileDescriptor& old, const std::string& document, Sync sync) noexcept;
    void makeCopy(const platform::FileDescriptor& old, const std::string& document, Sync sync);
    void removeSurplus(const std::string& document);
    void makeRoom(const std::filesystem::path& root, std::uint64_t size);
    std::uint64_t shareOf(const std::filesystem::path& root) const;
    std::uint64_t removeOldest(const std::filesystem::path& root, std::uint64_t most) const;

    HistoryOptions options_;

    // What was added to the versions of each root since they were counted, and how much may be
    // until the next count; used by the thread alone.
    struct Usage {
        std::uint64_t added = 0;
        std::uint64_t mayAdd = 0;
        std::chrono::steady_clock::time_point counted;
    };
    std::map<std::filesystem::path, Usage> usage_;

    std::mutex mutex_;
    std::condition_variable changed_;
    std::deque<std::function<void()>> tasks_;  // guarded by mutex_
    bool isEnding_ = false;                    // guarded by mutex_
    std::thread thread_;
};

}  // namespace host
