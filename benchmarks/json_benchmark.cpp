// SPDX-License-Identifier: Apache-2.0
// JSON texts to values and back, beside the peers; and how the time grows with the size of a text
// and the number of an object's members. Names are "<what>/<input>/<who>".
#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdint>
#include <functional>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "benchmarks/inputs.h"
#include "benchmarks/json_peers.h"
#include "host/limits/freed_memory.h"
#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"

namespace {

using benchmarks::JsonPeer;

// ---- Beside the peers ----

/// Registers a benchmark that prepares once and then measures what it prepared.
template <typename Prepare>
void measure(const std::string& name, const std::string& text, Prepare prepare) {
    benchmark::RegisterBenchmark(name.c_str(), [&text, prepare](benchmark::State& state) {
        const auto action = prepare(text);
        for (auto _ : state)
            action();
        state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(text.size()));
    })->Unit(benchmark::kMicrosecond);
}

/// The generated text `name`, for as long as the program runs.
const std::string& text(const std::string& name) {
    return *new std::string(benchmarks::input(name + ".json"));
}

void registerDocuments() {
    for (const char* name : {"text-100KB", "text-5MB", "text-50MB", "mixed-5MB", "images-5MB"}) {
        const std::string& document = text(name);
        for (const JsonPeer& peer : benchmarks::jsonPeers()) {
            const std::string end = std::string("/") + name + "/" + peer.name;
            measure("parse document JSON" + end, document, peer.parsing);
            if (peer.writing)
                measure("serialize document JSON" + end, document, peer.writing);
        }
    }
}

void registerRecords() {
    const std::string& records = text("records");
    for (const JsonPeer& peer : benchmarks::jsonPeers()) {
        const std::string end = "/records/" + peer.name;
        const bool hasMaps = peer.name == "ours" || peer.name == "nlohmann";
        if (hasMaps || peer.name == "Boost.JSON")
            measure("parse object-dense JSON" + end, records, peer.parsing);
        if (peer.writing)
            measure("serialize object-dense JSON" + end, records, peer.writing);
    }
}

// ---- As work grows ----

std::string sizeName(std::size_t bytes) {
    if (bytes >= 1'000'000)
        return std::to_string(bytes / 1'000'000) + " MB";
    return std::to_string(bytes / 1'000) + " KB";
}

/// An object of parts with `size` bytes of text in all, in strings of up to 1 MB.
std::string documentOfSize(std::size_t size) {
    const json::Object source = json::parse(benchmarks::input("text-5MB.json"));
    const std::string* content = nullptr;
    for (const json::Value& part : source.at("parts").get<json::Array>()) {
        const auto& text = part.get<json::Object>().at("content").get<std::string>();
        if (content == nullptr || text.size() > content->size())
            content = &text;
    }
    json::Array parts;
    for (std::size_t made = 0; made < size;) {
        // Escapes and the other members make a text longer by about a tenth.
        const std::size_t length = std::min<std::size_t>(1'000'000, (size - made) * 9 / 10 + 1);
        parts.emplace_back(json::Object{{"content", content->substr(made % 3'000'000, length)}});
        made += length * 10 / 9 + 20;
    }
    return json::serialize(json::Object{{"parts", std::move(parts)}});
}

void registerSizes() {
    for (const std::size_t size :
         {1'000u, 10'000u, 100'000u, 1'000'000u, 10'000'000u, 100'000'000u, 500'000'000u}) {
        const auto run = [size](benchmark::State& state, auto prepare) {
            const std::string text = documentOfSize(size);
            const auto action = prepare(text);
            for (auto _ : state)
                action();
            state.counters["ns per byte"] = benchmark::Counter(
                static_cast<double>(text.size()) * static_cast<double>(state.iterations()) / 1e9,
                benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
        };
        const JsonPeer ours = benchmarks::jsonPeers().front();
        for (const auto& [what, prepare] :
             {std::pair("parse JSON", ours.parsing), std::pair("serialize JSON", ours.writing)}) {
            const std::string name = what + (" of a size/" + sizeName(size)) + "/ours";
            benchmark::RegisterBenchmark(name.c_str(), run, prepare)->Unit(benchmark::kMicrosecond);
        }
    }
}

/// An object of `count` members with short keys and values.
std::string objectOf(std::size_t count, bool sorted) {
    std::vector<std::size_t> numbers(count);
    for (std::size_t i = 0; i < count; ++i)
        numbers[i] = i;
    if (!sorted)
        std::shuffle(numbers.begin(), numbers.end(), std::mt19937(1));
    std::string text = "{";
    for (const std::size_t number : numbers) {
        const std::string digits = std::to_string(10'000'000 + number);
        text += (text.size() == 1 ? "\"" : ",\"") + digits + "\":\"value " + digits + "\"";
    }
    return text + "}";
}

void registerMembers() {
    for (const std::size_t count : {1u, 10u, 100u, 1'000u, 10'000u, 100'000u, 1'000'000u}) {
        const auto run = [count](benchmark::State& state, auto prepare, bool sorted) {
            const std::string text = objectOf(count, sorted);
            const auto action = prepare(text);
            for (auto _ : state)
                action();
            state.counters["ns per member"] = benchmark::Counter(
                static_cast<double>(count) * static_cast<double>(state.iterations()) / 1e9,
                benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
        };
        const JsonPeer ours = benchmarks::jsonPeers().front();
        const std::string end = "/" + std::to_string(count) + "/ours";
        benchmark::RegisterBenchmark(("parse an object, keys in order" + end).c_str(), run,
                                     ours.parsing, true)
            ->Unit(benchmark::kMicrosecond);
        benchmark::RegisterBenchmark(("parse an object, keys in disorder" + end).c_str(), run,
                                     ours.parsing, false)
            ->Unit(benchmark::kMicrosecond);
        benchmark::RegisterBenchmark(("serialize an object" + end).c_str(), run, ours.writing, true)
            ->Unit(benchmark::kMicrosecond);
    }
}

const bool registered = [] {
    // As the host does. It makes destroying trees cheaper, those of the peers too.
    host::keepFreedMemory();
    registerDocuments();
    registerRecords();
    registerSizes();
    registerMembers();
    return true;
}();

}  // namespace
