// SPDX-License-Identifier: Apache-2.0
// Which of ICU's converters a charset name means.
//
// One name often has several tables. IANA's meaning of it is taken, then MIME's, then ICU's. Where
// the web has long used a name for a superset of what IANA registered, the superset is taken: pages
// that call themselves EUC-KR, GB2312 and TIS-620 are full of characters which those standards
// lack.
#include "platform/i18n/charsets/charset_names.h"

#include <unicode/ucnv.h>

#include <algorithm>
#include <array>

namespace platform::i18n::detail {

namespace {

struct NamePair {
    const char* from;
    const char* to;
};

// Usual names which ICU lacks, or takes for another table than everyone else does.
constexpr std::array<NamePair, 4> extraAliases{{
    {"UHC", "windows-949"},
    {"cp949", "windows-949"},
    {"cp950", "windows-950"},
    {"cp874", "windows-874"},
}};

// ICU's converter for the registered charset, and the one for its superset.
constexpr std::array<NamePair, 4> supersets{{
    {"ibm-970_P110_P110-2006_U2", "windows-949-2000"},  // EUC-KR
    {"ibm-1363_P11B-1998", "windows-949-2000"},         // KS_C_5601-1987
    {"ibm-1383_P110-1999", "windows-936-2000"},         // GB2312
    {"ibm-874_P100-1995", "windows-874-2000"},          // TIS-620
}};

// ICU 72 crashes when it encodes to this one.
constexpr std::string_view unusable = "x11-compound-text";

std::string resolveExtraAlias(std::string name) {
    for (const NamePair& alias : extraAliases) {
        if (ucnv_compareNames(alias.from, name.c_str()) == 0) {
            return alias.to;
        }
    }
    return name;
}

const char* icuMeaning(const std::string& name) {
    for (const char* standard : {"IANA", "MIME"}) {
        UErrorCode error = U_ZERO_ERROR;
        const char* const meaning = ucnv_getCanonicalName(name.c_str(), standard, &error);
        if (meaning != nullptr) {
            return meaning;
        }
    }
    UErrorCode error = U_ZERO_ERROR;
    return ucnv_getAlias(name.c_str(), 0, &error);
}

}  // namespace

bool isPlausibleName(std::string_view name) {
    return !name.empty() && name.size() <= UCNV_MAX_CONVERTER_NAME_LENGTH &&
           std::all_of(name.begin(), name.end(),
                       [](char c) { return c > ' ' && c <= '~' && c != UCNV_OPTION_SEP_CHAR; });
}

std::optional<std::string> converterName(std::string_view name) {
    if (!isPlausibleName(name)) {
        return std::nullopt;
    }
    const char* const meaning = icuMeaning(resolveExtraAlias(std::string(name)));
    if (meaning == nullptr || meaning == unusable) {
        return std::nullopt;
    }
    std::string converter = meaning;
    for (const NamePair& superset : supersets) {
        if (converter == superset.from) {
            converter = superset.to;
        }
    }
    return converter;
}

}  // namespace platform::i18n::detail
