// SPDX-License-Identifier: Apache-2.0
// UTF-16 and UTF-32 without a byte-order mark.
//
// They are recognised by the text's cost: in the right byte order it is ordinary text, in any other
// reading it is full of zeros or of characters from everywhere.
#include "platform/i18n/detection/unmarked_unicode.h"

#include <algorithm>
#include <array>
#include <memory>
#include <stdexcept>

#include "platform/i18n/charsets/charset.h"
#include "platform/i18n/detection/language_model.h"
#include "platform/i18n/detection/text_counts.h"

namespace platform::i18n::detail {

namespace {

// Enough to recognise any language.
constexpr std::size_t sampleSize = 2048;
// Text costs around five bits for a byte of UTF-16, other bytes eight and more.
constexpr double plausibleBitsPerByte = 7;

struct Form {
    const char* name;
    std::size_t unitSize;
};

// The cost of the beginning in this form, very high when it is malformed; any value above `limit`
// when it is above that.
Cost costIn(const Form& form, std::string_view sample, Cost limit) {
    const std::u16string text = openCharset(form.name, false)->decode(sample);
    TextCounts counts(text);
    counts.countTriplesOfCharacters(text);
    const Cost cost = costBesideWords(
        counts, [](char16_t c) { return c; }, allTraits(), limit);
    if (cost > limit) {
        return cost;
    }
    Cost least = limit + 1;
    for (const UnigramModel& model : unigramModels()) {
        least = std::min(least, cost + costOfWords(counts, model, least - cost));
    }
    for (const BigramModel& model : bigramModels()) {
        const auto classOf = [&model](char16_t c) { return model.classOf(c); };
        least = std::min(least, cost + costOfWords(counts.pairs, model, classOf, least - cost));
    }
    return least;
}

bool isWhole(const Form& form, std::string_view bytes) {
    try {
        const std::unique_ptr<Charset> opened = openCharset(form.name, true);
        if (!opened->roundTrips(bytes)) {
            opened->decode(bytes);
        }
        return true;
    } catch (const std::runtime_error&) {
        return false;
    }
}

}  // namespace

std::optional<UnmarkedUnicode> unmarkedUnicode(std::string_view bytes) {
    constexpr std::array<Form, 4> forms{
        {{"UTF-32LE", 4}, {"UTF-32BE", 4}, {"UTF-16LE", 2}, {"UTF-16BE", 2}}};
    const std::string_view sample = bytes.substr(0, sampleSize);
    const auto size = static_cast<double>(sample.size());
    // All of UTF-32 has zeros.
    const std::size_t longestUnit = bytes.find('\0') == std::string_view::npos ? 2 : 4;
    const Form* best = nullptr;
    Cost limit = bits(plausibleBitsPerByte * size);
    for (const Form& form : forms) {
        if (form.unitSize <= longestUnit && bytes.size() % form.unitSize == 0) {
            const Cost cost = costIn(form, sample, limit);
            if (cost < limit) {
                best = &form;
                limit = cost;
            }
        }
    }
    if (best == nullptr || !isWhole(*best, bytes)) {
        return std::nullopt;
    }
    return UnmarkedUnicode{best->name,
                           static_cast<double>(limit) / static_cast<double>(bits(1)) / size};
}

}  // namespace platform::i18n::detail
