// SPDX-License-Identifier: Apache-2.0
#include "host/commands/document_kind.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <random>
#include <string>
#include <string_view>

#include "tests/host/zip_archive.h"
#include "tests/support/temporary_directory.h"

namespace host {
namespace {

class IsDocumentPackage : public ::testing::Test {
protected:
    bool isPackage(std::string_view bytes) {
        test::writeFile(file_, bytes);
        return isDocumentPackage(file_);
    }

    test::TemporaryDirectory folder_;
    std::filesystem::path file_ = folder_ / "file";
};

TEST_F(IsDocumentPackage, FindsTheContentTypesAmongTheItems) {
    EXPECT_TRUE(isPackage(test::zipArchive({"[Content_Types].xml"})));
    EXPECT_TRUE(isPackage(test::zipArchive({"_rels/.rels", "a.xml", "[Content_Types].xml"})));
}

TEST_F(IsDocumentPackage, ComparesTheNameWithoutCase) {
    EXPECT_TRUE(isPackage(test::zipArchive({"[content_types].XML"})));
}

TEST_F(IsDocumentPackage, FindsContentTypesInPieces) {
    EXPECT_TRUE(isPackage(test::zipArchive({"[Content_Types].xml/[0].piece"})));
}

TEST_F(IsDocumentPackage, FindsThemInAnArchiveWithAComment) {
    EXPECT_TRUE(
        isPackage(test::zipArchive({"a", "[Content_Types].xml"}, std::string(0xFFFF, 'c'))));
}

TEST_F(IsDocumentPackage, FindsThemInALargeArchive) {
    testing_package::ZipOptions options;
    options.isZip64 = true;
    EXPECT_TRUE(isPackage(
        testing_package::buildZip({{"a", "x"}, {"[Content_Types].xml", "<x/>"}}, options)));
    EXPECT_FALSE(isPackage(testing_package::buildZip({{"a", "x"}, {"b", "<x/>"}}, options)));
}

TEST_F(IsDocumentPackage, IsTrueForTheBeginningOfAPackageThatWasCut) {
    for (const char* first : {"[Content_Types].xml", "_rels/.rels"}) {
        const std::string archive = test::zipArchive({first, "a"});
        EXPECT_TRUE(isPackage(archive.substr(0, archive.size() / 2)));
    }
}

TEST_F(IsDocumentPackage, IsFalseForAnotherArchive) {
    EXPECT_FALSE(isPackage(test::zipArchive({"a", "b"})));
    EXPECT_FALSE(isPackage(test::zipArchive({"folder/[Content_Types].xml"})));
    EXPECT_FALSE(isPackage(test::zipArchive({"[Content_Types].xml.bak"})));
}

TEST_F(IsDocumentPackage, IsFalseForTextThatNamesTheContentTypes) {
    EXPECT_FALSE(isPackage(""));
    EXPECT_FALSE(isPackage("[Content_Types].xml"));
    EXPECT_FALSE(isPackage("PK\3\4 [Content_Types].xml"));
}

TEST_F(IsDocumentPackage, IsFalseForAPackageBehindOtherBytes) {
    EXPECT_FALSE(isPackage("#!/bin/sh\n" + test::zipArchive({"[Content_Types].xml"})));
}

TEST_F(IsDocumentPackage, IsFalseForWhatIsNoRegularFile) {
    EXPECT_FALSE(isDocumentPackage(folder_.path()));
    EXPECT_FALSE(isDocumentPackage(folder_ / "missing"));
    const std::filesystem::path pipe = folder_ / "pipe";
    ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
    EXPECT_FALSE(isDocumentPackage(pipe));
}

TEST_F(IsDocumentPackage, DoesNotWaitForAFileOfTheSystemToTellSomething) {
    // Reading it waits for the kernel's next message.
    EXPECT_FALSE(isDocumentPackage("/proc/kmsg"));
}

TEST_F(IsDocumentPackage, TakesAnyBytes) {
    const std::string archive = test::zipArchive({"a", "[Content_Types].xml", "b"});
    std::mt19937 random(1);
    for (std::size_t length = 0; length < archive.size(); ++length) {
        EXPECT_FALSE(isPackage(archive.substr(0, length))) << length;
    }
    for (int run = 0; run < 300; ++run) {
        std::string changed = archive;
        for (int change = 0; change < 4; ++change) {
            changed[random() % changed.size()] = static_cast<char>(random());
        }
        isPackage(changed);
    }
}

}  // namespace
}  // namespace host
