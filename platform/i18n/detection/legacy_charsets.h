// SPDX-License-Identifier: Apache-2.0
// The charsets that text files without a mark are found in.
#pragma once

#include <array>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/i18n/detection/evidence.h"
#include "platform/i18n/detection/language_model.h"

namespace platform::i18n::detail {

enum class CharsetKind { singleByte, multiByte, ebcdic };

/// A charset that a file may be in.
class LegacyCharset {
public:
    LegacyCharset(const char* name, CharsetKind kind, double priorBits);

    /// Its IANA name, or the usual one where IANA has none.
    const std::string& name() const { return name_; }
    CharsetKind kind() const { return kind_; }

    /// How much rarer files in this charset are than those in the most common one.
    Cost prior() const { return prior_; }

    /// The text of `bytes`; nothing when they are malformed.
    std::optional<std::u16string> decode(std::string_view bytes) const;

    /// How well the charset fits a whole file.
    struct Fit {
        /// Whether all the bytes decode strictly.
        bool decodes;
        /// The name under which they also encode back to the same bytes: the charset's own, or that
        /// of a variant which decodes to the same text. Empty when there is none.
        std::string name;
    };
    Fit fit(const Evidence& evidence) const;

    /// A language that the charset was made for, and what each byte is to its model.
    struct Language {
        const BigramModel* model;
        std::array<BigramModel::Class, 256> classes;
    };

    // The rest is about charsets of single bytes, EBCDIC included.

    const std::vector<Language>& languages() const { return languages_; }
    /// What `byte` stands for; meaningless for those that stand for nothing.
    char16_t characterOf(std::size_t byte) const { return table_[byte]; }
    /// The traits of what each byte stands for.
    const CharacterTraits* traits() const { return traits_.data(); }
    bool decodes(const ByteSet& bytes) const { return (bytes & unused_).none(); }
    bool agreesWith(const LegacyCharset& other, const ByteSet& bytes) const;
    bool holdsLettersOf(const LegacyCharset& other) const;
    /// How many characters it holds, controls not counted.
    std::size_t repertoire() const { return repertoire_; }

private:
    void learnBytes();
    void learnLanguages();

    std::string name_;
    CharsetKind kind_;
    Cost prior_;
    std::u16string table_;
    std::array<CharacterTraits, 256> traits_{};
    ByteSet unused_;
    std::size_t repertoire_ = 0;
    std::vector<Language> languages_;
};

/// All of them, likelier ones first. Made once, at the first call; lives as long as the program.
const std::vector<LegacyCharset>& legacyCharsets();

}  // namespace platform::i18n::detail
