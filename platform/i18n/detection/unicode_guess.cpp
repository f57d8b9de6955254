// SPDX-License-Identifier: Apache-2.0
// UTF-16 and UTF-32 without a byte-order mark.
//
// A text in them is told by what it costs: in the right byte order it is ordinary text, in any
// other reading it is full of zeros or of characters from everywhere.
#include "platform/i18n/detection/unicode_guess.h"

#include <algorithm>
#include <array>
#include <stdexcept>

#include "platform/i18n/charsets/charset.h"
#include "platform/i18n/detection/plausibility.h"

namespace platform::i18n::detail {

namespace {

constexpr std::size_t sampleSize = 4096;
// Text costs around five bits for a byte of UTF-16, other bytes eight and more.
constexpr double plausibleBitsPerByte = 7;

struct Form {
    const char* name;
    std::size_t unitSize;
};

// The bits that each byte of the beginning costs in this form, a lot when it is malformed; no less
// than `limit` when it is found to cost more than that.
double bitsPerByte(const Form& form, std::string_view bytes, double limit) {
    constexpr std::size_t piece = 64;
    const std::string_view sample = bytes.substr(0, sampleSize);
    const auto size = static_cast<double>(sample.size());
    TextCost cost(openCharset(form.name, false)->decode(sample), allLanguages(), Surroundings(""));
    while (!cost.isWhole() && cost.bits() / size < limit) {
        cost.lookFurther(piece);
    }
    return cost.bits() / size;
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

std::optional<UnicodeGuess> unmarkedUnicode(std::string_view bytes) {
    constexpr std::array<Form, 4> forms{
        {{"UTF-32LE", 4}, {"UTF-32BE", 4}, {"UTF-16LE", 2}, {"UTF-16BE", 2}}};
    const Form* best = nullptr;
    double bestCost = plausibleBitsPerByte;
    for (const Form& form : forms) {
        if (bytes.size() % form.unitSize == 0) {
            const double cost = bitsPerByte(form, bytes, bestCost);
            if (cost < bestCost) {
                best = &form;
                bestCost = cost;
            }
        }
    }
    if (best == nullptr || !isWhole(*best, bytes)) {
        return std::nullopt;
    }
    return UnicodeGuess{best->name, bestCost};
}

}  // namespace platform::i18n::detail
