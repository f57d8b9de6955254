// SPDX-License-Identifier: Apache-2.0
// How long it takes to tell the charset of a text of 18 KB, in the legacy charsets of each
// language.
#include <benchmark/benchmark.h>

#include <cstddef>
#include <initializer_list>
#include <sstream>
#include <string>
#include <utility>
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

int main(int argc, char** argv) {
    for (const auto& [name, language] : std::initializer_list<std::pair<std::string, std::string>>{
             {"english", "en"},
             {"french", "fr"},
             {"czech", "cs"},
             {"latvian", "lv"},
             {"russian", "ru"},
             {"greek", "el"},
             {"hebrew", "he"},
             {"arabic", "ar"},
             {"thai", "th"},
             {"vietnamese", "vi"},
             {"japanese", "ja"},
             {"chinese", "zh-Hans"},
             {"taiwanese", "zh-Hant"},
             {"korean", "ko"},
         }) {
        benchmark::RegisterBenchmark(("detect a charset/" + name + "/ours").c_str(), detectLegacy,
                                     language);
    }
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
}
