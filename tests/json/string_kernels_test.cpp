// SPDX-License-Identifier: Apache-2.0
// The string kernels against plain loops over bytes: all kernels that this machine can run, on
// random content of every length and alignment, in memory that ends where the next page cannot be
// touched.
#include "json/string_kernels.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <string>
#include <string_view>

#include "tests/support/guarded_memory.h"

namespace json::detail {
namespace {

using test::GuardedMemory;

// ---- What the kernels are to do, byte by byte ----

constexpr std::string_view letters = "\"/\\bfnrt";
constexpr std::string_view characters = "\"/\\\b\f\n\r\t";

StringExtent plainMeasure(std::string_view text) {
    std::size_t escapes = 0;
    std::size_t i = 0;
    while (i < text.size() && text[i] != '"') {
        if (text[i] == '\\') {
            ++escapes;
            ++i;
        }
        ++i;
    }
    return {text.data() + std::min(i, text.size()), escapes};
}

/// Appends what the content stands for to `out` and returns how many bytes that takes up.
std::size_t plainUnescape(std::string_view content, std::string& out) {
    for (std::size_t i = 0; i < content.size(); ++i) {
        if (content[i] != '\\') {
            out += content[i];
            continue;
        }
        if (i + 1 == content.size() || letters.find(content[i + 1]) == std::string_view::npos)
            return i;
        out += characters[letters.find(content[++i])];
    }
    return content.size();
}

std::string plainEscape(std::string_view bytes) {
    std::string out;
    for (const char c : bytes) {
        constexpr std::string_view escaped = "\"\\\b\f\n\r\t";
        constexpr std::string_view escapes = "\"\\bfnrt";
        if (const auto found = escaped.find(c); found != std::string_view::npos) {
            out += '\\';
            out += escapes[found];
        } else if (static_cast<unsigned char>(c) < 0x20) {
            out += "\\u00";
            out += "0123456789abcdef"[c >> 4];
            out += "0123456789abcdef"[c & 15];
        } else {
            out += c;
        }
    }
    return out;
}

// ---- Content ----

/// Random bytes; `density` in a hundred of them are ones that the kernels look for.
std::string randomBytes(std::mt19937& random, std::size_t length, unsigned density) {
    std::string bytes(length, '\0');
    for (char& c : bytes) {
        constexpr std::string_view special = "\\\\\\\\\\\"\"\n\x01\x1f\x7f\x80\xff";
        c = random() % 100 < density ? special[random() % special.size()]
                                     : static_cast<char>(random());
    }
    return bytes;
}

/// Random content in which most backslashes begin an escape of two characters.
std::string randomContent(std::mt19937& random, std::size_t length, unsigned density) {
    std::string content;
    while (content.size() < length) {
        if (random() % 100 < density) {
            content += '\\';
            content += random() % 200 == 0 ? static_cast<char>(random()) : letters[random() % 8];
        } else {
            content += static_cast<char>('a' + random() % 26);
        }
    }
    content.resize(length);
    return content;
}

class StringKernelsTest : public testing::TestWithParam<const StringKernels*> {
protected:
    /// Calls `check(length, gap, density)` for many of each.
    template <typename Check>
    void forAll(Check check) {
        for (std::size_t length = 0; length <= 420; length += length < 150 ? 1 : 7) {
            for (const unsigned density : {0u, 2u, 20u, 60u})
                check(length, std::uniform_int_distribution<std::size_t>(0, 100)(random), density);
            check(length, 0, 10u);
        }
    }

