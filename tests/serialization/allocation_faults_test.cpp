// SPDX-License-Identifier: Apache-2.0
// What happens to each kind of request when any of the allocations along its way fails.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstddef>
#include <exception>
#include <functional>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "json/parser.h"
#include "tests/support/failing_malloc.h"
#include "tests/support/names_in.h"
#include "tests/support/process_state.h"
#include "tests/support/running_bundle.h"
#include "tests/support/temporary_directory.h"

namespace {

using test::Failing;
using test::Message;
using test::notificationChannel;
using test::readFile;
using test::readRequestChannel;
using test::readResponsePrefix;
using test::RunningBundle;
using test::writeRequestChannel;
using test::writeResponsePrefix;
using testing::AnyOf;
using testing::ElementsAre;

class AllocationFaults : public testing::TestWithParam<Failing> {
protected:
    ~AllocationFaults() override { test::stopFailing(); }

    static std::string writeRequest(const std::string& path, const std::string& contentType,
                                    json::Value content) {
        json::Object request{{"rtcId", "1"},
                             {"contentType", contentType},
                             {"filePath", path},
                             {"encoding", "windows-1251"}};
        request["content"] = std::move(content);
        return json::serialize(json::Value(std::move(request)));
    }

    static json::Value packageContent(const std::string& text) {
        return json::parse(
            R"({"v":{"parts":[{"partUri":"/a.xml","contentType":"application/xml","content":")" +
            text +
            R"(","relationship":[{"relationshipId":"i","relationshipType":"t","target":"b.png"}]},)"
            R"({"partUri":"/b.png","contentType":"image/png","relationship":null,)"
            R"("content":"data:image/png;base64,iVBORw=="}],"relationships":[)"
            R"({"relationshipId":"i","relationshipType":"t","target":"a.xml"}]}})")["v"];
    }

    std::set<std::string> names() const { return test::namesIn(folder.path()); }

    /// Sends the request once for each of its allocations, which fails then. Before each time
    /// `prepare` is called, and afterwards `check` with what the bundle published and what it
    /// publishes when nothing fails.
    void failEach(const char* channel, const std::string& request,
                  const std::function<void()>& prepare,
                  const std::function<void(const std::vector<Message>& got,
                                           const std::vector<Message>& whole)>& check) {
        const test::SparedThread spared;
        prepare();
        const std::vector<Message> whole = bundle.send(channel, request);
        ASSERT_FALSE(whole.empty());
        const std::size_t descriptors = test::openDescriptors();
        for (long failing = 0, allocations = 1; failing <= allocations; ++failing) {
            SCOPED_TRACE("allocation " + std::to_string(failing));
            prepare();
            test::failAllocation(failing, GetParam());
            const std::vector<Message> got = bundle.send(channel, request);
            allocations = test::stopFailing();
            check(got, whole);
            ASSERT_FALSE(HasFailure());
            faults += failing < allocations ? 1 : 0;
        }
        EXPECT_EQ(test::openDescriptors(), descriptors);
        prepare();
        EXPECT_EQ(bundle.send(channel, request), whole);
        RecordProperty("faults", std::to_string(faults));
        EXPECT_GT(faults, 20);
    }

    test::TemporaryDirectory folder;
    const std::string path = (folder / "document").string();
    RunningBundle bundle;
    long faults = 0;
};

// Whole, or why not, or nothing; never something else.
void expectReadOutcome(const std::vector<Message>& got, const std::vector<Message>& whole) {
    if (got.empty() || got == whole) {
        return;
    }
    ASSERT_EQ(got.size(), 1u);
    EXPECT_EQ(got[0].channel, std::string(readResponsePrefix) + "1");
    json::Object answer = json::parse(got[0].payload);
    EXPECT_EQ(answer["status"], json::Value(false)) << got[0].payload;
    EXPECT_THAT(answer["exception"].get<std::string>(), AnyOf("std::bad_alloc", "Out of memory!"));
}

// A notification, and after it true or false; each may be missing.
void expectWriteOutcome(const std::vector<Message>& got, const std::vector<Message>& whole) {
    ASSERT_LE(got.size(), 2u);
    if (got.size() == 2 || (got.size() == 1 && got[0].channel == notificationChannel)) {
        EXPECT_EQ(got[0], whole[0]);
    }
    if (got.size() == 2 || (got.size() == 1 && got[0].channel != notificationChannel)) {
        EXPECT_EQ(got.back().channel, std::string(writeResponsePrefix) + "1");
        EXPECT_THAT(got.back().payload, AnyOf("true", "false"));
    }
}

