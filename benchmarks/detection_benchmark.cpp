// SPDX-License-Identifier: Apache-2.0
// How long it takes to tell the charset of a text of 18 KB, in the legacy charsets of each
// language.
#include <benchmark/benchmark.h>

#include <cstddef>
#include <sstream>
#include <string>
#include <vector>

#include "platform/i18n/detect_charset.h"
#include "tests/platform/i18n/detection/corpus.h"

namespace {

constexpr std::size_t textSize = std::size_t{18} * 1024;

// Reports the time for one text on average over the charsets of a language.
void detectLegacy(benchmark::State& state, const std::string& language) {
    std::vector<std::string> texts;
    for (const test::CorpusEntry& entry : test::corpusEntries()) {
        if (entry.language == language && !entry.charset.starts_with("UTF-") &&
            !entry.charset.starts_with("ISO-2022")) {
            const std::string text = test::grownTo(test::corpusText(language), textSize);
            texts.push_back(test::iconvEncode(entry.iconvName, text).value());
        }
    }
    std::ostringstream diagnostics;
    std::size_t next = 0;
    for (auto _ : state) {
        const std::string& text = texts[next++ % texts.size()];
        benchmark::DoNotOptimize(
            platform::i18n::detect_charset(text.data(), text.size(), diagnostics, u"text"));
    }
}

}  // namespace

BENCHMARK_CAPTURE(detectLegacy, english, "en")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, french, "fr")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, czech, "cs")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, latvian, "lv")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, russian, "ru")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, greek, "el")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, hebrew, "he")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, arabic, "ar")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, thai, "th")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, vietnamese, "vi")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, japanese, "ja")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, chinese, "zh-Hans")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, taiwanese, "zh-Hant")->Iterations(60);
BENCHMARK_CAPTURE(detectLegacy, korean, "ko")->Iterations(60);
