// SPDX-License-Identifier: Apache-2.0
#include "host/commands/document_kind.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
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

TEST_F(IsDocumentPackage, IsTrueForPackagesAndOtherArchives) {
    EXPECT_TRUE(isPackage(test::zipArchive({"[Content_Types].xml"})));
    EXPECT_TRUE(isPackage(test::zipArchive({"a", "b"})));
}

TEST_F(IsDocumentPackage, IsTrueForAPackageThatWasCut) {
    const std::string archive = test::zipArchive({"[Content_Types].xml", "a"});
    EXPECT_TRUE(isPackage(archive.substr(0, archive.size() / 2)));
    EXPECT_TRUE(isPackage("PK\3\4"));
    EXPECT_FALSE(isPackage("PK\3"));
}

TEST_F(IsDocumentPackage, IsFalseForText) {
    EXPECT_FALSE(isPackage(""));
    EXPECT_FALSE(isPackage("[Content_Types].xml"));
    EXPECT_FALSE(isPackage("PK 3 4"));
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

}  // namespace
}  // namespace host
