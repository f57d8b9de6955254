// SPDX-License-Identifier: Apache-2.0
// Read requests through the loaded bundle and the bus.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

#include "json/parser.h"
#include "tests/support/running_bundle.h"
#include "tests/support/temporary_directory.h"

namespace {

using test::Message;
using test::readRequestChannel;
using test::readResponsePrefix;
using test::RunningBundle;
using test::takeBusLog;
using test::writeFile;
using testing::ElementsAre;
using testing::IsEmpty;

class ReadRequests : public testing::Test {
protected:
    ReadRequests() { writeFile(folder / "text.txt", "some text"); }

    std::string textPath() const { return (folder / "text.txt").string(); }

    /// Whether a request is answered as it should be, whatever came before it.
    bool stillAnswers() {
        return bundle.read(textPath(), "text/plain") ==
               std::vector<Message>{{std::string(readResponsePrefix) + "1", textAnswer}};
    }

    static constexpr const char* textAnswer = R"({"data":"some text","status":true})";

    test::TemporaryDirectory folder;
    RunningBundle bundle;
};

TEST_F(ReadRequests, AreAnsweredOnTheChannelOfTheirRtcId) {
    EXPECT_THAT(bundle.read(textPath(), "text/plain", "42"),
                ElementsAre(Message{"/zpr/service/readResponse/42", textAnswer}));
}

TEST_F(ReadRequests, WithAnEmptyRtcIdAreAnsweredOnTheBarePrefix) {
    EXPECT_THAT(bundle.read(textPath(), "text/plain", ""),
                ElementsAre(Message{"/zpr/service/readResponse/", textAnswer}));
}

TEST_F(ReadRequests, WithAnyRtcIdAreAnsweredWithTheIdAsItCame) {
    for (const std::string rtcId : {"a/b", " ", "\xC3\xA9", "..", "*", "\xFF"}) {
        EXPECT_THAT(bundle.read(textPath(), "text/plain", rtcId),
                    ElementsAre(Message{readResponsePrefix + rtcId, textAnswer}));
    }
}

TEST_F(ReadRequests, ForEveryContentTypeButThePackageTypeGoToTheTextReader) {
    for (const std::string type :
         {"", "text/plain", "TEXT/XML", "Text/xml", "text/xml; charset=utf-8", " text/xml",
          "text/xml ", "text/xm", "application/xml"}) {
        EXPECT_THAT(bundle.read(textPath(), type),
                    ElementsAre(Message{"/zpr/service/readResponse/1", textAnswer}))
            << type;
    }
}

TEST_F(ReadRequests, ForThePackageTypeGoToThePackageReaderWhateverTheFileIs) {
    const std::vector<Message> answers = bundle.read(textPath(), "text/xml");
    ASSERT_EQ(answers.size(), 1u);
    const json::Object answer = json::parse(answers[0].payload);
    EXPECT_FALSE(answer.at("status").get<bool>());
    EXPECT_FALSE(answer.at("exception").get<std::string>().empty());
    EXPECT_FALSE(answer.contains("data"));
}

TEST_F(ReadRequests, ForAMissingTextFileAreAnsweredThatItDoesNotExist) {
    EXPECT_THAT(bundle.read((folder / "missing").string(), "text/plain"),
                ElementsAre(Message{"/zpr/service/readResponse/1",
                                    R"({"exception":"File does not exist","status":false})"}));
}

TEST_F(ReadRequests, ForAMissingPackageAreAnsweredWithoutAnException) {
    EXPECT_THAT(bundle.read((folder / "missing").string(), "text/xml"),
                ElementsAre(Message{"/zpr/service/readResponse/1", R"({"status":false})"}));
}

TEST_F(ReadRequests, ForWhatCannotBeReadAreAnsweredWithEmptyText) {
    EXPECT_THAT(
        bundle.read(folder.path().string(), "text/plain"),
        ElementsAre(Message{"/zpr/service/readResponse/1", R"({"data":"","status":true})"}));
    EXPECT_TRUE(stillAnswers());
}

TEST_F(ReadRequests, ForAPathThatTheSystemRefusesAreAnsweredWithItsReason) {
    const std::vector<Message> answers = bundle.read(std::string(5000, 'x'), "text/plain");
    ASSERT_EQ(answers.size(), 1u);
    EXPECT_THAT(answers[0].payload, testing::HasSubstr("File name too long"));
    EXPECT_THAT(answers[0].payload, testing::HasSubstr(R"("status":false)"));
}

TEST_F(ReadRequests, WithAZeroInThePathDoNotReadTheFileThatItsBeginningNames) {
    const std::vector<Message> answers =
        bundle.read(textPath() + std::string("\0.png", 5), "text/plain");
    ASSERT_EQ(answers.size(), 1u);
    EXPECT_THAT(answers[0].payload, testing::HasSubstr(R"("status":false)"));
}

TEST_F(ReadRequests, WithAMissingKeyGetNoAnswer) {
    for (const std::string request : {R"({"contentType":"text/plain","filePath":"/etc/hostname"})",
                                      R"({"rtcId":"1","filePath":"/etc/hostname"})",
                                      R"({"rtcId":"1","contentType":"text/plain"})", R"({})"}) {
        EXPECT_THAT(bundle.send(readRequestChannel, request), IsEmpty()) << request;
    }
    EXPECT_TRUE(stillAnswers());
}

TEST_F(ReadRequests, WithAKeyOfTheWrongKindGetNoAnswer) {
    for (const std::string wrong : {"null", "true", "1", "[]", "{}"}) {
        for (const std::string key : {"rtcId", "contentType", "filePath"}) {
            json::Object request;
            request["rtcId"] = "1";
            request["contentType"] = "text/plain";
            request["filePath"] = "/etc/hostname";
            std::string text = json::serialize(json::Value(request));
            const std::string right = "\"" + request[key].get<std::string>() + "\"";
            const std::string member = "\"" + key + "\":";
            text.replace(text.find(member + json::serialize(request[key])) + member.size(),
                         json::serialize(request[key]).size(), wrong);
            EXPECT_THAT(bundle.send(readRequestChannel, text), IsEmpty()) << text;
        }
    }
    EXPECT_TRUE(stillAnswers());
}

TEST_F(ReadRequests, WithOtherKeysAreAnsweredAllTheSame) {
    EXPECT_THAT(bundle.send(readRequestChannel,
                            R"({"rtcId":"1","extra":[{}],"contentType":"","filePath":")" +
                                textPath() + R"(","content":null})"),
                ElementsAre(Message{"/zpr/service/readResponse/1", textAnswer}));
}

