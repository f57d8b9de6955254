// SPDX-License-Identifier: Apache-2.0
#include "host/limits/limiting_sink.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <spdlog/sinks/ostream_sink.h>

#include <chrono>
#include <memory>
#include <sstream>
#include <string>

namespace host {
namespace {

using namespace std::chrono_literals;
using spdlog::level::err;
using spdlog::level::warn;

// A sink that takes three lines in ten seconds.
class LimitingSinkTest : public ::testing::Test {
protected:
    LimitingSinkTest() { sink_.set_pattern("%n %l: %v"); }

    // Logs `text` so long after the beginning.
    void log(std::chrono::milliseconds after, const std::string& text,
             spdlog::level::level_enum level = err, const std::string& logger = "host") {
        sink_.log(spdlog::details::log_msg(start_ + after, {}, logger, level, text));
    }

    // What was logged since the last call.
    std::string logged() {
        const std::string text = output_.str();
        output_.str("");
        return text;
    }

    spdlog::log_clock::time_point start_ = spdlog::log_clock::now();
    std::ostringstream output_;
    LimitingSink sink_{std::make_shared<spdlog::sinks::ostream_sink_mt>(output_), 3, 10s};
};

TEST_F(LimitingSinkTest, PassesOnAsManyLinesAsFitIntoAPeriod) {
    for (const char* text : {"a", "b", "c"}) {
        log(0s, text);
    }
    EXPECT_EQ(logged(), "host error: a\nhost error: b\nhost error: c\n");
}

TEST_F(LimitingSinkTest, CountsTheOthersAndTellsWithTheFirstLineAfterThePeriod) {
    for (int i = 0; i < 3; ++i) {
        log(5s, "a");
    }
    logged();
    for (int i = 0; i < 1000; ++i) {
        log(14'999ms, "b");
    }
    EXPECT_EQ(logged(), "");
    log(15s, "c");
    EXPECT_EQ(logged(), "host error: lines like these that were left out: 1000\nhost error: c\n");
}

TEST_F(LimitingSinkTest, TakesAsManyLinesInEachPeriod) {
    for (const auto period : {0s, 10s, 20s}) {
        for (int i = 0; i < 3; ++i) {
            log(period, "a");
        }
        EXPECT_EQ(logged(), "host error: a\nhost error: a\nhost error: a\n");
    }
}

TEST_F(LimitingSinkTest, HidesNoLineOfAnotherLevelOrLogger) {
    for (int i = 0; i < 5; ++i) {
        log(0s, "a");
    }
    logged();
    log(1s, "b", warn);
    log(1s, "c", err, "other");
    EXPECT_EQ(logged(), "host warning: b\nother error: c\n");
}

TEST_F(LimitingSinkTest, TellsWithALineOfAnotherKindToo) {
    for (int i = 0; i < 5; ++i) {
        log(0s, "a");
    }
    logged();
    log(11s, "b", warn, "other");
    EXPECT_EQ(logged(), "host error: lines like these that were left out: 2\nother warning: b\n");
}

TEST_F(LimitingSinkTest, TellsWhenItIsFlushedAndNotAgain) {
    for (int i = 0; i < 5; ++i) {
        log(0s, "a");
    }
    logged();
    sink_.flush();
    EXPECT_EQ(logged(), "host error: lines like these that were left out: 2\n");
    sink_.flush();
    log(10s, "b");
    EXPECT_EQ(logged(), "host error: b\n");
}

TEST_F(LimitingSinkTest, EscapesWhatWouldBreakALineOrSteerATerminal) {
    log(0s, std::string("a\nb\r\x1B[2J\0\x7F", 10));
    EXPECT_EQ(logged(), "host error: a\\x0Ab\\x0D\\x1B[2J\\x00\\x7F\n");
    log(0s, "\xC2\x9B\xC2\x85");
    EXPECT_EQ(logged(), "host error: \\xC2\\x9B\\xC2\\x85\n");
}

TEST_F(LimitingSinkTest, KeepsUtf8AndEscapesOtherBytes) {
    const std::string text = "\xC3\xA9 \xE2\x82\xAC \xF0\x9F\x98\x80 \xC2\xA0";
    log(0s, text);
    EXPECT_EQ(logged(), "host error: " + text + "\n");
    // A byte of Latin-1, an overlong form, a surrogate, an end that is missing.
    log(0s, "caf\xE9! \xC0\xAF \xED\xA0\x80 \xE2\x82");
    EXPECT_EQ(logged(), "host error: caf\\xE9! \\xC0\\xAF \\xED\\xA0\\x80 \\xE2\\x82\n");
}

TEST_F(LimitingSinkTest, CutsWhatIsLongBetweenTwoCharacters) {
    for (const std::string character : {"x", "\xC3\xA9", "\xE2\x82\xAC", "\n", "\xFF"}) {
        std::string text;
        while (text.size() < 100'000) {
            text += character;
        }
        log(0s, text);
        const std::string line = logged();
        EXPECT_LT(line.size(), 2048U);
        EXPECT_GT(line.size(), 1980U);
        EXPECT_TRUE(line.ends_with("...\n"));
        const std::string shown = character == "\n"     ? "\\x0A"
                                  : character == "\xFF" ? "\\xFF"
                                                        : character;
        EXPECT_EQ((line.size() - std::string("host error: ...\n").size()) % shown.size(), 0U);
        sink_.flush();
        start_ += 10s;
    }
}

TEST_F(LimitingSinkTest, DoesNotCutWhatJustFits) {
    const std::string text(2000, 'x');
    log(0s, text);
    EXPECT_EQ(logged(), "host error: " + text + "\n");
    log(0s, text + "x");
    EXPECT_EQ(logged(), "host error: " + text.substr(3) + "...\n");
}

TEST_F(LimitingSinkTest, GoesOnWhenTheClockIsSetBack) {
    for (int i = 0; i < 4; ++i) {
        log(0s, "a");
    }
    logged();
    log(-1h, "b");
    EXPECT_EQ(logged(), "host error: lines like these that were left out: 1\nhost error: b\n");
}

}  // namespace
}  // namespace host
