// SPDX-License-Identifier: Apache-2.0
// A text file's bytes and their meaning, for commands that need to know more than the bundle says:
// its charset, whether it has a byte-order mark, and what else it might be.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace host {

/// A text file as it is on disk.
struct TextFile {
    std::string bytes;
    std::string charset =
        "UTF-8";          ///< The IANA name of the charset in which the bundle reads and writes it.
    std::u16string text;  ///< The whole text, a byte-order mark included.

    bool hasMark() const { return text.starts_with(u'\uFEFF'); }
    std::u16string_view withoutMark() const {
        return std::u16string_view(text).substr(hasMark() ? 1 : 0);
    }
};

/// The bytes of the regular file at `path`; nothing when there is none, or none that can be read.
std::optional<std::string> readRegularFile(const std::string& path);

/// The charset in which the bundle reads `bytes`. Throws std::runtime_error when they are more than
/// a text may have.
std::string charsetOf(std::string_view bytes);

/// The text file at `path`; an empty one in UTF-8 where there is none. Throws std::runtime_error as
/// charsetOf does.
TextFile readTextFile(const std::string& path);

/// `bytes` of `charset` as UTF-8. Throws std::runtime_error when they are not valid in it.
std::string toUtf8(std::string_view bytes, const std::string& charset);

/// `text` with U+FFFD in place of each byte that is not part of a valid UTF-8 character.
std::string asValidUtf8(std::string_view text);

/// `text` in `charset`. Throws std::runtime_error, which names those of its characters that the
/// charset lacks and the position of the first one, when it cannot hold all of it.
std::string encode(std::u16string_view text, const std::string& charset);

/// Whether `charset` has all characters of `text`. Throws std::runtime_error when it is unknown.
bool canHold(std::u16string_view text, const std::string& charset);

/// What keeps `bytes` from being stored in `charset`; empty when nothing does.
std::string faultOfText(std::string_view bytes, const std::string& charset);

}  // namespace host