TEST_P(AllocationFaults, OfATextsReadNeverGiveAnythingButTheTextOrTheReason) {
    // Long enough for a detection by more than the first look.
    std::string text;
    for (int i = 0; i < 8; ++i) {
        text += "\xCF\xF0\xE8\xE2\xE5\xF2, \xEC\xE8\xF0! \xC2\xF1\xE5\xEC \xE4\xEE\xE1\xF0\xEE.\n";
    }
    test::writeFile(path, text);
    failEach(
        readRequestChannel, RunningBundle::request(path, "text/plain", "1"), [] {},
        expectReadOutcome);
}

TEST_P(AllocationFaults, OfAPackagesReadNeverGiveAnythingButThePackageOrTheReason) {
    const test::SparedThread spared;
    bundle.send(writeRequestChannel, writeRequest(path, "text/xml", packageContent("<text/>")));
    failEach(
        readRequestChannel, RunningBundle::request(path, "text/xml", "1"), [] {},
        expectReadOutcome);
}

TEST_P(AllocationFaults, OfATextsWriteLeaveTheOldTextTheNewOneOrNone) {
    const std::string newText = "\xCF\xF0\xE8\xE2\xE5\xF2";
    failEach(
        writeRequestChannel, writeRequest(path, "text/plain", newText),
        [&] { test::writeFile(path, "old"); },
        [&](const std::vector<Message>& got, const std::vector<Message>& whole) {
            expectWriteOutcome(got, whole);
            EXPECT_THAT(readFile(path), AnyOf("old", newText, ""));
            if (got == whole) {
                EXPECT_THAT(readFile(path), newText);
            }
            EXPECT_THAT(names(), ElementsAre("document"));
        });
}

TEST_P(AllocationFaults, OfAPackagesWriteLeaveTheOldPackageOrTheNewOne) {
    const test::SparedThread spared;
    bundle.send(writeRequestChannel, writeRequest(path, "text/xml", packageContent("old")));
    const std::string oldPackage = readFile(path);
    const std::string request = writeRequest(path, "text/xml", packageContent("new"));
    bundle.send(writeRequestChannel, request);
    const std::string newPackage = readFile(path);
    failEach(
        writeRequestChannel, request, [&] { test::writeFile(path, oldPackage); },
        [&](const std::vector<Message>& got, const std::vector<Message>& whole) {
            expectWriteOutcome(got, whole);
            EXPECT_THAT(readFile(path), AnyOf(oldPackage, newPackage));
            if (got == whole) {
                EXPECT_EQ(readFile(path), newPackage);
            }
            EXPECT_THAT(names(), ElementsAre("document"));
        });
}

TEST_P(AllocationFaults, OfAStartEndItInAnOrderlyWay) {
    std::unique_ptr<test::SparedThread> spared = std::make_unique<test::SparedThread>();
    long failed = 0;
    for (long failing = 0, allocations = 1; failing <= allocations; ++failing) {
        SCOPED_TRACE("allocation " + std::to_string(failing));
        std::unique_ptr<framework::BundleRunner> other;
        spared.reset();
        test::failAllocation(failing, GetParam());
        try {
            other = std::make_unique<framework::BundleRunner>(SERIALIZATION_BUNDLE);
        } catch (const std::exception&) {
            ++failed;
        }
        allocations = test::stopFailing();
        spared = std::make_unique<test::SparedThread>();
        other.reset();
        EXPECT_EQ(bundle.read(path, "text/plain").size(), 1u);
        faults += failing < allocations ? 1 : 0;
    }
    RecordProperty("faults", std::to_string(faults));
    EXPECT_GT(failed, 5);
    RunningBundle another;
    EXPECT_EQ(another.read(path, "text/plain").size(), 1u);
}

INSTANTIATE_TEST_SUITE_P(Of, AllocationFaults, testing::Values(Failing::one, Failing::allFromThere),
                         [](const auto& test) {
                             return test.param == Failing::one ? "One" : "AllFromThere";
                         });

}  // namespace
