// The converters between bytes and UTF-16.
#include "platform/i18n/codecvt.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <stdexcept>

namespace platform::i18n {
namespace {

using testing::HasSubstr;
using testing::ThrowsMessage;

std::u16string decode(const std::string& charset, std::string_view bytes, bool strict = true) {
    codecvt_string_to_ustring converter(charset, strict);
    return to_ustring(bytes, converter);
}

std::string encode(const std::string& charset, std::u16string_view text, bool strict = true) {
    codecvt_ustring_to_string converter(charset, strict);
    return to_string(text, converter);
}

TEST(Utf8, KeepsTheByteOrderMarkAsTextBothWays) {
    EXPECT_EQ(decode("UTF-8",
                     "\xEF\xBB\xBF"
                     "a"),
              u"\uFEFFa");
    EXPECT_EQ(encode("UTF-8", u"\uFEFFa"),
              "\xEF\xBB\xBF"
              "a");
}

TEST(ShiftJis, ErrorNamesCharsetAndOffset) {
    EXPECT_THAT([] { decode("Shift_JIS", "abc\x82"); },
                ThrowsMessage<std::runtime_error>(HasSubstr("Shift_JIS")));
}

}  // namespace
}  // namespace platform::i18n
