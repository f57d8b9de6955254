// Parsing, writing, copying and destroying JSON values of three shapes:
//   records   many small objects of short strings, numbers and booleans
//   document  a package as it is sent to be written: few objects, long strings with many escapes
//   integers  one long typed array
#include <benchmark/benchmark.h>

#include <cstdint>
#include <optional>
#include <string>
#include <utility>

#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"

namespace {

using json::Array;
using json::Object;
using json::Value;

std::string recordsText() {
    Array records;
    for (int i = 0; i < 10000; ++i) {
        const std::string number = std::to_string(i * 7919 % 10000);
        records.emplace_back(Object{
            {"id", static_cast<double>(i)},
            {"name", "user " + number},
            {"mail", "user." + number + "@example.org"},
            {"active", i % 3 == 0},
            {"score", i / 7.0},
            {"tags", Array{"first", "second"}},
            {"place", Object{{"lat", i * 0.001}, {"lon", i * -0.002}, {"zone", json::Null()}}}});
    }
    return json::serialize(Object{{"records", std::move(records)}});
}

std::string documentText() {
    std::string body =
        "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"yes\"?>\r\n<document>";
    for (int i = 0; i < 2000; ++i)
        body += "<p id=\"" + std::to_string(i) +
                "\"><r><t xml:space=\"preserve\">A line of text, with "
                "nothing in it that is out of the ordinary. </t></r></p>";
    Array parts;
    for (int i = 0; i < 10; ++i) {
        parts.emplace_back(Object{{"partUri", "/document/part" + std::to_string(i) + ".xml"},
                                  {"contentType", "application/xml"},
                                  {"content", body},
                                  {"relationship", Array()}});
    }
    return json::serialize(Object{{"parts", std::move(parts)}, {"relationships", Array()}});
}

std::string integersText() {
    std::string text = R"({"kqtype":"int32","kqdata":[0)";
    for (int i = 0; i < 200000; ++i)
        text += "," + std::to_string(i * 7919 % 100000);
    return text + "]}";
}

const std::string& textOf(std::int64_t shape) {
    static const std::string texts[] = {recordsText(), documentText(), integersText()};
    return texts[shape];
}

void describe(benchmark::State& state) {
    static char const* const names[] = {"records", "document", "integers"};
    state.SetLabel(names[state.range(0)]);
    state.SetBytesProcessed(state.iterations() *
                            static_cast<std::int64_t>(textOf(state.range(0)).size()));
}

void parse(benchmark::State& state) {
    const std::string& text = textOf(state.range(0));
    std::optional<Object> object;
    for (auto _ : state) {
        object = json::parse(text);
        state.PauseTiming();
        object.reset();
        state.ResumeTiming();
    }
    describe(state);
}

void parseAndDestroy(benchmark::State& state) {
    const std::string& text = textOf(state.range(0));
    for (auto _ : state)
        benchmark::DoNotOptimize(json::parse(text));
    describe(state);
}

void serialize(benchmark::State& state) {
    const Value value(json::parse(textOf(state.range(0))));
    for (auto _ : state)
        benchmark::DoNotOptimize(json::serialize(value));
    describe(state);
}

void copyAndDestroy(benchmark::State& state) {
    const Value value(json::parse(textOf(state.range(0))));
    for (auto _ : state) {
        Value copy = value;
        benchmark::DoNotOptimize(copy);
    }
    describe(state);
}

BENCHMARK(parse)->DenseRange(0, 2)->Unit(benchmark::kMillisecond);
BENCHMARK(parseAndDestroy)->DenseRange(0, 2)->Unit(benchmark::kMillisecond);
BENCHMARK(serialize)->DenseRange(0, 2)->Unit(benchmark::kMillisecond);
BENCHMARK(copyAndDestroy)->DenseRange(0, 2)->Unit(benchmark::kMillisecond);

}  // namespace