TEST_F(ReadRequests, WhosePathIsNotUtf8GetNoAnswer) {
    EXPECT_THAT(bundle.read(textPath() + "\xFF", "text/plain"), IsEmpty());
    EXPECT_TRUE(stillAnswers());
}

TEST_F(ReadRequests, ThatAreNotJsonGetNoAnswer) {
    for (const std::string request :
         {"", "{", "null", "[]", "\"text\"", " {}", "{\"rtcId\":\"1\",}", "\xFF\xFE",
          "/* comment */{\"rtcId\":\"1\",\"contentType\":\"\",\"filePath\":\"/etc/hostname\"}"}) {
        EXPECT_THAT(bundle.send(readRequestChannel, request), IsEmpty()) << request;
    }
    EXPECT_TRUE(stillAnswers());
}

TEST_F(ReadRequests, OfRandomBytesDoNotStopTheBundle) {
    std::mt19937 random(20260101);
    const std::string request = RunningBundle::request(textPath(), "text/plain", "1");
    for (int round = 0; round < 300; ++round) {
        std::string damaged = request;
        for (unsigned changes = random() % 4 + 1; changes > 0; --changes) {
            damaged[random() % damaged.size()] = static_cast<char>(random());
        }
        bundle.send(readRequestChannel, damaged);
    }
    EXPECT_TRUE(stillAnswers());
}

TEST_F(ReadRequests, NestedTenMillionDeepDoNotStopTheBundle) {
    EXPECT_THAT(bundle.send(readRequestChannel, "{\"rtcId\":" + std::string(10'000'000, '[')),
                IsEmpty());
    EXPECT_TRUE(stillAnswers());
}

TEST_F(ReadRequests, ReadTheirKeysInOrder) {
    const auto failureOf = [this](const std::string& request) {
        takeBusLog();
        EXPECT_THAT(bundle.send(readRequestChannel, request), IsEmpty());
        const std::vector<std::string> log = takeBusLog();
        return log.empty() ? "no failure" : log.back();
    };
    EXPECT_THAT(failureOf(R"({"contentType":true,"filePath":1})"),
                testing::HasSubstr("undefined to string"));
    EXPECT_THAT(failureOf(R"({"rtcId":"","contentType":true,"filePath":1})"),
                testing::HasSubstr("boolean to string"));
    EXPECT_THAT(failureOf(R"({"rtcId":"","contentType":"","filePath":1})"),
                testing::HasSubstr("double to string"));
}

}  // namespace