    const StringKernels& kernels = *GetParam();
    GuardedMemory source;
    GuardedMemory target;
    std::mt19937 random{1};
};

TEST_P(StringKernelsTest, MeasuresAsByteByByte) {
    for (int round = 0; round < 4; ++round) {
        forAll([&](std::size_t length, std::size_t gap, unsigned density) {
            const std::string bytes = randomBytes(random, length, density);
            const std::string_view text = source.place(bytes, gap);
            const auto [end, escapes] = kernels.measure(text.data(), text.data() + text.size());
            const StringExtent expected = plainMeasure(text);
            ASSERT_EQ(end - text.data(), expected.end - text.data())
                << testing::PrintToString(bytes);
            ASSERT_EQ(escapes, expected.escapes) << testing::PrintToString(bytes);
        });
    }
}

TEST_P(StringKernelsTest, MeasuresRunsOfBackslashesOfEveryLengthAtEveryPlace) {
    for (std::size_t before = 0; before <= 70; ++before) {
        for (std::size_t run = 0; run <= 140; ++run) {
            const std::string bytes = std::string(before, 'a') + std::string(run, '\\') +
                                      "\"b\"cc" + std::string(130, 'd');
            const auto [end, escapes] = kernels.measure(bytes.data(), bytes.data() + bytes.size());
            ASSERT_EQ(static_cast<std::size_t>(end - bytes.data()), before + run + run % 2 * 2);
            ASSERT_EQ(escapes, (run + 1) / 2);
        }
    }
}

TEST_P(StringKernelsTest, UnescapesAsByteByByteIntoMemoryOfTheMeasuredSize) {
    for (int round = 0; round < 4; ++round) {
        forAll([&](std::size_t length, std::size_t gap, unsigned density) {
            const std::string bytes = randomContent(random, length, density);
            const std::string_view content = source.place(bytes, gap);
            std::string expected;
            const std::size_t consumed = plainUnescape(content, expected);

            std::size_t escapes = 0;
            for (std::size_t i = 0; i < content.size(); ++i) {
                if (content[i] == '\\') {
                    ++escapes;
                    ++i;
                }
            }
            char* const out = target.end - (content.size() - escapes);
            const Copied copied =
                kernels.unescape(content.data(), content.data() + content.size(), out, target.end);
            ASSERT_EQ(static_cast<std::size_t>(copied.in - content.data()), consumed)
                << testing::PrintToString(bytes);
            ASSERT_EQ(std::string_view(out, copied.out), expected) << testing::PrintToString(bytes);
        });
    }
}

TEST_P(StringKernelsTest, UnescapesEachLetterAtEachPlaceInABlock) {
    for (int letter = 0; letter < 256; ++letter) {
        for (std::size_t before = 0; before < 70; ++before) {
            const std::string content =
                std::string(before, 'a') + '\\' + static_cast<char>(letter) + std::string(200, 'z');
            std::string expected;
            const std::size_t consumed = plainUnescape(content, expected);
            std::string out(content.size(), '\0');
            const Copied copied = kernels.unescape(content.data(), content.data() + content.size(),
                                                   out.data(), out.data() + out.size());
            ASSERT_EQ(static_cast<std::size_t>(copied.in - content.data()), consumed);
            ASSERT_EQ(std::string_view(out.data(), copied.out), expected);
        }
    }
}

TEST_P(StringKernelsTest, EscapesAsByteByByteIntoMemoryOfAnySize) {
    for (int round = 0; round < 4; ++round) {
        forAll([&](std::size_t length, std::size_t gap, unsigned density) {
            const std::string bytes = randomBytes(random, length, density);
            const std::string_view text = source.place(bytes, gap);
            const std::string expected = plainEscape(bytes);
            // From none at all to more than enough.
            const std::size_t room = random() % (expected.size() + 1000);
            char* const out = target.end - std::min<std::size_t>(room, 4000);
            const Copied copied =
                kernels.escape(text.data(), text.data() + text.size(), out, target.end);
            const auto consumed = static_cast<std::size_t>(copied.in - text.data());
            ASSERT_EQ(std::string_view(out, copied.out), plainEscape(text.substr(0, consumed)))
                << testing::PrintToString(bytes);
            if (consumed < text.size()) {
                ASSERT_LT(target.end - copied.out, maxEscapeLength);
            }
        });
    }
}

TEST_P(StringKernelsTest, EscapesEveryByteAtEachPlaceInABlock) {
    for (int byte = 0; byte < 256; ++byte) {
        for (std::size_t before = 0; before < 70; ++before) {
            const std::string bytes =
                std::string(before, 'a') + static_cast<char>(byte) + std::string(200, 'z');
            std::string out(2000, '\0');
            const Copied copied = kernels.escape(bytes.data(), bytes.data() + bytes.size(),
                                                 out.data(), out.data() + out.size());
            ASSERT_EQ(copied.in, bytes.data() + bytes.size());
            ASSERT_EQ(std::string_view(out.data(), copied.out), plainEscape(bytes));
        }
    }
}

TEST_P(StringKernelsTest, CountsWhatNeedsAnEscape) {
    forAll([&](std::size_t length, std::size_t gap, unsigned density) {
        const std::string bytes = randomBytes(random, length, density);
        const std::string_view text = source.place(bytes, gap);
        const auto needsEscape = [](char c) {
            return c == '"' || c == '\\' || static_cast<unsigned char>(c) < 0x20;
        };
        ASSERT_EQ(kernels.countEscapes(text.data(), text.data() + text.size()),
                  static_cast<std::size_t>(std::count_if(bytes.begin(), bytes.end(), needsEscape)));
    });
}

INSTANTIATE_TEST_SUITE_P(Json, StringKernelsTest,
                         testing::ValuesIn(runnableStringKernels().begin(),
                                           runnableStringKernels().end()),
                         [](const auto& kernels) { return std::string(kernels.param->name); });

}  // namespace
}  // namespace json::detail
