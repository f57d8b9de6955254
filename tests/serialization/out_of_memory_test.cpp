// SPDX-License-Identifier: Apache-2.0
// What the loaded bundle does when memory runs out.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

#include "tests/support/failing_malloc.h"
#include "tests/support/running_bundle.h"
#include "tests/support/temporary_directory.h"

namespace {

using test::failAllocationsFrom;
using test::failAllocationsOf;
using test::Message;
using test::readRequestChannel;
using test::RunningBundle;
using test::takeBusLog;
using test::writeRequestChannel;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

class OutOfMemory : public testing::Test {
protected:
    ~OutOfMemory() override {
        failAllocationsOf(0);
        failAllocationsFrom(0);
    }

    std::vector<Message> writeText(const std::string& path, const std::string& text) {
        json::Object request{{"rtcId", "1"},
                             {"contentType", "text/plain"},
                             {"filePath", path},
                             {"content", text},
                             {"encoding", "UTF-8"}};
        return bundle.send(writeRequestChannel, json::serialize(std::move(request)));
    }

    /// `fail` makes allocations fail, given the length of the answer.
    void expectNoAnswerToARead(const std::function<void(std::size_t)>& fail) {
        const std::string path = (folder / "file").string();
        test::writeFile(path, std::string(123'457, 'x'));
        const std::vector<Message> whole = bundle.read(path, "text/plain");
        ASSERT_EQ(whole.size(), 1u);

        takeBusLog();
        fail(whole[0].payload.size());
        EXPECT_THAT(bundle.read(path, "text/plain"), IsEmpty());
        EXPECT_THAT(takeBusLog(), ElementsAre(HasSubstr("Out of memory!")));

        failAllocationsOf(0);
        failAllocationsFrom(0);
        EXPECT_EQ(bundle.read(path, "text/plain"), whole);
    }

    test::TemporaryDirectory folder;
    RunningBundle bundle;
};

TEST_F(OutOfMemory, ForTheResponseOfAReadMeansNoAnswer) {
    expectNoAnswerToARead([](std::size_t length) { failAllocationsOf(length); });
}

TEST_F(OutOfMemory, WhileTheResponseOfAReadIsWrittenMeansNoAnswer) {
    expectNoAnswerToARead([](std::size_t length) { failAllocationsFrom(length + 1); });
}

TEST_F(OutOfMemory, ForTheNotificationOfAWriteMeansNeitherNotificationNorAnswer) {
    const std::string path = (folder / std::string(201, 'n')).string();
    writeText(path, "first");
    const std::vector<Message> whole = writeText(path, "second");
    ASSERT_EQ(whole.size(), 2u);

    takeBusLog();
    failAllocationsOf(whole[0].payload.size());
    EXPECT_THAT(writeText(path, "third"), IsEmpty());
    EXPECT_THAT(takeBusLog(), ElementsAre(HasSubstr("Out of memory!")));
    EXPECT_EQ(test::readFile(path), "third");

    failAllocationsOf(0);
    EXPECT_EQ(writeText(path, "fourth"), whole);
}

TEST_F(OutOfMemory, ForTheResponseOfAWriteMeansANotificationWithoutAnswer) {
    const std::string path = (folder / "file").string();
    takeBusLog();
    {
        const auto armed = bundle.bus().observe([](std::string_view, const auto& message) {
            if (message.channel() == test::notificationChannel) {
                failAllocationsOf(std::string_view("true").size());
            }
        });
        EXPECT_THAT(
            writeText(path, "text"),
            ElementsAre(Message{test::notificationChannel,
                                R"({"filePath":")" + path + R"(","isExistingFile":false})"}));
    }
    EXPECT_THAT(takeBusLog(), ElementsAre(HasSubstr("Out of memory!")));
}

TEST_F(OutOfMemory, ForTheBase64OfAnImageIsTheAnswerToARead) {
    const std::string path = (folder / "file.docx").string();
    const std::string image(54'321, '\xFF');
    json::Object part{{"partUri", "/image.png"}, {"contentType", "image/png"}, {"content", image}};
    part["relationship"] = json::Null();
    json::Object document{{"parts", json::Array{std::move(part)}},
                          {"relationships", json::Array()}};
    json::Object request{{"rtcId", "1"}, {"contentType", "text/xml"}, {"filePath", path}};
    request["content"] = std::move(document);
    ASSERT_EQ(bundle.send(writeRequestChannel, json::serialize(std::move(request))).size(), 2u);

    const std::string_view prefix = "data:image/png;base64,";
    failAllocationsOf(prefix.size() + (image.size() + 2) / 3 * 4 + 1);
    EXPECT_THAT(bundle.read(path, "text/xml"),
                ElementsAre(Message{"/zpr/service/readResponse/1",
                                    R"({"exception":"Out of memory!","status":false})"}));
}

}  // namespace
