// SPDX-License-Identifier: Apache-2.0
// The cost of the bundle's work as it grows: time per byte of texts and packages of 1 KB to 500 MB,
// per part of packages of 1 to 50,000 parts, per request of 1 to 1,000 that are under way at once.
// It is to stay flat. Small work pays for the way there and back too.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <exception>
#include <filesystem>
#include <functional>
#include <stdexcept>
#include <string>
#include <utility>

#include "benchmarks/bundle_on_bus.h"
#include "host/limits/freed_memory.h"
#include "json/serialize.h"
#include "json/value.h"
#include "tests/support/temporary_directory.h"

namespace benchmarks {
namespace {

using platform::DataBuffer;

constexpr const char* packageType = "text/xml";
constexpr const char* textType = "text/plain";

const test::TemporaryDirectory& scratch() {
    static const test::TemporaryDirectory folder(test::folderInMemory());
    return folder;
}

BundleOnBus& bundle() {
    static BundleOnBus running;
    return running;
}

// `size` bytes of lines that differ, as XML that deflates to about a sixth.
std::string textOf(std::size_t size) {
    std::string text;
    text.reserve(size + 200);
    for (std::size_t i = 0; text.size() < size; ++i) {
        text += "<p id=\"" + std::to_string(i * 2654435761U % 1000000007U) + "\">Paragraph " +
                std::to_string(i) + ", of \"" + std::to_string(i * i % 65521U) + "\" words.</p>\n";
    }
    text.resize(size);
    return text;
}

json::Object request(const char* contentType, const std::string& path) {
    return {{"rtcId", "1"}, {"contentType", contentType}, {"filePath", path}};
}

std::string readRequest(const char* contentType, const std::string& path) {
    return json::serialize(json::Value(request(contentType, path)));
}

std::string writeTextRequest(const std::string& path, std::size_t size) {
    json::Object write = request(textType, path);
    write["encoding"] = "UTF-8";
    write["content"] = textOf(size);
    return json::serialize(json::Value(std::move(write)));
}

std::string writePackageRequest(const std::string& path, std::size_t parts, std::size_t partSize) {
    json::Array array;
    const std::string content = textOf(partSize);
    for (std::size_t i = 0; i < parts; ++i) {
        array.push_back(json::Object{{"partUri", "/parts/part" + std::to_string(i) + ".xml"},
                                     {"contentType", "application/xml"},
                                     {"content", content},
                                     {"relationship", json::Null()}});
    }
    json::Object write = request(packageType, path);
    write["content"] = json::Object{{"parts", std::move(array)}, {"relationships", json::Array()}};
    return json::serialize(json::Value(std::move(write)));
}

// Measures `once`, which returns seconds; states what each of `items` takes of them.
void measure(benchmark::State& state, const char* unit, double perSecond, std::size_t items,
             const std::function<double()>& once) {
    double seconds = 0;
    for (auto _ : state) {
        const double taken = once();
        state.SetIterationTime(taken);
        seconds += taken;
    }
    state.counters[unit] =
        seconds * perSecond / static_cast<double>(state.iterations()) / static_cast<double>(items);
}

void write(const std::string& text) {
    if (bundle().answer(writeRequestChannel, text) != "true") {
        throw std::runtime_error("the bundle cannot write");
    }
}

using WriteRequest = std::function<std::string(const std::string& path)>;

// Reads the document that `makeRequest` has the bundle write.
void reads(benchmark::State& state, const char* contentType, const WriteRequest& makeRequest,
           const char* unit, double perSecond, std::size_t items) {
    const std::string path = scratch() / "document";
    write(makeRequest(path));
    const std::string read = readRequest(contentType, path);
    measure(state, unit, perSecond, items,
            [&] { return bundle().time(readRequestChannel, DataBuffer::copyOf(read)); });
    std::filesystem::remove(path);
}

void writes(benchmark::State& state, const WriteRequest& makeRequest, const char* unit,
            double perSecond, std::size_t items) {
    const std::string path = scratch() / "document";
    const std::string text = makeRequest(path);
    measure(state, unit, perSecond, items, [&] {
        std::filesystem::remove(path);  // or the package's deflated parts would be reused
        return bundle().time(writeRequestChannel, DataBuffer::copyOf(text));
    });
    std::filesystem::remove(path);
}

// Reads a text of 10 KB as often as `count` says, all at once.
void readsAtOnce(benchmark::State& state, std::size_t count) {
    const std::string path = scratch() / "document";
    write(writeTextRequest(path, 10'000));
    const std::string read = readRequest(textType, path);
    measure(state, "\u00B5s per request", 1e6, count, [&] {
        const auto start = std::chrono::steady_clock::now();
        for (std::size_t i = 0; i < count; ++i) {
            bundle().send(readRequestChannel, DataBuffer::copyOf(read));
        }
        static_cast<void>(bundle().wait(count));
        return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    });
    bundle().bus().waitUntilIdle();
}

void add(const std::string& name, std::function<void(benchmark::State&)> function) {
    benchmark::RegisterBenchmark(name.c_str(),
                                 [function](benchmark::State& state) {
                                     try {
                                         function(state);
                                     } catch (const std::exception& error) {
                                         state.SkipWithError(error.what());
                                     }
                                 })
        ->UseManualTime()
        ->Unit(benchmark::kMicrosecond);
}

void addSizes() {
    static constexpr std::size_t largestPart = 10'000'000;
    struct Size {
        const char* name;
        std::size_t bytes;
    };
    for (const auto& [name, bytes] : {Size{"1 KB", 1'000},
                                      {"10 KB", 10'000},
                                      {"100 KB", 100'000},
                                      {"1 MB", 1'000'000},
                                      {"10 MB", 10'000'000},
                                      {"100 MB", 100'000'000},
                                      {"500 MB", 500'000'000}}) {
        const WriteRequest text = [bytes](const std::string& path) {
            return writeTextRequest(path, bytes);
        };
        const WriteRequest package = [bytes](const std::string& path) {
            const std::size_t partSize = std::min(bytes, largestPart);
            return writePackageRequest(path, bytes / partSize, partSize);
        };
        const std::string size = std::string("/bundle/") + name;
        constexpr const char* unit = "ns per byte";
        add("read a text of a size" + size,
            [=](auto& state) { reads(state, textType, text, unit, 1e9, bytes); });
        add("write a text of a size" + size,
            [=](auto& state) { writes(state, text, unit, 1e9, bytes); });
        add("read a package of a size" + size,
            [=](auto& state) { reads(state, packageType, package, unit, 1e9, bytes); });
        add("write a package of a size" + size,
            [=](auto& state) { writes(state, package, unit, 1e9, bytes); });
    }
}

void addParts() {
    for (const std::size_t count : {1U, 10U, 100U, 1'000U, 10'000U, 50'000U}) {
        const WriteRequest package = [count](const std::string& path) {
            return writePackageRequest(path, count, 1'000);
        };
        const std::string parts = "/bundle/" + std::to_string(count);
        constexpr const char* unit = "\u00B5s per part";
        add("read a package of parts of 1 KB" + parts,
            [=](auto& state) { reads(state, packageType, package, unit, 1e6, count); });
        add("write a package of parts of 1 KB" + parts,
            [=](auto& state) { writes(state, package, unit, 1e6, count); });
    }
}

void addRequests() {
    for (const std::size_t count : {1U, 10U, 100U, 1'000U}) {
        add("read texts of 10 KB at once/bundle/" + std::to_string(count),
            [=](auto& state) { readsAtOnce(state, count); });
    }
}

}  // namespace
}  // namespace benchmarks

int main(int argc, char** argv) {
    host::keepFreedMemory();
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) {
        return 1;
    }
    benchmarks::addSizes();
    benchmarks::addParts();
    benchmarks::addRequests();
    benchmark::RunSpecifiedBenchmarks();
    return 0;
}
