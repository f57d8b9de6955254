// SPDX-License-Identifier: Apache-2.0
// The charsets that text files without a mark are found in.
#include "platform/i18n/detection/legacy_charsets.h"

#include <algorithm>
#include <memory>
#include <stdexcept>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

namespace {

constexpr char16_t noCharacter = 0xFFFF;

struct KnownCharset {
    const char* name;
    CharsetKind kind;
    double priorBits;
};

constexpr CharsetKind singleByte = CharsetKind::singleByte;
constexpr CharsetKind multiByte = CharsetKind::multiByte;
constexpr CharsetKind ebcdic = CharsetKind::ebcdic;

// The priors are guesses, in bits, that only decide where texts are short: files from Windows and
// from the web are common (0 to 1), files from DOS and old Macintosh systems are not (2 to 5), and
// charsets that few people ever used are rarer still.
constexpr KnownCharset knownCharsets[] = {
    {"Shift_JIS", multiByte, 0},
    {"EUC-JP", multiByte, 0},
    {"GB18030", multiByte, 0},
    {"GBK", multiByte, 4},
    {"Johab", multiByte, 5},
    {"Big5", multiByte, 0},
    {"Big5-HKSCS", multiByte, 6},
    {"EUC-KR", multiByte, 0},
    {"EUC-TW", multiByte, 8},
    {"windows-1252", singleByte, 0},
    {"ISO-8859-1", singleByte, 0.25},
    {"ISO-8859-15", singleByte, 1},
    {"windows-1250", singleByte, 0.5},
    {"ISO-8859-2", singleByte, 0.75},
    {"windows-1251", singleByte, 0},
    {"KOI8-R", singleByte, 0.5},
    {"KOI8-U", singleByte, 0.75},
    {"ISO-8859-5", singleByte, 2},
    {"windows-1253", singleByte, 0.5},
    {"ISO-8859-7", singleByte, 0.75},
    {"windows-1254", singleByte, 1},
    {"ISO-8859-9", singleByte, 1.25},
    {"windows-1255", singleByte, 0},
    {"ISO-8859-8", singleByte, 1},
    {"windows-1256", singleByte, 0},
    {"ISO-8859-6", singleByte, 2},
    {"windows-1257", singleByte, 1},
    {"ISO-8859-13", singleByte, 1.5},
    {"ISO-8859-4", singleByte, 3},
    {"windows-1258", singleByte, 1},
    {"windows-874", singleByte, 0},
    {"IBM866", singleByte, 2},
    {"IBM850", singleByte, 4},
    {"IBM00858", singleByte, 5},
    {"IBM437", singleByte, 5},
    {"IBM852", singleByte, 4},
    {"IBM855", singleByte, 5},
    {"macintosh", singleByte, 5},
    {"x-mac-cyrillic", singleByte, 4},
    {"x-mac-centraleurroman", singleByte, 6},
    {"ISO-8859-3", singleByte, 5},
    {"ISO-8859-10", singleByte, 5},
    {"ISO-8859-14", singleByte, 5},
    {"IBM857", singleByte, 6},
    {"IBM862", singleByte, 5},
    {"IBM737", singleByte, 5},
    {"IBM775", singleByte, 6},
    {"IBM869", singleByte, 8},
    {"IBM865", singleByte, 8},
    {"IBM861", singleByte, 9},
    {"IBM860", singleByte, 9},
    {"IBM863", singleByte, 9},
    {"x-mac-greek", singleByte, 7},
    {"VISCII", singleByte, 3},
    {"ISO-8859-16", singleByte, 6},
    {"x-mac-turkish", singleByte, 7},
    {"KZ-1048", singleByte, 3},
    {"PTCP154", singleByte, 3.5},
    {"IBM037", ebcdic, 8},
    {"IBM424", ebcdic, 9},
};

// The names under which the text of a charset can be encoded, the charset's own first.
std::vector<std::string_view> spellings(std::string_view charset) {
    if (charset == "Shift_JIS") {
        return {"Shift_JIS", "x-Shift_JIS-nec", "x-Shift_JIS-ibm"};
    }
    if (charset == "EUC-JP") {
        return {"EUC-JP", "x-EUC-JP-nec"};
    }
    if (charset == "Big5") {
        return {"Big5", "x-Big5-eten"};
    }
    return {charset};
}

}  // namespace

