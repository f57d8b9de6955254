// SPDX-License-Identifier: Apache-2.0
// What the guard of the host adds to saves of texts: the same requests to the bundle alone, to the
// bundle alone with its file and folder synced afterwards, and to the bundle behind the guard. The
// files lie in memory, where syncing costs nothing, and on disk. A save takes until it is answered.
#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <sys/resource.h>
#include <unistd.h>

#include <chrono>
#include <cstddef>
#include <exception>
#include <filesystem>
#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <utility>

#include "host/bus/bundle_host.h"
#include "host/guard/guard.h"
#include "host/limits/freed_memory.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/messaging/channels.h"
#include "platform/posix/file_descriptor.h"
#include "tests/support/temporary_directory.h"

namespace benchmarks {
namespace {

using platform::DataBuffer;
using Clock = std::chrono::steady_clock;

const test::TemporaryDirectory& scratch() {
    static const test::TemporaryDirectory folder(test::folderInMemory());
    return folder;
}

double secondsOfProcessor() {
    const auto seconds = [](const timeval& time) {
        return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_usec) * 1e-6;
    };
    struct rusage usage {};
    ::getrusage(RUSAGE_SELF, &usage);
    return seconds(usage.ru_utime) + seconds(usage.ru_stime);
}

// A running bundle, behind the guard or not.
class Saver {
public:
    explicit Saver(bool isGuarded)
        : host_(
              SERIALIZATION_BUNDLE, std::size_t{1} << 28,
              [this](const platform::messaging::JsonMessage& message) {
                  isSaved_ = message.payload() == "true";
                  answered_ = Clock::now();
              },
              host::makeGuard(options(isGuarded), {})) {}

    // Returns when the answer came. The bundle has released the request by the end.
    Clock::time_point save(DataBuffer request) {
        isSaved_ = false;
        host_.publish(platform::messaging::writeRequestChannel, std::move(request));
        host_.waitUntilIdle();
        if (!isSaved_) {
            throw std::runtime_error("the text was not saved");
        }
        return answered_;
    }

private:
    static host::GuardOptions options(bool isGuarded) {
        host::GuardOptions options(isGuarded);
        options.folder = scratch() / "state";
        options.keepsVersions = false;
        return options;
    }

    bool isSaved_ = false;
    Clock::time_point answered_;
    host::BundleHost host_;
};

std::string writeRequest(const std::string& path, std::size_t size) {
    std::string text;
    text.reserve(size + 100);
    for (std::size_t i = 0; text.size() < size; ++i) {
        text += "Paragraph " + std::to_string(i) + ": the \"" + std::to_string(i * i % 65521U) +
                "\" words of a text as people write it, line by line.\n";
    }
    text.resize(size);
    return json::serialize(json::Value(json::Object{{"rtcId", "1"},
                                                    {"contentType", "text/plain"},
                                                    {"encoding", "UTF-8"},
                                                    {"filePath", path},
                                                    {"content", std::move(text)}}));
}

void sync(const std::string& path) {
    for (const std::string& synced : {path, path.substr(0, path.rfind('/'))}) {
        const platform::FileDescriptor file(::open(synced.c_str(), O_RDONLY | O_CLOEXEC));
        if (!file || ::fsync(file.get()) != 0) {
            throw std::runtime_error(synced + " cannot be synced");
        }
    }
}

struct Size {
    const char* name;
    std::size_t bytes;
};

enum class Sync { no, yes };

void saves(benchmark::State& state, Saver& saver, Sync isSynced, const std::string& path,
           std::size_t size) {
    const std::string request = writeRequest(path, size);
    saver.save(DataBuffer::copyOf(request));  // the first makes the file
    double processor = 0;
    for (auto _ : state) {
        DataBuffer payload = DataBuffer::copyOf(request);
        const double processorBefore = secondsOfProcessor();
        const auto before = Clock::now();
        auto after = saver.save(std::move(payload));
        if (isSynced == Sync::yes) {
            sync(path);
            after = Clock::now();
        }
        state.SetIterationTime(std::chrono::duration<double>(after - before).count());
        processor += secondsOfProcessor() - processorBefore;
    }
    state.counters["ms of processor time"] =
        processor * 1e3 / static_cast<double>(state.iterations());
    std::filesystem::remove(path);
}

void add(const std::string& name, Saver& saver, Sync isSynced, const std::string& path,
         std::size_t size) {
    benchmark::RegisterBenchmark(name.c_str(),
                                 [&saver, isSynced, path, size](benchmark::State& state) {
                                     try {
                                         saves(state, saver, isSynced, path, size);
                                     } catch (const std::exception& error) {
                                         state.SkipWithError(error.what());
                                     }
                                 })
        ->UseManualTime()
        ->Unit(benchmark::kMillisecond);
}

}  // namespace
}  // namespace benchmarks

int main(int argc, char** argv) {
    using namespace benchmarks;
    host::keepFreedMemory();
    Saver bare(false);
    Saver guarded(true);
    const std::string inMemory = scratch() / "text";
    const std::string onDisk = std::string(SCRATCH_ON_DISK) + "/text";
    for (const auto& [name, bytes] : {Size{"1 KB", 1'000}, {"60 MB", 60'000'000}}) {
        const std::string text = std::string("save a text/") + name;
        add(text + " in memory/guarded", guarded, Sync::no, inMemory, bytes);
        add(text + " in memory/bare", bare, Sync::no, inMemory, bytes);
        add(text + " on disk/guarded", guarded, Sync::no, onDisk, bytes);
        add(text + " on disk/bare", bare, Sync::no, onDisk, bytes);
        add(text + " on disk/synced", bare, Sync::yes, onDisk, bytes);
    }
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
}
