// SPDX-License-Identifier: Apache-2.0
// East Asian charsets in which some characters have two codes.
//
// Vendors added characters to the national standards, some of them twice. A converter decodes both
// codes and encodes one; a text with the other would come back changed.
#include "platform/i18n/charsets/duplicate_codes.h"

#include <array>
#include <stdexcept>
#include <string>
#include <unordered_map>
#include <utility>

namespace platform::i18n::detail {

namespace {

struct CodeRange {
    unsigned first;
    unsigned last;
};

struct Variant {
    std::string_view name;
    const char* base;
    // The codes that are preferred.
    std::array<CodeRange, 2> ranges;
};

constexpr CodeRange none{1, 0};
constexpr std::array<Variant, 4> variants{{
    {"x-Shift_JIS-nec", "Shift_JIS", {{{0x8790, 0x879C}, {0xED40, 0xEEFC}}}},
    {"x-Shift_JIS-ibm", "Shift_JIS", {{{0xFA4A, 0xFA5B}, none}}},
    {"x-EUC-JP-nec", "EUC-JP", {{{0xADF0, 0xADFC}, none}}},
    {"x-Big5-eten", "Big5", {{{0xA2A4, 0xA2A7}, {0xF9F9, 0xF9FE}}}},
}};

using PreferredCodes = std::unordered_map<char16_t, std::string>;

// The codes in `range` that the charset does not give back when it has decoded them.
void addUnusedCodes(Charset& charset, CodeRange range, PreferredCodes& codes) {
    for (unsigned value = range.first; value <= range.last; ++value) {
        const std::string code{static_cast<char>(value >> 8), static_cast<char>(value & 0xFF)};
        try {
            const std::u16string text = charset.decode(code);
            if (text.size() == 1 && charset.encode(text) != code) {
                codes.emplace(text.front(), code);
            }
        } catch (const std::runtime_error&) {
            continue;
        }
    }
}

const PreferredCodes& preferredCodes(const Variant& variant) {
    static const std::array<PreferredCodes, variants.size()> all = [] {
        std::array<PreferredCodes, variants.size()> made;
        for (std::size_t i = 0; i < variants.size(); ++i) {
            const std::unique_ptr<Charset> charset = openCharset(variants[i].base, true);
            for (const CodeRange range : variants[i].ranges) {
                addUnusedCodes(*charset, range, made[i]);
            }
        }
        return made;
    }();
    return all[static_cast<std::size_t>(&variant - variants.data())];
}

class DuplicateCodes final : public Charset {
public:
    DuplicateCodes(std::unique_ptr<Charset> base, const PreferredCodes& preferred)
        : base_(std::move(base)), preferred_(preferred) {}

    std::u16string decode(std::string_view bytes) override { return base_->decode(bytes); }

    std::string encode(std::u16string_view text) override {
        std::string bytes;
        std::size_t done = 0;
        for (std::size_t i = 0; i < text.size(); ++i) {
            const auto found = preferred_.find(text[i]);
            if (found != preferred_.end()) {
                bytes += base_->encode(text.substr(done, i - done));
                bytes += found->second;
                done = i + 1;
            }
        }
        return bytes + base_->encode(text.substr(done));
    }

private:
    std::unique_ptr<Charset> base_;
    const PreferredCodes& preferred_;
};

}  // namespace

std::unique_ptr<Charset> makeDuplicateCodesVariant(std::string_view name, bool strict) {
    for (const Variant& variant : variants) {
        if (variant.name == name) {
            return std::make_unique<DuplicateCodes>(openCharset(variant.base, strict),
                                                    preferredCodes(variant));
        }
    }
    return nullptr;
}

}  // namespace platform::i18n::detail