LegacyCharset::LegacyCharset(const char* name, CharsetKind kind, double priorBits)
    : name_(name), kind_(kind), prior_(bits(priorBits)) {
    if (kind_ != CharsetKind::multiByte) {
        learnBytes();
        learnLanguages();
    }
}

void LegacyCharset::learnBytes() {
    const std::unique_ptr<Charset> charset = openCharset(name_, true);
    table_.assign(unused_.size(), noCharacter);
    for (std::size_t i = 0; i < unused_.size(); ++i) {
        const char byte = static_cast<char>(i);
        try {
            const std::u16string text = charset->decode({&byte, 1});
            unused_[i] = text.size() != 1 || charset->encode(text) != std::string_view(&byte, 1);
            table_[i] = unused_[i] ? noCharacter : text.front();
        } catch (const std::runtime_error&) {
            unused_[i] = true;
        }
        traits_[i] = traitsOf(table_[i]);
        const bool isControl = table_[i] < 0x20 || (table_[i] >= 0x7F && table_[i] < 0xA0);
        repertoire_ += !unused_[i] && !isControl ? 1U : 0U;
    }
}

void LegacyCharset::learnLanguages() {
    std::u16string repertoire = table_;
    std::sort(repertoire.begin(), repertoire.end());
    for (const BigramModel& model : bigramModels()) {
        if (model.isWritableWith(repertoire)) {
            Language& language = languages_.emplace_back(Language{&model, {}});
            std::transform(table_.begin(), table_.end(), language.classes.begin(),
                           [&](char16_t c) { return model.classOf(c); });
        }
    }
}

std::optional<std::u16string> LegacyCharset::decode(std::string_view bytes) const {
    try {
        return openCharset(name_, true)->decode(bytes);
    } catch (const std::runtime_error&) {
        return std::nullopt;
    }
}

LegacyCharset::Fit LegacyCharset::fit(const Evidence& evidence) const {
    if (kind_ != CharsetKind::multiByte) {
        const bool fits = decodes(evidence.values);
        return {fits, fits ? name_ : std::string()};
    }
    const std::string_view bytes = evidence.bytes;
    if (openCharset(name_, true)->roundTrips(bytes)) {
        return {true, name_};
    }
    const std::optional<std::u16string> text = decode(bytes);
    if (!text) {
        return {false, {}};
    }
    for (const std::string_view name : spellings(name_)) {
        try {
            if (openCharset(name, true)->encode(*text) == bytes) {
                return {true, std::string(name)};
            }
        } catch (const std::runtime_error&) {
            // The text has a character that this charset cannot encode.
            continue;
        }
    }
    return {true, {}};
}

bool LegacyCharset::agreesWith(const LegacyCharset& other, const ByteSet& bytes) const {
    if (kind_ == CharsetKind::multiByte || other.kind_ == CharsetKind::multiByte) {
        return false;
    }
    for (std::size_t byte = 0; byte < bytes.size(); ++byte) {
        if (bytes[byte] && (unused_[byte] || table_[byte] != other.table_[byte])) {
            return false;
        }
    }
    return true;
}

bool LegacyCharset::holdsLettersOf(const LegacyCharset& other) const {
    return std::all_of(other.table_.begin(), other.table_.end(), [this](char16_t c) {
        return !traitsOf(c).isLetter || table_.find(c) != std::u16string::npos;
    });
}

const std::vector<LegacyCharset>& legacyCharsets() {
    static const std::vector<LegacyCharset> charsets = [] {
        std::vector<LegacyCharset> made;
        for (const KnownCharset& known : knownCharsets) {
            made.emplace_back(known.name, known.kind, known.priorBits);
        }
        return made;
    }();
    return charsets;
}

}  // namespace platform::i18n::detail
