// SPDX-License-Identifier: Apache-2.0
#include "host/guard/history.h"

#include <fcntl.h>
#include <linux/fs.h>
#include <spdlog/spdlog.h>
#include <sys/ioctl.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <exception>
#include <future>
#include <limits>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string_view>
#include <system_error>
#include <utility>

#include "host/guard/document_version.h"
#include "host/guard/file_content.h"
#include "platform/posix/system_error.h"

namespace host {

namespace {

namespace fs = std::filesystem;
using platform::FileDescriptor;

constexpr std::chrono::hours longestAge{30 * 24};
constexpr std::chrono::hours recount{1};
constexpr std::size_t mostPending = 256;
constexpr std::uint64_t workersPerRoot = 8;  // more of them may exceed the share for a while
constexpr const char* unfinishedName = "unfinished-";

std::int64_t now() {
    return std::chrono::duration_cast<std::chrono::milliseconds>(
               std::chrono::system_clock::now().time_since_epoch())
        .count();
}

bool isTooOld(const EarlierVersion& version) {
    return version.time < now() - std::chrono::milliseconds(longestAge).count();
}

std::string fileName(const std::string& digest, const EarlierVersion& version) {
    return digest + "-" + std::to_string(version.time) + "-" + std::to_string(version.size);
}

template <typename Integer>
bool readInteger(std::string_view text, Integer& target) {
    const char* const end = text.data() + text.size();
    const auto [last, error] = std::from_chars(text.data(), end, target);
    return error == std::errc() && last == end;
}

struct NameParts {
    std::string document;
    EarlierVersion version;
};

std::optional<NameParts> partsOf(const std::string& fileName) {
    const std::size_t first = fileName.find('-');
    const std::size_t second = fileName.find('-', first + 1);
    if (first == std::string::npos || second == std::string::npos) {
        return std::nullopt;
    }
    NameParts parts{fileName.substr(0, first), {}};
    const std::string_view name = fileName;
    if (!readInteger(name.substr(first + 1, second - first - 1), parts.version.time) ||
        !readInteger(name.substr(second + 1), parts.version.size)) {
        return std::nullopt;
    }
    return parts;
}

// The paths in `folder`; none where there is no such folder.
std::vector<fs::path> pathsIn(const fs::path& folder) {
    std::vector<fs::path> paths;
    std::error_code ignored;
    for (fs::directory_iterator entry(folder, ignored), end; !ignored && entry != end;
         entry.increment(ignored)) {
        paths.push_back(entry->path());
    }
    return paths;
}

void removeFile(const fs::path& path) {
    std::error_code ignored;
    fs::remove(path, ignored);
}

// Removes a copy that was never completed, because its process has ended.
void removeIfAbandoned(const fs::path& path) {
    std::error_code error;
    const fs::file_time_type changed = fs::last_write_time(path, error);
    if (!error && changed + recount < fs::file_time_type::clock::now()) {
        removeFile(path);
    }
}

// What a file of `size` bytes takes on disk, about: whole blocks, and an entry in a table.
std::uint64_t roomFor(std::uint64_t size) {
    constexpr std::uint64_t block = 4096;
    return (size / block + 2) * block;
}

// Copies `from` to a new file at `path`, without its bytes being copied where the file system can
// share them.
FileDescriptor copyTo(const fs::path& path, int from) {
    FileDescriptor to(::open(path.c_str(), O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC, 0600));
    if (!to) {
        platform::throwSystemError(path.c_str());
    }
    if (::ioctl(to.get(), FICLONE, from) != 0) {
        copyContent(from, to.get());
    }
    return to;
}

void syncToDisk(const FileDescriptor& file, const fs::path& path) {
    if (!file || ::fsync(file.get()) != 0) {
        platform::throwSystemError(path.c_str());
    }
}

}  // namespace

History::History(HistoryOptions options) : options_(std::move(options)) {
    fs::create_directories(options_.folder);
    fs::permissions(options_.folder, fs::perms::owner_all);
    for (fs::path& root : options_.roots) {
        root = nameOf(root);
    }
    thread_ = std::thread([this] { run(); });
}

History::~History() {
    {
        const std::lock_guard lock(mutex_);
        isEnding_ = true;
    }
    changed_.notify_all();
    thread_.join();
}

std::string History::nameOf(const std::string& path) {
    std::error_code error;
    const fs::path absolute = fs::absolute(path, error);
    const fs::path canonical = fs::weakly_canonical(absolute, error);
    return (error ? absolute.lexically_normal() : canonical).string();
}

bool History::isBelow(const fs::path& name, const fs::path& folder) {
    return std::mismatch(folder.begin(), folder.end(), name.begin(), name.end()).first ==
           folder.end();
}

void History::run() {
    std::unique_lock lock(mutex_);
    for (;;) {
        changed_.wait(lock, [this] { return isEnding_ || !tasks_.empty(); });
        if (tasks_.empty()) {
            return;
        }
        const std::function<void()> task = std::move(tasks_.front());
        tasks_.pop_front();
        lock.unlock();
        task();
        lock.lock();
    }
}

void History::post(std::function<void()> task) {
    {
        const std::lock_guard lock(mutex_);
        tasks_.push_back(std::move(task));
    }
    changed_.notify_all();
}

// What `work` returns when the thread does it. Throws std::runtime_error with the text of what it
// throws: the exception itself would be shared by both threads, and so would the promise if it lay
// on the stack of the one that waits.
template <typename Work>
auto History::done(Work work) {
    struct Outcome {
        std::optional<decltype(work())> result;
        std::string error;
    };
    const auto promise = std::make_shared<std::promise<Outcome>>();
    post([promise, work] {
        Outcome outcome;
        try {
            outcome.result = work();
        } catch (const std::exception& error) {
            outcome.error = error.what();
        }
        promise->set_value(std::move(outcome));
    });
    Outcome outcome = promise->get_future().get();
    if (!outcome.result) {
        throw std::runtime_error(outcome.error);
    }
    return std::move(*outcome.result);
}

void History::waitUntilIdle() {
    done([] { return true; });
}

void History::keep(FileDescriptor old, std::string document) {
    {
        const std::lock_guard lock(mutex_);
        if (tasks_.size() >= mostPending) {
            spdlog::warn("{}: no earlier version is kept, since copies are too slow", document);
            return;
        }
    }
    post([this, old = std::make_shared<FileDescriptor>(std::move(old)),
          document = std::move(document)] { copy(*old, document, Sync::no); });
}

void History::keepNow(const FileDescriptor& old, const std::string& document) {
    post([&] { copy(old, document, Sync::yes); });
    waitUntilIdle();
}

std::vector<EarlierVersion> History::versionsOf(const std::string& document) {
    return done([&] {
        std::vector<EarlierVersion> versions;
        for (const File& file : filesOf(document)) {
            versions.push_back(file.version);
        }
        return versions;
    });
}

FileDescriptor History::open(const std::string& document, std::int64_t time) {
    return done([&] {
        for (const File& file : filesOf(document)) {
            if (file.version.time == time) {
                FileDescriptor opened(::open(file.path.c_str(), O_RDONLY | O_CLOEXEC));
                if (opened) {
                    return opened;
                }
            }
        }
        throw std::runtime_error("There is no such earlier version");
    });
}

// The root that holds `document`; the root of the file system where all documents have versions.
fs::path History::rootOf(const std::string& document) const {
    if (options_.roots.empty()) {
        return "/";
    }
    for (const fs::path& root : options_.roots) {
        if (isBelow(document, root)) {
            return root;
        }
    }
    throw std::runtime_error("is below no folder whose documents have earlier versions");
}

// Where versions of `document` may be. Without roots of its own, this process may find them under
// any root.
std::vector<fs::path> History::foldersOf(const std::string& document) const {
    std::vector<fs::path> roots;
    if (options_.roots.empty()) {
        roots = pathsIn(options_.folder);
    } else {
        roots.push_back(options_.folder / digestOf(rootOf(document).string()));
    }
    for (fs::path& root : roots) {
        root /= digestOf(document).substr(0, 2);
    }
    return roots;
}

std::vector<History::File> History::filesOf(const std::string& document) const {
    const std::string digest = digestOf(document);
    std::vector<File> files;
    for (const fs::path& folder : foldersOf(document)) {
        for (const fs::path& path : pathsIn(folder)) {
            const std::optional<NameParts> parts = partsOf(path.filename());
            std::error_code error;
            if (parts && parts->document == digest && !isTooOld(parts->version) &&
                fs::file_size(path, error) == parts->version.size && !error) {
                files.push_back({path, digest, parts->version});
            }
        }
    }
    std::sort(files.begin(), files.end(),
              [](const File& a, const File& b) { return a.version.time > b.version.time; });
    return files;
}

void History::copy(const FileDescriptor& old, const std::string& document, Sync sync) noexcept {
    try {
        makeCopy(old, document, sync);
    } catch (const std::exception& error) {
        spdlog::warn("{}: no earlier version is kept: {}", document, error.what());
    }
}

void History::makeCopy(const FileDescriptor& old, const std::string& document, Sync sync) {
    const fs::path root = rootOf(document);
    const std::string digest = digestOf(document);
    const fs::path folder = options_.folder / digestOf(root.string()) / digest.substr(0, 2);
    fs::create_directories(folder);
    makeRoom(root, roomFor(sizeOf(old.get())));
    const fs::path unfinished =
        folder / (unfinishedName + std::to_string(::getpid()) + "." + std::to_string(now()));
    try {
        const FileDescriptor made = copyTo(unfinished, old.get());
        if (sync == Sync::yes) {
            syncToDisk(made, unfinished);
        }
        EarlierVersion version{now(), fs::file_size(unfinished)};
        // Two versions within a millisecond get different times.
        const std::vector<File> others = filesOf(document);
        if (!others.empty()) {
            version.time = std::max(version.time, others.front().version.time + 1);
        }
        fs::rename(unfinished, folder / fileName(digest, version));
        if (sync == Sync::yes) {
            syncToDisk(FileDescriptor(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)),
                       folder);
        }
        removeSurplus(document);
    } catch (...) {
        removeFile(unfinished);
        throw;
    }
}

