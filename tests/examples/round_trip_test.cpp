// SPDX-License-Identifier: Apache-2.0
// The examples, read, written and read again through the loaded bundle.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <initializer_list>
#include <string>
#include <vector>

#include "json/parser.h"
#include "tests/support/running_bundle.h"
#include "tests/support/source_root.h"
#include "tests/support/temporary_directory.h"

namespace {

using test::Message;
using test::RunningBundle;
using test::writeRequestChannel;
using testing::SizeIs;

/// The examples with one of `extensions`, by name.
std::vector<std::filesystem::path> examples(std::initializer_list<std::string> extensions) {
    std::vector<std::filesystem::path> found;
    for (const auto& entry :
         std::filesystem::directory_iterator(test::sourceRoot() + "/examples")) {
        if (std::find(extensions.begin(), extensions.end(), entry.path().extension()) !=
            extensions.end()) {
            found.push_back(entry.path());
        }
    }
    std::sort(found.begin(), found.end());
    return found;
}

std::vector<std::filesystem::path> packages() {
    return examples({".docx", ".xlsx", ".pptx"});
}

/// The charset in a text's name: "name.charset.txt", with "-with-mark" where it has one.
std::string charsetOf(const std::filesystem::path& path) {
    const std::string charset = path.stem().extension().string();
    return charset.empty() ? "UTF-8" : charset.substr(1, charset.find("-with-mark") - 1);
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
            bundle.send(writeRequestChannel, json::serialize(std::move(request)));
        EXPECT_THAT(answers, SizeIs(2));
        return answers.at(1) == Message{"/zpr/service/writeResponse/1", "true"};
    }

    test::TemporaryDirectory folder;
    RunningBundle bundle;
};

TEST_F(Examples, ThatArePackagesReadTheSameAfterTheyAreWritten) {
    const auto paths = packages();
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
    for (const auto& path : packages()) {
        SCOPED_TRACE(path);
        const std::filesystem::path copy = folder / path.filename().string();
        ASSERT_TRUE(write(copy, "text/xml", read(path, "text/xml")));
        const std::string command = "python3 '" + test::sourceRoot() +
                                    "/tests/examples/compare_packages.py' '" + path.string() +
                                    "' '" + copy.string() + "'";
        EXPECT_EQ(std::system(command.c_str()), 0);
    }
}

TEST_F(Examples, ThatAreTextsAreTheSameOnDiskLessTheirMarksAfterTheyAreWritten) {
    const auto paths = examples({".txt", ".log"});
    ASSERT_THAT(paths, SizeIs(testing::Ge(8u)));
    for (const auto& path : paths) {
        SCOPED_TRACE(path);
        const json::Object answer = read(path, "text/plain");
        const std::filesystem::path copy = folder / path.filename().string();
        ASSERT_TRUE(write(copy, "text/plain", answer.at("data"), charsetOf(path)));
        const std::string original = test::readFile(path);
        const std::string written = test::readFile(copy);
        EXPECT_TRUE(original.ends_with(written));
        const bool marked = path.stem().string().ends_with("-with-mark");
        EXPECT_EQ(original.size() - written.size(), !marked                                 ? 0
                                                    : charsetOf(path).starts_with("utf-16") ? 2
                                                                                            : 3);
        EXPECT_EQ(json::serialize(read(copy, "text/plain")), json::serialize(answer));
    }
}

}  // namespace
