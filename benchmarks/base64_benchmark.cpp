// SPDX-License-Identifier: Apache-2.0
// Base64 both ways, beside OpenSSL. Names are "<what>/<input>/<who>".
#include <benchmark/benchmark.h>
#include <openssl/evp.h>

#include <cstdint>
#include <random>
#include <string>
#include <string_view>
#include <vector>

#include "platform/base64/base64.h"
#include "platform/data_buffer.h"

namespace {

using platform::DataBuffer;

constexpr struct {
    const char* name;
    std::size_t bytes;
} sizes[] = {{"1 KB", 1'000}, {"100 KB", 100'000}, {"5 MB", 5'000'000}};

DataBuffer randomBytes(std::size_t count) {
    std::mt19937 random(1);
    DataBuffer bytes(count);
    for (std::size_t i = 0; i < count; ++i)
        bytes.data()[i] = static_cast<char>(random());
    bytes.setLength(count);
    return bytes;
}

/// A buffer of its own for each result, as ours.
void encodeByOpenssl(const DataBuffer& bytes) {
    DataBuffer text((bytes.length() + 2) / 3 * 4 + 1);
    EVP_EncodeBlock(reinterpret_cast<unsigned char*>(text.data()),
                    reinterpret_cast<const unsigned char*>(bytes.data()),
                    static_cast<int>(bytes.length()));
    benchmark::DoNotOptimize(text.data());
}

void decodeByOpenssl(std::string_view text) {
    DataBuffer bytes((text.size() + 3) / 4 * 3);
    EVP_DecodeBlock(reinterpret_cast<unsigned char*>(bytes.data()),
                    reinterpret_cast<const unsigned char*>(text.data()),
                    static_cast<int>(text.size()));
    benchmark::DoNotOptimize(bytes.data());
}

template <typename Action>
void measure(const std::string& name, std::size_t bytes, Action action) {
    benchmark::RegisterBenchmark(name.c_str(), [bytes, action](benchmark::State& state) {
        const DataBuffer raw = randomBytes(bytes);
        const DataBuffer text = platform::base64encode(raw);
        for (auto _ : state)
            action(raw, text.view());
        state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(bytes));
    });
}

const bool registered = [] {
    for (const auto& [name, bytes] : sizes) {
        const std::string input = std::string("/") + name;
        measure("base64 encode" + input + "/ours", bytes,
                [](const DataBuffer& raw, std::string_view) {
                    benchmark::DoNotOptimize(platform::base64encode(raw).data());
                });
        measure("base64 encode" + input + "/OpenSSL", bytes,
                [](const DataBuffer& raw, std::string_view) { encodeByOpenssl(raw); });
        measure("base64 decode" + input + "/ours", bytes,
                [](const DataBuffer&, std::string_view text) {
                    benchmark::DoNotOptimize(platform::base64decode(text).data());
                });
        measure("base64 decode" + input + "/OpenSSL", bytes,
                [](const DataBuffer&, std::string_view text) { decodeByOpenssl(text); });
    }
    return true;
}();

}  // namespace
