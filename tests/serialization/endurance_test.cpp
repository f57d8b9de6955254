// SPDX-License-Identifier: Apache-2.0
// The loaded bundle over long runs: what it takes, it gives back.
//
// ENDURANCE_REQUESTS in the environment sets how many requests the long run makes.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <malloc.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "tests/support/process_state.h"
#include "tests/support/running_bundle.h"
#include "tests/support/temporary_directory.h"

namespace {

using namespace platform::messaging;
using test::Message;
using test::readRequestChannel;
using test::readResponsePrefix;
using test::RunningBundle;
using test::writeRequestChannel;

constexpr bool underSanitizers = UNDER_SANITIZERS;

TEST(Endurance, StartsAndEndsAThousandTimesWhileRequestsComeIn) {
    constexpr int repetitions = underSanitizers ? 50 : 1000;
    // Two threads that happen to allocate at once, however late, would have glibc make another
    // heap, a megabyte that is not a leak.
    ::mallopt(M_ARENA_MAX, 1);
    const test::TemporaryDirectory folder;
    test::writeFile(folder / "file", "\xCF\xF0\xE8\xE2\xE5\xF2");
    const auto bus = InProcessBus::create();
    setTransport([bus](const std::string& name, const auto&) { return bus->connect(name); });
    const auto client = bus->connect("client").get();
    std::atomic<int> answers = 0;
    const auto subscription = client
                                  ->subscribe(std::string(readResponsePrefix) + "1",
                                              [&](const JsonMessage&) { ++answers; })
                                  .get();
    std::atomic<bool> isDone = false;
    std::thread asking([&] {
        const std::string request =
            RunningBundle::request((folder / "file").string(), "text/plain", "1");
        while (!isDone) {
            client->publish(readRequestChannel, platform::DataBuffer::copyOf(request)).get();
            bus->waitUntilQueuedAtMost(2, 10'000);
        }
    });

    std::size_t descriptors = 0;
    std::size_t threadCount = 0;
    std::size_t resident = 0;
    for (int i = 0; i < repetitions; ++i) {
        const int answersBefore = answers;
        {
            const framework::BundleRunner bundle(SERIALIZATION_BUNDLE);
            if (i % 3 == 0) {
                while (answers == answersBefore) {
                    std::this_thread::yield();
                }
            }
        }
        if (i == repetitions / 4) {
            descriptors = test::openDescriptors();
            threadCount = test::settledThreads();
            resident = test::memoryOf("self", "VmRSS");
        }
    }
    EXPECT_EQ(test::openDescriptors(), descriptors);
    EXPECT_TRUE(test::comesToThreads(threadCount));
    if (!underSanitizers) {
        EXPECT_LE(test::memoryOf("self", "VmRSS"), resident + resident / 20);
    }
    isDone = true;
    asking.join();
    setTransport({});
    EXPECT_EQ(test::isLoaded(SERIALIZATION_BUNDLE), !BUNDLES_ARE_UNLOADED);
}

// Requests of every kind, whose answers are known from their first time.
class LongRun : public testing::Test {
protected:
    LongRun() {
        test::writeFile(folder / "utf8", "\xEF\xBB\xBFgr\xC3\xBC\xC3\x9F" + std::string(3000, 'x'));
        test::writeFile(folder / "cyrillic",
                        "\xCF\xF0\xE8\xE2\xE5\xF2, \xEC\xE8\xF0! \xC2\xF1\xE5\xEC "
                        "\xE4\xEE\xE1\xF0\xEE.");
        test::writeFile(folder / "no package", "PK\3\4");
        const std::string document =
            R"({"parts":[{"partUri":"/a.xml","contentType":"application/xml","content":"<a/>",)"
            R"("relationship":[{"relationshipId":"i","relationshipType":"t","target":"b.png"}]},)"
            R"({"partUri":"/b.png","contentType":"image/png","relationship":null,)"
            R"("content":"data:image/png;base64,iVBORw=="}],"relationships":[]})";
        addWrite("document", "text/xml", document);
        addWrite("document", "text/xml", R"({"parts":[7],"relationships":[]})");
        addWrite("document", "text/xml", "{}");
        addWrite("text", "text/plain", "\"some text\"");
        addWrite("text", "text/plain", "7");
        addWrite("no/such/folder", "text/plain", "\"never\"");
        for (const char* name :
             {"utf8", "cyrillic", "document", "no package", "text", "missing", ""}) {
            addRead(name, "text/plain");
            addRead(name, "text/xml");
        }
        requests.push_back({readRequestChannel, "no JSON at all"});
        requests.push_back({writeRequestChannel, R"({"rtcId":1})"});
    }

    void addRead(const std::string& name, const std::string& type) {
        requests.push_back(
            {readRequestChannel, RunningBundle::request((folder / name).string(), type, "1")});
    }

    void addWrite(const std::string& name, const std::string& type, const std::string& content) {
        requests.push_back(
            {writeRequestChannel, R"({"rtcId":"1","encoding":"UTF-8","contentType":")" + type +
                                      R"(","filePath":")" + (folder / name).string() +
                                      R"(","content":)" + content + "}"});
    }

    test::TemporaryDirectory folder;
    std::vector<Message> requests;
};

TEST_F(LongRun, TakesNoMoreMemoryOrDescriptorsAtItsEndAndAnswersAsAtItsStart) {
    constexpr long warmUp = underSanitizers ? 500 : 10'000;
    const char* const asked = std::getenv("ENDURANCE_REQUESTS");
    const long count = asked != nullptr ? std::atol(asked) : 2 * warmUp;
    ASSERT_GT(count, warmUp);
    RunningBundle bundle;
    // The failures are meant, and what is kept of them would be taken for a leak.
    spdlog::get("messaging")->set_level(spdlog::level::off);
    std::map<std::size_t, std::vector<Message>> expected;
    std::size_t descriptors = 0;
    std::size_t resident = 0;
    for (long i = 0; i < count; ++i) {
        const std::size_t kind = static_cast<std::size_t>(i) % requests.size();
        std::vector<Message> answers = bundle.send(requests[kind].channel, requests[kind].payload);
        // The first time, what is written is new.
        const bool isKnown = i >= static_cast<long>(2 * requests.size());
        if (isKnown) {
            ASSERT_EQ(answers, expected[kind]) << "request " << i;
        }
        expected[kind] = std::move(answers);
        if (i + 1 == warmUp) {
            descriptors = test::openDescriptors();
            resident = test::memoryOf("self", "VmRSS");
        }
    }
    EXPECT_EQ(test::openDescriptors(), descriptors);
    if (!underSanitizers) {
        EXPECT_LE(test::memoryOf("self", "VmRSS"), resident + resident / 20);
    }
    spdlog::get("messaging")->set_level(spdlog::level::info);
    RecordProperty("requests", std::to_string(count));
    RecordProperty("kilobytes_after_warm_up", std::to_string(resident / 1024));
    RecordProperty("kilobytes_at_the_end", std::to_string(test::memoryOf("self", "VmRSS") / 1024));
}

}  // namespace
