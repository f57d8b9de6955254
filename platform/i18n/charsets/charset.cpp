// SPDX-License-Identifier: Apache-2.0
// Opens charsets by name.
#include "platform/i18n/charsets/charset.h"

#include <optional>

#include "platform/i18n/charsets/charset_names.h"
#include "platform/i18n/charsets/conversion_error.h"
#include "platform/i18n/charsets/duplicate_codes.h"
#include "platform/i18n/charsets/hz.h"
#include "platform/i18n/charsets/icu_charset.h"
#include "platform/i18n/charsets/johab.h"
#include "platform/i18n/charsets/table_charset.h"
#include "platform/i18n/charsets/unicode_charsets.h"

namespace platform::i18n::detail {

namespace {

ByteOrder byteOrderOf(std::string_view converter) {
    if (converter.find("BE") != std::string_view::npos) {
        return ByteOrder::big;
    }
    return converter.find("LE") != std::string_view::npos ? ByteOrder::little : ByteOrder::fromMark;
}

std::unique_ptr<Charset> makeCharset(const std::string& name, bool strict) {
    if (std::unique_ptr<Charset> ours = makeTableCharset(name, strict)) {
        return ours;
    }
    if (std::unique_ptr<Charset> variant = makeDuplicateCodesVariant(name, strict)) {
        return variant;
    }
    if (isJohab(name)) {
        return makeJohab(name, strict);
    }
    const std::string converter = converterName(name).value_or("");
    if (converter.empty()) {
        return nullptr;
    }
    if (converter == "HZ") {
        return makeHz(name, strict);
    }
    if (converter == "UTF-8") {
        return makeUtf8(name, strict);
    }
    // ICU's variants of these differ only in what they do with byte-order marks and in the byte
    // order of the machine; neither is wanted.
    if (converter.starts_with("UTF-16") || converter.starts_with("UTF16")) {
        return makeUtf16(name, byteOrderOf(converter), strict);
    }
    if (converter.starts_with("UTF-32") || converter.starts_with("UTF32")) {
        return makeUtf32(name, byteOrderOf(converter), strict);
    }
    return makeIcuCharset(name, converter, strict);
}

}  // namespace

std::unique_ptr<Charset> openCharset(std::string_view name, bool strict) {
    if (name == "UTF-8") {
        // Every path, name and key is in it, and looking names up takes longer than most of these.
        return makeUtf8("UTF-8", strict);
    }
    std::unique_ptr<Charset> charset = makeCharset(std::string(name), strict);
    if (!charset) {
        throwUnknownCharset(name);
    }
    return charset;
}

}  // namespace platform::i18n::detail
