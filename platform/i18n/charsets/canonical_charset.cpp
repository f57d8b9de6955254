// SPDX-License-Identifier: Apache-2.0
// Charsets in which a text has one right spelling, although ICU's converters accept others too.
#include "platform/i18n/charsets/canonical_charset.h"

#include <algorithm>
#include <cstddef>
#include <string_view>
#include <utility>

#include "platform/i18n/charsets/conversion_error.h"
#include "platform/i18n/charsets/icu_charset.h"

namespace platform::i18n::detail {

namespace {

class CanonicalCharset final : public Charset {
public:
    CanonicalCharset(std::string name, std::unique_ptr<Charset> base, bool strict)
        : name_(std::move(name)), base_(std::move(base)), strict_(strict) {}

    std::u16string decode(std::string_view bytes) override {
        std::u16string text = base_->decode(bytes);
        if (strict_) {
            const std::string encoded = base_->encode(text);
            if (encoded != bytes) {
                const auto difference =
                    std::mismatch(bytes.begin(), bytes.end(), encoded.begin(), encoded.end());
                throwMalformed(name_, static_cast<std::size_t>(difference.first - bytes.begin()));
            }
        }
        return text;
    }

    std::string encode(std::u16string_view text) override { return base_->encode(text); }

private:
    std::string name_;
    std::unique_ptr<Charset> base_;
    bool strict_;
};

std::unique_ptr<Charset> makeCanonical(std::string name, const char* converter, bool strict) {
    std::unique_ptr<Charset> base = makeIcuCharset(name, converter, strict);
    return base ? std::make_unique<CanonicalCharset>(std::move(name), std::move(base), strict)
                : nullptr;
}

}  // namespace

std::unique_ptr<Charset> makeBocu1(std::string name, bool strict) {
    // ICU treats trail bytes as lead bytes at the beginning of a text.
    return makeCanonical(std::move(name), "BOCU-1", strict);
}

std::unique_ptr<Charset> makeGsm0338(std::string name, bool strict) {
    // ICU reads an escape that does not begin a character as a space.
    return makeCanonical(std::move(name), "gsm-03.38-2009", strict);
}

}  // namespace platform::i18n::detail
