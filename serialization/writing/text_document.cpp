// Writes text files. The text arrives in the charset that the request names and is decoded and
// encoded again, so that what is not valid in that charset is refused before the file is touched.
// Where that is known to change nothing, it is left out.

#include <exception>
#include <filesystem>
#include <fstream>
#include <system_error>
#include <utility>

#include "platform/filesystem/filesystem.h"
#include "platform/i18n/codecvt.h"
#include "serialization/serialization.h"

namespace EditorServices {

using platform::filesystem::make_native_access_form_with_cleanup;
using platform::i18n::codecvt_string_to_ustring;
using platform::i18n::codecvt_ustring_to_string;
using platform::i18n::comesBackUnchanged;

namespace {

/// Writes what `makeBytes` returns over the file at `path`, which is opened and so truncated first.
/// Returns whether it could be opened: clients have always been told only that.
template <typename MakeBytes>
bool overwrite(const std::u16string& path, MakeBytes makeBytes) {
    const std::string nativePath = make_native_access_form_with_cleanup(path);
    std::error_code notExaminable;
    if (std::filesystem::is_fifo(nativePath, notExaminable)) {
        // Opening a pipe waits for someone to read it, who might never come.
        return false;
    }
    std::ofstream file(nativePath, std::ios_base::out);
    const bool opened = file.is_open();
    if (opened) {
        const std::string& bytes = makeBytes();
        file.write(bytes.data(), static_cast<std::streamsize>(bytes.size()));
    }
    file.close();
    return opened;
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
