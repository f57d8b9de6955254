// SPDX-License-Identifier: Apache-2.0
// Writes text files. The text arrives in the charset that the request names and is decoded and
// encoded again, so that what is not valid in that charset is refused before the file is touched.
// Where that is known to change nothing, it is left out.

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <exception>
#include <string>
#include <string_view>
#include <utility>

#include "platform/filesystem/filesystem.h"
#include "platform/i18n/codecvt.h"
#include "platform/posix/file_descriptor.h"
#include "platform/posix/open_regular_file.h"
#include "serialization/serialization.h"

namespace EditorServices {

using platform::FileDescriptor;
using platform::filesystem::make_native_access_form_with_cleanup;
using platform::i18n::codecvt_string_to_ustring;
using platform::i18n::codecvt_ustring_to_string;
using platform::i18n::comesBackUnchanged;

namespace {

bool isPipe(const struct stat& status) {
    return S_ISFIFO(status.st_mode);
}

/// Opens the file at `path`, which is truncated, or made. A pipe is not opened, for nobody might
/// ever read it; in case the file becomes one just now, this does not wait either. Another
/// program's lease on the file is waited for.
FileDescriptor openForWriting(const std::string& path) {
    struct stat status = {};
    if (::stat(path.c_str(), &status) == 0 && isPipe(status)) {
        return {};
    }
    FileDescriptor file = platform::openWithoutHanging(path, O_WRONLY | O_CREAT | O_TRUNC, 0666);
    if (file && ::fstat(file.get(), &status) == 0 && isPipe(status)) {
        return {};
    }
    return file;
}

/// Writes `bytes`, or as many of them as can be.
void writeTo(const FileDescriptor& file, std::string_view bytes) {
    while (!bytes.empty()) {
        const ssize_t count = ::write(file.get(), bytes.data(), bytes.size());
        if (count > 0) {
            bytes.remove_prefix(static_cast<std::size_t>(count));
        } else if (count == 0 || errno != EINTR) {
            return;
        }
    }
}

/// Writes what `makeBytes` returns over the file at `path`, which is opened and so truncated first.
/// Returns whether it could be opened: clients have always been told only that.
template <typename MakeBytes>
bool overwrite(const std::u16string& path, MakeBytes makeBytes) {
    const FileDescriptor file = openForWriting(make_native_access_form_with_cleanup(path));
    if (!file) {
        return false;
    }
    writeTo(file, makeBytes());
    return true;
}

}  // namespace

bool Serialization::writeTextDocument(std::u16string path, std::string text,
                                      std::string charset) const {
    try {
        if (comesBackUnchanged(text, charset)) {
            return overwrite(path, [&]() -> const std::string& { return text; });
        }
        codecvt_string_to_ustring converter(charset, true);
        std::u16string decoded;
        if (!text.empty()) {
            decoded = converter.do_convert(text.data(), text.size());
        }
        return writeTextFileContent(std::move(path), std::move(decoded), std::move(charset));
    } catch (const std::exception&) {
        return false;
    }
}

bool Serialization::writeTextFileContent(std::u16string path, std::u16string text,
                                         std::string charset) const {
    std::string bytes;
    return overwrite(path, [&]() -> const std::string& {
        codecvt_ustring_to_string converter(charset, true);
        if (!text.empty()) {
            bytes = converter.do_convert(text.data(), text.size());
        }
        return bytes;
    });
}

}  // namespace EditorServices
