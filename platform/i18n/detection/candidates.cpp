// SPDX-License-Identifier: Apache-2.0
// The charsets that text files without a mark are found in.
#include "platform/i18n/detection/candidates.h"

#include <algorithm>
#include <array>
#include <stdexcept>
#include <utility>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n::detail {

namespace {

constexpr char16_t unusedByte = 0xFFFF;
constexpr std::size_t byteValues = 256;

struct KnownCharset {
    const char* name;
    double rarity;
};

// A charset that extends another comes before it. The rarities are rough: files from Windows and
// from the web are common, files from DOS and old Macintosh systems are not, and the rest is rarer
// still.
constexpr KnownCharset knownCharsets[] = {
    {"Shift_JIS", 0},      {"EUC-JP", 0},       {"GB18030", 0},        {"GBK", 4},
    {"Johab", 5},          {"Big5", 0},         {"Big5-HKSCS", 6},     {"EUC-KR", 0},
    {"EUC-TW", 8},         {"windows-1252", 0}, {"ISO-8859-1", 0.1},   {"ISO-8859-15", 1},
    {"windows-1250", 0.5}, {"ISO-8859-2", 0.6}, {"windows-1251", 0},   {"KOI8-R", 0.5},
    {"KOI8-U", 0.6},       {"ISO-8859-5", 2},   {"windows-1253", 0.5}, {"ISO-8859-7", 0.6},
    {"windows-1254", 1},   {"ISO-8859-9", 1.1}, {"windows-1255", 0},   {"ISO-8859-8", 1},
    {"windows-1256", 0},   {"ISO-8859-6", 2},   {"windows-1257", 1},   {"ISO-8859-13", 1.5},
    {"ISO-8859-4", 3},     {"windows-1258", 1}, {"windows-874", 0},    {"IBM866", 2},
    {"IBM850", 4},         {"IBM00858", 5},     {"IBM437", 5},         {"IBM852", 4},
    {"IBM855", 5},         {"macintosh", 4},    {"x-mac-cyrillic", 4}, {"x-mac-centraleurroman", 5},
    {"ISO-8859-3", 5},     {"ISO-8859-10", 5},  {"ISO-8859-14", 7},    {"IBM857", 6},
    {"IBM862", 5},         {"IBM737", 5},       {"IBM775", 6},         {"IBM869", 8},
    {"IBM865", 8},         {"IBM861", 9},       {"IBM860", 9},         {"IBM863", 9},
    {"x-mac-greek", 7},    {"VISCII", 3},       {"ISO-8859-16", 6},    {"x-mac-turkish", 7},
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

Candidate::Candidate(const char* charset, double rarity) : charset_(charset), rarity_(rarity) {
    learnSingleBytes();
    if (!isSingleByte_) {
        languages_ = ideographicLanguages();
        return;
    }
    for (const Language* language : alphabeticLanguages()) {
        if (isWritableWith(*language, table_)) {
            languages_.push_back(language);
        }
    }
}

void Candidate::learnSingleBytes() {
    const std::unique_ptr<Charset> charset = openCharset(charset_, true);
    table_.assign(byteValues, unusedByte);
    std::size_t used = 0;
    for (std::size_t i = 0; i < byteValues; ++i) {
        const char byte = static_cast<char>(i);
        try {
            const std::u16string text = charset->decode({&byte, 1});
            if (text.size() == 1 && charset->encode(text) == std::string_view(&byte, 1)) {
                table_[i] = text.front();
                ++used;
            }
        } catch (const std::runtime_error&) {
            continue;
        }
    }
    // In charsets of several bytes, most bytes above ASCII stand for nothing by themselves.
    isSingleByte_ = used > 200;
}

std::optional<std::u16string> Candidate::decode(std::string_view bytes) const {
    if (!isSingleByte_) {
        try {
            return openCharset(charset_, true)->decode(bytes);
        } catch (const std::runtime_error&) {
            return std::nullopt;
        }
    }
    std::u16string text(bytes.size(), u'\0');
    bool unused = false;
    for (std::size_t i = 0; i < bytes.size(); ++i) {
        text[i] = table_[static_cast<unsigned char>(bytes[i])];
        unused |= text[i] == unusedByte;
    }
    return unused ? std::nullopt : std::optional(std::move(text));
}

Candidate::Fit Candidate::fit(std::string_view bytes) const {
    if (isSingleByte_) {
        const bool fits = std::all_of(bytes.begin(), bytes.end(), [&](char byte) {
            return table_[static_cast<unsigned char>(byte)] != unusedByte;
        });
        return {fits, fits ? charset_ : std::string()};
    }
    if (openCharset(charset_, true)->roundTrips(bytes)) {
        return {true, charset_};
    }
    const std::optional<std::u16string> text = decode(bytes);
    if (!text) {
        return {false, {}};
    }
    for (const std::string_view name : spellings(charset_)) {
        try {
            if (openCharset(name, true)->encode(*text) == bytes) {
                return {true, std::string(name)};
            }
        } catch (const std::runtime_error&) {
            // A code stands for a character that the charset itself has no code for.
            continue;
        }
    }
    return {true, {}};
}

const std::vector<Candidate>& legacyCandidates() {
    static const std::vector<Candidate> candidates = [] {
        std::vector<Candidate> made;
        for (const KnownCharset& known : knownCharsets) {
            made.emplace_back(known.name, known.rarity);
        }
        return made;
    }();
    return candidates;
}

}  // namespace platform::i18n::detail
