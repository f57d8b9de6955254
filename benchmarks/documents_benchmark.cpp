// SPDX-License-Identifier: Apache-2.0
// Documents from file to response bytes and from request text to saved file, by the loaded bundle
// on its bus and by what programs in other languages use. All do the same jobs on the same files:
//
//   read_package   a package file to the text of the response
//   write_package  the text of a request to a new package file
//   save_unchanged the same over a package file with the same content
//   save_one_word  the same over a package file in which one word of one part is another one
//   read_text      a text file to the text of the response
//   write_text     the text of a request to a text file
//   expand_only    the entries of a package expanded with libdeflate as libzip finds them, and
//                  nothing else: the bound for read_package
//   small_request  a request of a text of 1 KB; what it takes beyond an empty handler on the bus
//
// Before a peer is measured, its result is compared with the bundle's: responses byte for byte (in
// UTF-8 where the bundle answers in the file's charset), packages as the bundle reads them back.
// Peers that are not there are reported as errors. Files are written in memory where the system
// has such a file system: only the bundle syncs what it saves to the disk.
#include <benchmark/benchmark.h>
#include <libdeflate.h>
#include <zip.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iostream>
#include <iterator>
#include <map>
#include <memory>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "benchmarks/bundle_on_bus.h"
#include "benchmarks/peer_process.h"
#include "host/limits/freed_memory.h"
#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"
#include "platform/i18n/codecvt.h"
#include "tests/support/temporary_directory.h"

