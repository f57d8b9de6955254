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

#include "tests/support/running_bundle.h"
#include "tests/support/temporary_directory.h"

namespace {

using namespace platform::messaging;
using test::kReadRequests;
using test::kReadResponses;
using test::kWriteRequests;
using test::Message;
using test::RunningBundle;

constexpr bool kUnderSanitizers = UNDER_SANITIZERS;

std::size_t entriesOf(const char* folder) {
    using Entries = std::filesystem::directory_iterator;
    return static_cast<std::size_t>(std::distance(Entries(folder), Entries()));
}

/// The number of threads. The system lists one that has been joined a moment longer, so it is
/// counted until it is the same for a while.
std::size_t threads() {
    std::size_t count = 0;
    for (int same = 0; same < 20; ++same) {
        const std::size_t now = entriesOf("/proc/self/task");
        same = now == count ? same : 0;
        count = now;
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return count;
}

std::size_t residentBytes() {
    std::size_t total = 0;
    std::size_t resident = 0;
    std::ifstream("/proc/self/statm") >> total >> resident;
    return resident * static_cast<std::size_t>(::sysconf(_SC_PAGESIZE));
}

bool isBundleLoaded() {
    std::ifstream maps("/proc/self/maps");
    for (std::string line; std::getline(maps, line);) {
        if (line.find(std::filesystem::path(SERIALIZATION_BUNDLE).filename()) !=
            std::string::npos) {
            return true;
        }
    }
    return false;
}

TEST(Endurance, StartsAndEndsAThousandTimesWhileRequestsComeIn) {
    constexpr int kTimes = kUnderSanitizers ? 50 : 1000;
    // Two threads that happen to allocate at once, however late, would have glibc make another
    // heap, a megabyte that is no leak.
    ::mallopt(M_ARENA_MAX, 1);
    const test::TemporaryDirectory folder;
    test::writeFile(folder / "file", "\xCF\xF0\xE8\xE2\xE5\xF2");
    const auto bus = InProcessBus::create();
    setTransport([bus](const std::string& name, const auto&) { return bus->connect(name); });
    const auto client = bus->connect("client").get();
    std::atomic<int> answers = 0;
    const auto subscription =
        client->subscribe(std::string(kReadResponses) + "1", [&](const JsonMessage&) { ++answers; })
            .get();
    std::atomic<bool> isDone = false;
    std::thread asking([&] {
        const std::string request =
            RunningBundle::request((folder / "file").string(), "text/plain", "1");
        while (!isDone) {
            client->publish(kReadRequests, platform::DataBuffer::copyOf(request)).get();
            bus->waitUntilQueuedAtMost(2, 10'000);
        }
    });

    std::size_t descriptors = 0;
    std::size_t threadCount = 0;
    std::size_t resident = 0;
    for (int i = 0; i < kTimes; ++i) {
        const int answersBefore = answers;
        {
            const framework::BundleRunner bundle(SERIALIZATION_BUNDLE);
            if (i % 3 == 0) {
                while (answers == answersBefore) {
                    std::this_thread::yield();
                }
            }
        }
        if (i == kTimes / 4) {
            descriptors = entriesOf("/proc/self/fd");
            threadCount = threads();
            resident = residentBytes();
        }
    }
    EXPECT_EQ(entriesOf("/proc/self/fd"), descriptors);
    EXPECT_EQ(threads(), threadCount);
    if (!kUnderSanitizers) {
        EXPECT_LE(residentBytes(), resident + resident / 20);
    }
    isDone = true;
    asking.join();
    setTransport({});
    EXPECT_EQ(isBundleLoaded(), !BUNDLES_ARE_UNLOADED);
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
        requests.push_back({kReadRequests, "no JSON at all"});
        requests.push_back({kWriteRequests, R"({"rtcId":1})"});
    }

    void addRead(const std::string& name, const std::string& type) {
        requests.push_back(
            {kReadRequests, RunningBundle::request((folder / name).string(), type, "1")});
    }

    void addWrite(const std::string& name, const std::string& type, const std::string& content) {
        requests.push_back({kWriteRequests, R"({"rtcId":"1","encoding":"UTF-8","contentType":")" +
                                                type + R"(","filePath":")" +
                                                (folder / name).string() + R"(","content":)" +
                                                content + "}"});
    }

    test::TemporaryDirectory folder;
    std::vector<Message> requests;
};

TEST_F(LongRun, TakesNoMoreMemoryOrDescriptorsAtItsEndAndAnswersAsAtItsStart) {
    constexpr long kWarmUp = kUnderSanitizers ? 500 : 10'000;
    const char* const asked = std::getenv("ENDURANCE_REQUESTS");
    const long count = asked != nullptr ? std::atol(asked) : 2 * kWarmUp;
    ASSERT_GT(count, kWarmUp);
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
        if (i + 1 == kWarmUp) {
            descriptors = entriesOf("/proc/self/fd");
            resident = residentBytes();
        }
    }
    EXPECT_EQ(entriesOf("/proc/self/fd"), descriptors);
    if (!kUnderSanitizers) {
        EXPECT_LE(residentBytes(), resident + resident / 20);
    }
    spdlog::get("messaging")->set_level(spdlog::level::info);
    RecordProperty("requests", std::to_string(count));
    RecordProperty("kilobytes_after_warm_up", std::to_string(resident / 1024));
    RecordProperty("kilobytes_at_the_end", std::to_string(residentBytes() / 1024));
}

}  // namespace
