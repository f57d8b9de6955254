// SPDX-License-Identifier: Apache-2.0
// Reads text files: bytes, detected charset, UTF-16, and back to the file's own charset.

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <exception>
#include <iostream>
#include <stdexcept>
#include <string>
#include <system_error>
#include <utility>

#include "platform/filesystem/filesystem.h"
#include "platform/i18n/charsets/shift_jis.h"
#include "platform/i18n/codecvt.h"
#include "platform/i18n/detect_charset.h"
#include "platform/posix/file_descriptor.h"
#include "platform/posix/open_regular_file.h"
#include "platform/posix/system_error.h"
#include "serialization/reading/result_keys.h"
#include "serialization/serialization.h"

namespace EditorServices {

using platform::FileDescriptor;
using platform::OpenedFile;
using platform::filesystem::exists;
using platform::filesystem::make_native_access_form_with_cleanup;
using platform::i18n::codecvt_string_to_ustring;
using platform::i18n::codecvt_ustring_to_string;
using platform::i18n::detect_charset;
using platform::i18n::hasEscapeSequences;
using platform::i18n::requireTextLength;
using platform::i18n::restoreEndOfFileMarks;
using platform::i18n::to_string;
using platform::i18n::to_ustring;

namespace {

constexpr char16_t byteOrderMark = u'\uFEFF';

/// The byte-order mark in `charset`; empty where there is none.
std::string markIn(const std::string& charset) {
    try {
        codecvt_ustring_to_string converter(charset, true);
        return converter.do_convert(&byteOrderMark, 1);
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
    if (!text.empty() && text.front() == byteOrderMark) {
        text.erase(0, 1);
    }
    restoreEndOfFileMarks(text, charset);
    return text;
}

/// What the text of `bytes` is in `charset` when decoding and encoding would change no character:
/// the same as encoding what `decode` gives.
std::string cleaned(std::string bytes, const std::string& charset) {
    if (const std::string mark = markIn(charset); !mark.empty() && bytes.starts_with(mark)) {
        bytes.erase(0, mark.size());
    }
    restoreEndOfFileMarks(bytes, charset);
    return bytes;
}

/// Opens `path` if there is a regular file; returns nothing when there is none or it cannot be
/// opened, which reads as empty. But some errors say nothing about the file: there was no memory,
/// or another program did not give up its lease. The file may then hold a text and must not read as
/// empty: throws std::system_error.
OpenedFile openText(const std::string& path) {
    OpenedFile opened = platform::openRegularFile(path);
    if (opened.error == ENOMEM || opened.error == EWOULDBLOCK) {
        throw std::system_error(opened.error, std::generic_category(), "The file cannot be opened");
    }
    return opened;
}

/// The length in bytes of the text at `path`; 0 for what cannot be opened, so that its size is not
/// given away.
std::size_t lengthOf(const std::u16string& path) {
    const OpenedFile opened = openText(make_native_access_form_with_cleanup(path));
    return opened.descriptor ? static_cast<std::size_t>(opened.status.st_size) : 0;
}

/// Everything that `file` still holds, which is probably `expectedSize` bytes.
/// Throws std::system_error on an input error, and as soon as it is more than a text may have.
std::string readToEnd(const FileDescriptor& file, std::size_t expectedSize) {
    // A string fills what it becomes longer by with zeros: of a piece, these are still in the
    // processor's cache when the file's bytes take their place.
    constexpr std::size_t smallestPiece = 4096;
    constexpr std::size_t largestPiece = 256 * 1024;
    const std::size_t piece = std::clamp(expectedSize + 1, smallestPiece, largestPiece);
    std::string bytes;
    // One byte more than expected, so that the end is seen without growing.
    bytes.reserve(std::max(expectedSize + 1, piece));
    for (;;) {
        const std::size_t length = bytes.size();
        if (length == bytes.capacity()) {
            requireTextLength(length);
            bytes.reserve(length * 2);
        }
        bytes.resize(std::min(length + piece, bytes.capacity()));
        const ssize_t count = ::read(file.get(), bytes.data() + length, bytes.size() - length);
        if (count < 0 && errno != EINTR) {
            platform::throwSystemError("The file cannot be read");
        }
        bytes.resize(length + static_cast<std::size_t>(std::max<ssize_t>(count, 0)));
        if (count == 0) {
            return bytes;
        }
    }
}

}  // namespace

json::Object Serialization::readTextDocument(std::u16string path, std::size_t longestAnswer) const {
    json::Object result;
    try {
        if (exists(path)) {
            result[statusKey] = true;
            // The text is hardly shorter than the file: it only loses a byte-order mark, and escape
            // sequences that change nothing.
            const std::size_t length = lengthOf(path);
            requireTextLength(length);
            awaitMemory(length, 0, longestAnswer);
            result[dataKey] = readTextFileContent(std::move(path));
        } else {
            result[statusKey] = false;
            result[exceptionKey] = "File does not exist";
        }
    } catch (const std::exception& error) {
        result[statusKey] = false;
        result[exceptionKey] = error.what();
    }
    return result;
}

std::string Serialization::readTextFileContent(std::u16string path) const {
    std::string bytes = readFileBytes(std::move(path));
    const std::string charset = detectedCharset(bytes);
    if (!hasEscapeSequences(charset)) {
        // Detection has made sure that decoding and encoding would give these bytes, so a large
        // text is not held in UTF-16 too.
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
    const OpenedFile opened = openText(nativePath);
    if (!opened.descriptor) {
        return {};
    }
    // Checked before memory is allocated for a file that is too large.
    const auto size = static_cast<std::size_t>(opened.status.st_size);
    requireTextLength(size);
    return readToEnd(opened.descriptor, size);
}

}  // namespace EditorServices