namespace benchmarks {
namespace {

using platform::DataBuffer;

const std::filesystem::path inputs = BENCHMARK_INPUTS;
const std::string peers = std::string(PROJECT_SOURCE_ROOT) + "/benchmarks/peers";

std::string contentOf(const std::filesystem::path& path) {
    std::ifstream file(path, std::ios_base::binary);
    return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

const test::TemporaryDirectory& scratch() {
    static const test::TemporaryDirectory folder(test::folderInMemory());
    return folder;
}

BundleOnBus& bundle() {
    static BundleOnBus running;
    return running;
}

PeerProcess& python() {
    static PeerProcess process({"python3", peers + "/peer.py"});
    return process;
}

PeerProcess& node() {
    static PeerProcess process({"node", peers + "/peer.mjs"});
    return process;
}

// Requests.

std::string readRequest(const std::string& path, const char* contentType) {
    return json::serialize(json::Value(
        json::Object{{"rtcId", "1"}, {"contentType", contentType}, {"filePath", path}}));
}

json::Object answerTo(const std::string& request) {
    return json::parse(bundle().answer(readRequestChannel, request));
}

std::string writePackageRequest(json::Object document, const std::string& target) {
    return json::serialize(json::Value(json::Object{{"rtcId", "1"},
                                                    {"contentType", "text/xml"},
                                                    {"filePath", target},
                                                    {"content", std::move(document)}}));
}

std::string writePackageRequest(const std::string& source, const std::string& target) {
    return writePackageRequest(answerTo(readRequest(source, "text/xml")), target);
}

std::string writeTextRequest(const std::string& source, const std::string& charset,
                             const std::string& target) {
    json::Object document = answerTo(readRequest(source, "text/plain"));
    return json::serialize(json::Value(json::Object{{"rtcId", "1"},
                                                    {"contentType", "text/plain"},
                                                    {"filePath", target},
                                                    {"encoding", charset},
                                                    {"content", std::move(document["data"])}}));
}

void require(bool condition, const std::string& what) {
    if (!condition) {
        throw std::runtime_error(what);
    }
}

// Measurements. Each states its bytes per second by the response or the request, which are the same
// for all that do the job.

// Runs `once`, which returns seconds. What fails is reported as the benchmark's error.
void measure(benchmark::State& state, std::size_t bytes, const std::function<double()>& once) {
    try {
        for (auto _ : state) {
            state.SetIterationTime(once());
        }
        state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(bytes));
    } catch (const std::exception& error) {
        state.SkipWithError(error.what());
    }
}

void bundleReads(benchmark::State& state, const std::string& path, const char* contentType) {
    const std::string request = readRequest(path, contentType);
    const std::string response = bundle().answer(readRequestChannel, request);
    measure(state, response.size(), [&] {
        require(response.ends_with("\"status\":true}"), "the bundle cannot read the file");
        return bundle().time(readRequestChannel, DataBuffer::copyOf(request));
    });
}

using Peer = PeerProcess& (*)();

// The bundle's response in UTF-8, as peers answer.
std::string responseInUtf8(const std::string& path, const char* contentType,
                           const std::string& charset) {
    json::Object response = answerTo(readRequest(path, contentType));
    if (charset != "UTF-8") {
        auto& data = response["data"].get<std::string>();
        platform::i18n::codecvt_string_to_ustring converter(charset, true);
        data = platform::i18n::to_string(platform::i18n::to_ustring(data, converter));
    }
    return json::serialize(json::Value(std::move(response)));
}

void peerReads(benchmark::State& state, Peer peer, const std::string& job,
               const std::string& library, const std::string& path, const std::string& charset) {
    const char* contentType = job == "read-package" ? "text/xml" : "text/plain";
    const std::string expected = responseInUtf8(path, contentType, charset);
    const std::string request = readRequest(path, contentType);
    const std::size_t bytes = bundle().answer(readRequestChannel, request).size();
    const std::string saved = scratch() / "response";
    bool checked = false;
    measure(state, bytes, [&] {
        if (!std::exchange(checked, true)) {
            peer().run({job, library, path});
            peer().run({"save", saved});
            require(contentOf(saved) == expected, "the peer's response is another one");
        }
        return peer().run({job, library, path});
    });
}

void bundleWrites(benchmark::State& state, const std::string& request, const std::string& target,
                  const std::string& original) {
    require(bundle().answer(writeRequestChannel, request) == "true",
            "the bundle cannot write the file");
    state.counters["fileBytes"] = static_cast<double>(std::filesystem::file_size(target));
    state.counters["originalBytes"] = static_cast<double>(std::filesystem::file_size(original));
    measure(state, request.size(),
            [&] { return bundle().time(writeRequestChannel, DataBuffer::copyOf(request)); });
}

void bundleWritesPackage(benchmark::State& state, const std::string& path) {
    const std::string target = scratch() / "written.docx";
    const std::string request = writePackageRequest(path, target);
    measure(state, request.size(), [&] {
        std::filesystem::remove(target);
        return bundle().time(writeRequestChannel, DataBuffer::copyOf(request));
    });
    state.counters["fileBytes"] = static_cast<double>(std::filesystem::file_size(target));
    state.counters["originalBytes"] = static_cast<double>(std::filesystem::file_size(path));
}

void bundleSavesUnchanged(benchmark::State& state, const std::string& path) {
    const std::string target = scratch() / "written.docx";
    std::filesystem::remove(target);
    bundleWrites(state, writePackageRequest(path, target), target, path);
}

// Adds a word to the main text, or to one of the sheets, that is changed with each save.
void bundleSavesOneWord(benchmark::State& state, const std::string& path) {
    const std::string target = scratch() / "written.docx";
    json::Object document = answerTo(readRequest(path, "text/xml"));
    for (json::Value& value : document["parts"].get<json::Array>()) {
        auto& part = value.get<json::Object>();
        const auto& name = part["partUri"].get<std::string>();
        if (name == "/word/document.xml" || name == "/xl/worksheets/sheet1.xml") {
            part["content"].get<std::string>() += "<!-- word -->";
        }
    }
    const std::string changed = writePackageRequest(std::move(document), target);
    const std::string original = writePackageRequest(path, target);
    bool isChanged = false;
    require(changed.size() > original.size(), "no part was changed");
    require(bundle().answer(writeRequestChannel, original) == "true",
            "the bundle cannot write the file");
    measure(state, original.size(), [&] {
        isChanged = !isChanged;
        return bundle().time(writeRequestChannel,
                             DataBuffer::copyOf(isChanged ? changed : original));
    });
}

void bundleWritesText(benchmark::State& state, const std::string& path,
                      const std::string& charset) {
    const std::string target = scratch() / "written.txt";
    bundleWrites(state, writeTextRequest(path, charset, target), target, path);
}

void peerWritesPackage(benchmark::State& state, Peer peer, const std::string& library,
                       const std::string& path) {
    const std::string target = scratch() / "by_peer.docx";
    const std::string request = writePackageRequest(path, target);
    const std::string requestFile = scratch() / "request";
    std::ofstream(requestFile, std::ios_base::binary) << request;
    bool checked = false;
    measure(state, request.size(), [&] {
        if (!std::exchange(checked, true)) {
            peer().run({"load", requestFile});
            peer().run({"write-package", library, target});
            require(answerTo(readRequest(target, "text/xml")) ==
                        answerTo(readRequest(path, "text/xml")),
                    "the peer's package is another one");
            state.counters["fileBytes"] = static_cast<double>(std::filesystem::file_size(target));
        }
        return peer().run({"write-package", library, target});
    });
}

// Expands every entry of a package into memory of its own. Returns the bytes.
std::uint64_t expandAll(const std::string& path) {
    int error = 0;
    const std::unique_ptr<zip_t, void (*)(zip_t*)> archive(
        zip_open(path.c_str(), ZIP_RDONLY, &error), zip_discard);
    require(archive != nullptr, "libzip cannot open the file");
    const std::unique_ptr<libdeflate_decompressor, void (*)(libdeflate_decompressor*)> expander(
        libdeflate_alloc_decompressor(), libdeflate_free_decompressor);
    std::uint64_t total = 0;
    for (zip_int64_t i = 0; i < zip_get_num_entries(archive.get(), 0); ++i) {
        const auto index = static_cast<zip_uint64_t>(i);
        zip_stat_t status{};
        zip_stat_index(archive.get(), index, 0, &status);
        const std::unique_ptr<zip_file_t, int (*)(zip_file_t*)> file(
            zip_fopen_index(archive.get(), index, ZIP_FL_COMPRESSED), zip_fclose);
        const auto compressed = std::make_unique_for_overwrite<char[]>(status.comp_size);
        require(file != nullptr && zip_fread(file.get(), compressed.get(), status.comp_size) ==
                                       static_cast<zip_int64_t>(status.comp_size),
                "libzip cannot read an entry");
        if (status.comp_method == ZIP_CM_DEFLATE) {
            const auto content = std::make_unique_for_overwrite<char[]>(status.size);
            require(libdeflate_deflate_decompress(expander.get(), compressed.get(),
                                                  status.comp_size, content.get(), status.size,
                                                  nullptr) == LIBDEFLATE_SUCCESS,
                    "libdeflate cannot expand an entry");
            benchmark::DoNotOptimize(content.get());
        }
        total += status.size;
    }
    return total;
}

double secondsOf(const std::function<void()>& work) {
    const auto start = std::chrono::steady_clock::now();
    work();
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

void expandsOnly(benchmark::State& state, const std::string& path) {
    const std::size_t bytes =
        bundle().answer(readRequestChannel, readRequest(path, "text/xml")).size();
    measure(state, bytes, [&] { return secondsOf([&] { expandAll(path); }); });
}

// A small request, and in turn with it one to a handler that answers without doing anything: what
// is between them is the bundle's share.
void bundleAnswersSmall(benchmark::State& state, const char* channel, const std::string& request) {
    // Only what is published under the bundle's name counts as an answer.
    const auto client = bundle().bus().connect("EditorSerialization").get();
    const std::string response(1024, 'x');
    const auto subscription =
        client
            ->subscribe("empty",
                        [&](const platform::messaging::JsonMessage&) {
                            client->publish("answer", DataBuffer::copyOf(response));
                        })
            .get();
    std::vector<double> shares;
    measure(state, request.size(), [&] {
        const double empty = bundle().time("empty", DataBuffer::copyOf(request));
        const double whole = bundle().time(channel, DataBuffer::copyOf(request));
        shares.push_back(whole - empty);
        return whole;
    });
    const auto median = shares.begin() + std::ssize(shares) / 2;
    std::nth_element(shares.begin(), median, shares.end());
    state.counters["\u00B5s more than an empty handler"] = *median * 1e6;
}

void bundleAnswersSmallRead(benchmark::State& state) {
    const std::string path = scratch() / "1kb.txt";
    std::ofstream(path) << std::string(1000, 'x');
    bundleAnswersSmall(state, readRequestChannel, readRequest(path, "text/plain"));
}

void bundleAnswersSmallWrite(benchmark::State& state) {
    const std::string path = scratch() / "1kb.txt";
    std::ofstream(path) << std::string(1000, 'x');
    bundleAnswersSmall(state, writeRequestChannel, writeTextRequest(path, "UTF-8", path));
}

template <typename... Arguments>
void add(const std::string& name, void (*function)(benchmark::State&, Arguments...),
         const std::type_identity_t<Arguments>&... arguments) {
    benchmark::RegisterBenchmark(name.c_str(),
                                 [=](benchmark::State& state) {
                                     try {
                                         function(state, arguments...);
                                     } catch (const std::exception& error) {
                                         state.SkipWithError(error.what());
                                     }
                                 })
        ->UseManualTime()
        ->Unit(benchmark::kMicrosecond);
}

void addPackages() {
    for (const char* name :
         {"small.docx", "text-heavy.docx", "mixed.docx", "image-heavy.docx", "sheets.xlsx"}) {
        const std::string path = inputs / name;
        const std::string file = std::string("/") + name;
        add("read_package/bundle" + file, bundleReads, path, "text/xml");
        add("read_package/expand_only" + file, expandsOnly, path);
        add("read_package/python" + file, peerReads, python, "read-package", "-", path, "UTF-8");
        add("read_package/jszip" + file, peerReads, node, "read-package", "jszip", path, "UTF-8");
        add("read_package/fflate" + file, peerReads, node, "read-package", "fflate", path, "UTF-8");
        add("write_package/bundle" + file, bundleWritesPackage, path);
        add("write_package/python" + file, peerWritesPackage, python, "-", path);
        add("write_package/jszip" + file, peerWritesPackage, node, "jszip", path);
        add("write_package/fflate" + file, peerWritesPackage, node, "fflate", path);
    }
}

void addSaves() {
    for (const char* name : {"small.docx", "text-heavy.docx", "mixed.docx", "image-heavy.docx",
                             "sheets.xlsx", "many-sheets.xlsx"}) {
        const std::string path = inputs / name;
        const std::string file = std::string("/") + name;
        add("save_unchanged/bundle" + file, bundleSavesUnchanged, path);
        add("save_one_word/bundle" + file, bundleSavesOneWord, path);
    }
}

void addTexts() {
    for (const char* size : {"100KB", "5MB", "50MB"}) {
        for (const auto& [name, charset] :
             {std::pair<std::string, std::string>{"ascii.utf-8", "UTF-8"},
              {"japanese.utf-8", "UTF-8"},
              {"mixed.utf-8", "UTF-8"},
              {"japanese.shift_jis", "Shift_JIS"},
              {"russian.windows-1251", "windows-1251"}}) {
            const std::string file = "/" + name + "." + size + ".txt";
            const std::string path = inputs.string() + file;
            add("read_text/bundle" + file, bundleReads, path, "text/plain");
            if (charset == "UTF-8") {
                add("read_text/node" + file, peerReads, node, "read-text", "-", path, charset);
                add("read_text/python" + file, peerReads, python, "read-text", "-", path, charset);
            } else {
                add("read_text/node" + file, peerReads, node, "read-legacy", "-", path, charset);
            }
            add("write_text/bundle" + file, bundleWritesText, path, charset);
        }
    }
}

void addSmallRequests() {
    add("small_request/bundle/read of 1 KB", bundleAnswersSmallRead);
    add("small_request/bundle/write of 1 KB", bundleAnswersSmallWrite);
}

}  // namespace
}  // namespace benchmarks

int main(int argc, char** argv) {
    host::keepFreedMemory();
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) {
        return 1;
    }
    benchmarks::addPackages();
    benchmarks::addSaves();
    benchmarks::addTexts();
    benchmarks::addSmallRequests();
    benchmark::RunSpecifiedBenchmarks();
    return 0;
}
