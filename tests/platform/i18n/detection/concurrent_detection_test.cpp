// SPDX-License-Identifier: Apache-2.0
// Detection on several threads at once, from the first use of its tables on. A program of its own,
// for the thread sanitizer to look at.
#include <gtest/gtest.h>

#include <array>
#include <future>
#include <sstream>
#include <string>
#include <vector>

#include "platform/i18n/detect_charset.h"
#include "tests/platform/i18n/detection/corpus.h"

namespace platform::i18n {
namespace {

std::string detect(const std::string& bytes) {
    std::ostringstream diagnostics;
    return detect_charset(bytes.data(), bytes.size(), diagnostics, u"<unknown>");
}

TEST(DetectCharset, MayBeCalledFromManyThreads) {
    const std::array<std::string, 2> texts = {
        test::iconvEncode("KOI8-R", test::corpusText("ru")).value(),
        test::iconvEncode("EUC-JP", test::corpusText("ja")).value(),
    };
    std::vector<std::future<std::string>> answers;
    for (std::size_t i = 0; i < 8; ++i) {
        answers.push_back(std::async(std::launch::async, detect, texts.at(i % 2)));
    }
    for (std::size_t i = 0; i < answers.size(); ++i) {
        EXPECT_EQ(answers[i].get(), i % 2 == 0 ? "KOI8-R" : "EUC-JP");
    }
}

}  // namespace
}  // namespace platform::i18n
