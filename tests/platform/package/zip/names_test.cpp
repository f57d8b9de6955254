// SPDX-License-Identifier: Apache-2.0
#include "platform/package/zip/names.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>

#include "platform/i18n/codecvt.h"

namespace platform::package::zip {
namespace {

bool decodesAsUtf8(const std::string& bytes) {
    try {
        i18n::to_ustring(bytes);
        return true;
    } catch (const std::runtime_error&) {
        return false;
    }
}

TEST(EntryNames, AreUtf8WhenTheyDecodeStrictly) {
    // All sequences of up to three bytes from the edges of what may stand where, in a few places.
    const std::string edges =
        "\x7F\x80\x8F\x90\x9F\xA0\xBF\xC0\xC1\xC2\xDF\xE0\xE1\xEC\xED\xEE\xEF\xF0\xF1\xF3\xF4\xF5"
        "\xFF";
    for (const char a : edges) {
        for (const char b : edges) {
            for (const char c : edges) {
                for (const std::string& bytes :
                     {std::string{a}, std::string{a, b}, std::string{a, b, c},
                      std::string{a, b, c, '\x80'}, std::string{a, b, c, 'a'}}) {
                    EXPECT_EQ(isUtf8(bytes), decodesAsUtf8(bytes)) << testing::PrintToString(bytes);
                }
            }
        }
    }
}

TEST(EntryNames, InCodePage437DecodeAsTheConverterDecodesThem) {
    i18n::codecvt_string_to_ustring converter("IBM437", true);
    std::string all;
    for (int byte = 0; byte < 256; ++byte) {
        all += static_cast<char>(byte);
    }
    EXPECT_EQ(fromCodePage437(all), i18n::to_string(i18n::to_ustring(all, converter)));
}

TEST(EntryNames, AreValidTextInErrors) {
    EXPECT_EQ(printable("m\xC3\xA9"), "m\xC3\xA9");
    EXPECT_EQ(printable("m\x82x"), "m\xEF\xBF\xBDx");
}

}  // namespace
}  // namespace platform::package::zip
