// The examples, read, written and read again through the loaded bundle.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "tests/support/running_bundle.h"
#include "tests/support/temporary_directory.h"

namespace {

using test::kWriteRequests;
using test::Message;
using test::RunningBundle;
using testing::SizeIs;

std::vector<std::filesystem::path> examples(bool packages) {
    std::vector<std::filesystem::path> found;
    for (const auto& entry : std::filesystem::directory_iterator(
             std::filesystem::path(PROJECT_SOURCE_ROOT) / "examples")) {
        const std::string extension = entry.path().extension();
        const bool package = extension == ".docx" || extension == ".xlsx" || extension == ".pptx";
        if (entry.is_regular_file() && package == packages && extension != ".md") {
            found.push_back(entry.path());
        }
    }
    std::sort(found.begin(), found.end());
    return found;
}

class Examples : public testing::Test {
protected:
    json::Object read(const std::filesystem::path& path, const std::string& contentType) {
        const std::vector<Message> answers = bundle.read(path.string(), contentType);
        EXPECT_THAT(answers, SizeIs(1));
        json::Object answer = json::parse(answers.at(0).payload);
        EXPECT_TRUE(answer.at("status").get<bool>()) << answers.at(0).payload;
        return answer;
    }

    bool write(const std::filesystem::path& path, const std::string& contentType,
               json::Value content, const std::string& encoding = "") {
        json::Object request;
        request["rtcId"] = "1";
        request["contentType"] = contentType;
        request["filePath"] = path.string();
        request["content"] = std::move(content);
        request["encoding"] = encoding;
        const std::vector<Message> answers =
            bundle.send(kWriteRequests, json::serialize(std::move(request)));
        EXPECT_THAT(answers, SizeIs(2));
        return answers.at(1) == Message{"/zpr/service/writeResponse/1", "true"};
    }

    test::TemporaryDirectory folder;
    RunningBundle bundle;
};

TEST_F(Examples, ThatArePackagesReadTheSameAfterTheyAreWritten) {
    const auto paths = examples(true);
    ASSERT_THAT(paths, SizeIs(testing::Ge(4u)));
    for (const auto& path : paths) {
        SCOPED_TRACE(path);
        json::Object document = read(path, "text/xml");
        EXPECT_FALSE(document.at("parts").get<json::Array>().empty());
        const std::string asRead = json::serialize(document);
        const std::filesystem::path copy = folder / path.filename().string();
        ASSERT_TRUE(write(copy, "text/xml", std::move(document)));
        EXPECT_EQ(json::serialize(read(copy, "text/xml")), asRead);
    }
}

TEST_F(Examples, ThatArePackagesAreTheSameToAnIndependentReaderAfterTheyAreWritten) {
    for (const auto& path : examples(true)) {
        SCOPED_TRACE(path);
        const std::filesystem::path copy = folder / path.filename().string();
        ASSERT_TRUE(write(copy, "text/xml", read(path, "text/xml")));
        const std::string command = "python3 '" PROJECT_SOURCE_ROOT
                                    "/tests/examples/compare_packages.py' '" +
                                    path.string() + "' '" + copy.string() + "'";
        EXPECT_EQ(std::system(command.c_str()), 0);
    }
}

}  // namespace
