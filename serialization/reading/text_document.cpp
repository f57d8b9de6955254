// Reads text files: bytes, detected charset, UTF-16, and back to the file's own charset.

#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <exception>
#include <fstream>
#include <iostream>
#include <new>
#include <utility>

#include "platform/filesystem/filesystem.h"
#include "platform/i18n/codecvt.h"
#include "platform/i18n/detect_charset.h"
#include "platform/large_pages.h"
#include "serialization/reading/result_keys.h"
#include "serialization/serialization.h"

namespace EditorServices {

using platform::filesystem::exists;
using platform::filesystem::make_native_access_form_with_cleanup;
using platform::i18n::codecvt_string_to_ustring;
using platform::i18n::codecvt_ustring_to_string;
using platform::i18n::comesBackUnchanged;
using platform::i18n::detect_charset;
using platform::i18n::requireTextLength;
using platform::i18n::to_string;
using platform::i18n::to_ustring;

namespace {

constexpr char16_t kByteOrderMark = u'\uFEFF';

// Conversion tables of the IBM family turn byte 1A, the end-of-file mark of DOS texts, into U+001C.
// A text that came through one gets its mark back.
constexpr const char* kCharsetOfDos = "Shift_JIS";
constexpr char kEndOfDosText = 0x1A;
constexpr char kEndOfDosTextOfIbm = 0x1C;

/// The byte-order mark in `charset`; empty where there is none.
std::string markIn(const std::string& charset) {
    try {
        codecvt_ustring_to_string converter(charset, true);
        return converter.do_convert(&kByteOrderMark, 1);
    } catch (const std::runtime_error&) {
        return {};
    }
}

std::string detectedCharset(const std::string& bytes) {
    return detect_charset(bytes.data(), bytes.size(), std::cout, u"<unknown>");
}

std::u16string decode(const std::string& bytes, const std::string& charset) {
    codecvt_string_to_ustring converter(charset, true);
    std::u16string text = to_ustring(bytes, converter);
    if (!text.empty() && text.front() == kByteOrderMark) {
        text.erase(0, 1);
    }
    if (charset == kCharsetOfDos) {
        std::replace(text.begin(), text.end(), char16_t{kEndOfDosTextOfIbm},
                     char16_t{kEndOfDosText});
    }
    return text;
}

/// What the text of `bytes` is in `charset` when decoding and encoding would change no character:
/// the same as encoding what `decode` gives.
std::string cleaned(std::string bytes, const std::string& charset) {
    if (const std::string mark = markIn(charset); !mark.empty() && bytes.starts_with(mark)) {
        bytes.erase(0, mark.size());
    }
    if (charset == kCharsetOfDos) {
        // Neither is a half of any other character. Hardly a text has one, and find() sees that
        // soonest.
        for (std::size_t at = bytes.find(kEndOfDosTextOfIbm); at != std::string::npos;
             at = bytes.find(kEndOfDosTextOfIbm, at + 1)) {
            bytes[at] = kEndOfDosText;
        }
    }
    return bytes;
}

/// Everything that `file` still holds, which is probably `expectedSize` bytes.
/// Throws std::ios_base::failure on an input error, and as soon as it is more than a text may have.
std::string readToEnd(std::ifstream& file, std::size_t expectedSize) {
    constexpr std::size_t kSmallestPiece = 4096;
    std::string bytes;
    std::size_t length = 0;
    // One byte more than expected, so that the end is seen without growing.
    const std::size_t room = std::max(expectedSize + 1, kSmallestPiece);
    platform::reserveLarge(bytes, room);
    bytes.resize(room);
    file.exceptions(std::ios_base::badbit);
    while (file.read(bytes.data() + length, static_cast<std::streamsize>(bytes.size() - length))) {
        length = bytes.size();
        requireTextLength(length);
        bytes.resize(bytes.size() * 2);
    }
    bytes.resize(length + static_cast<std::size_t>(file.gcount()));
    return bytes;
}

}  // namespace

json::Object Serialization::readTextDocument(std::u16string path) const {
    json::Object result;
    try {
        if (exists(path)) {
            result[kStatusKey] = true;
            result[kDataKey] = readTextFileContent(std::move(path));
        } else {
            result[kStatusKey] = false;
            result[kExceptionKey] = "File does not exist";
        }
    } catch (const std::exception& error) {
        result[kStatusKey] = false;
        result[kExceptionKey] = error.what();
    }
    return result;
}

std::string Serialization::readTextFileContent(std::u16string path) const {
    std::string bytes = readFileBytes(std::move(path));
    const std::string charset = detectedCharset(bytes);
    if (comesBackUnchanged(bytes, charset)) {
        // As good as every file, so that a large one is not held in UTF-16 too.
        return cleaned(std::move(bytes), charset);
    }
    const std::u16string text = decode(bytes, charset);
    codecvt_ustring_to_string converter(charset, true);
    return to_string(text, converter);
}

std::u16string Serialization::readTextFile(std::u16string path, std::string& charset) const {
    const std::string bytes = readFileBytes(std::move(path));
    charset = detectedCharset(bytes);
    return decode(bytes, charset);
}

std::string Serialization::readFileBytes(std::u16string path) const {
    const std::string nativePath = make_native_access_form_with_cleanup(path);
    struct stat examined = {};
    if (::stat(nativePath.c_str(), &examined) != 0 || !S_ISREG(examined.st_mode)) {
        return {};
    }
    std::ifstream file(nativePath, std::ios_base::in);
    if (!file.is_open()) {
        if (errno == ENOMEM) {
            // The stream had no memory. That says nothing of the file, which must not pass for
            // empty.
            throw std::bad_alloc();
        }
        return {};
    }
    // Before memory is taken for a file that no text is made of.
    const auto size = static_cast<std::size_t>(examined.st_size);
    requireTextLength(size);
    return readToEnd(file, size);
}

}  // namespace EditorServices
