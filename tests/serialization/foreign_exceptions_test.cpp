// SPDX-License-Identifier: Apache-2.0
// What the document operations do with exceptions of types that they do not know. None of the real
// libraries throws one, so this program has file-system helpers of its own, which do.

#include <gtest/gtest.h>

#include <string>

#include "platform/filesystem/filesystem.h"
#include "serialization/serialization.h"

namespace {

// Not derived from std::exception.
struct ForeignException {};

}  // namespace

namespace platform::filesystem {

bool exists(std::u16string_view path) {
    if (path == u"foreign") {
        throw ForeignException();
    }
    return true;
}

std::string make_native_access_form_with_cleanup(std::u16string_view) {
    throw ForeignException();
}

}  // namespace platform::filesystem

namespace EditorServices {
namespace {

class ForeignExceptions : public testing::Test {
protected:
    Serialization service;
};

TEST_F(ForeignExceptions, PassThroughTheTextReader) {
    EXPECT_THROW(service.readTextDocument(u"foreign"), ForeignException);
    EXPECT_THROW(service.readTextDocument(u"a file"), ForeignException);
}

TEST_F(ForeignExceptions, PassThroughThePackageReader) {
    EXPECT_THROW(service.readPackageDocument(u"foreign"), ForeignException);
    EXPECT_THROW(service.readPackageDocument(u"a file"), ForeignException);
}

TEST_F(ForeignExceptions, PassThroughTheTextWriter) {
    EXPECT_THROW(service.writeTextDocument(u"a file", "text", "UTF-8"), ForeignException);
}

TEST_F(ForeignExceptions, PassThroughThePackageWriter) {
    json::Object document{{"parts", json::Array()}, {"relationships", json::Array()}};
    EXPECT_THROW(service.writePackageDocument(u"a file", document), ForeignException);
}

}  // namespace
}  // namespace EditorServices