void History::removeSurplus(const std::string& document) {
    const std::vector<File> files = filesOf(document);
    for (std::size_t i = options_.versions; i < files.size(); ++i) {
        removeFile(files[i].path);
    }
}

// Makes room for another version of `size` bytes in the share of `root`. Throws std::runtime_error
// when it exceeds the share alone: all other versions would go, and then the new one too.
//
// All versions are counted anew each hour, and when this process has added its part of what was
// free at the last count: other workers add to them, too.
void History::makeRoom(const fs::path& root, std::uint64_t size) {
    Usage& usage = usage_[root];
    const auto time = std::chrono::steady_clock::now();
    if (usage.added + size > usage.mayAdd || time - usage.counted >= recount) {
        const std::uint64_t most = shareOf(root);
        if (size > most) {
            throw std::runtime_error("its " + std::to_string(size) + " bytes exceed the " +
                                     std::to_string(most) + " that all earlier versions may take");
        }
        usage = {0, (most - removeOldest(root, most - size)) / workersPerRoot, time};
    }
    usage.added += size;
}

// The bytes that versions of documents below `root` may take together.
std::uint64_t History::shareOf(const fs::path& root) const {
    const auto shareOfDisk = [this](const fs::path& folder) {
        struct statvfs system {};
        if (::statvfs(folder.c_str(), &system) != 0) {
            platform::throwSystemError(folder.c_str());
        }
        const auto size =
            static_cast<double>(system.f_blocks) * static_cast<double>(system.f_frsize);
        // A file system that does not tell its size says that it has no blocks.
        return system.f_blocks == 0 ? std::numeric_limits<std::uint64_t>::max()
                                    : static_cast<std::uint64_t>(size * options_.share);
    };
    // The versions of all roots together must not fill their own disk either.
    const std::size_t roots = std::max<std::size_t>(options_.roots.size(), 1);
    return std::min(shareOfDisk(root), shareOfDisk(options_.folder) / roots);
}

// Removes what is too old, and the oldest versions until the others take no more than `most` bytes,
// and a little less if they took more. Returns what they take.
std::uint64_t History::removeOldest(const fs::path& root, std::uint64_t most) const {
    std::vector<File> files;
    std::uint64_t bytes = 0;
    for (const fs::path& folder : pathsIn(options_.folder / digestOf(root.string()))) {
        for (const fs::path& path : pathsIn(folder)) {
            if (const std::optional<NameParts> parts = partsOf(path.filename())) {
                files.push_back({path, parts->document, parts->version});
                bytes += roomFor(parts->version.size);
            } else {
                removeIfAbandoned(path);
            }
        }
    }
    std::sort(files.begin(), files.end(),
              [](const File& a, const File& b) { return a.version.time < b.version.time; });
    const std::uint64_t wanted = bytes > most ? most / 10 * 9 : bytes;
    for (const File& file : files) {
        if (bytes > wanted || isTooOld(file.version)) {
            removeFile(file.path);
            bytes -= roomFor(file.version.size);
        }
    }
    return bytes;
}

}  // namespace host
