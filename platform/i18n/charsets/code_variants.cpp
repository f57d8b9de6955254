// SPDX-License-Identifier: Apache-2.0
// East Asian charsets in which some characters have two codes.
//
// Vendors added characters to the national standards, some of them twice. A converter decodes both
// codes and encodes one; a text with the other would come back changed.
#include "platform/i18n/charsets/code_variants.h"

#include <stdexcept>
#include <string_view>
#include <utility>

namespace platform::i18n::detail {

namespace {

class CodeVariant final : public Charset {
public:
    CodeVariant(std::unique_ptr<Charset> base, const PreferredCodes& preferred)
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

PreferredCodes secondCodes(const char* base, std::initializer_list<CodeRange> ranges) {
    PreferredCodes codes;
    const std::unique_ptr<Charset> charset = openCharset(base, true);
    for (const CodeRange range : ranges) {
        for (unsigned value = range.first; value <= range.last; ++value) {
            const std::string code{static_cast<char>(value >> 8), static_cast<char>(value & 0xFF)};
            try {
                const std::u16string text = charset->decode(code);
                if (text.size() == 1 && charset->encode(text) != code) {
                    codes.emplace(text.front(), code);
                }
            } catch (const std::runtime_error&) {
                continue;
            }
        }
    }
    return codes;
}

std::unique_ptr<Charset> makeCodeVariant(const char* base, const PreferredCodes& preferred,
                                         bool strict) {
    return std::make_unique<CodeVariant>(openCharset(base, strict), preferred);
}

std::unique_ptr<Charset> makeEucJpNec(std::string, bool strict) {
    static const PreferredCodes codes = secondCodes("EUC-JP", {{0xADF0, 0xADFC}});
    return makeCodeVariant("EUC-JP", codes, strict);
}

std::unique_ptr<Charset> makeBig5Eten(std::string, bool strict) {
    static const PreferredCodes codes = secondCodes("Big5", {{0xA2A4, 0xA2A7}, {0xF9F9, 0xF9FE}});
    return makeCodeVariant("Big5", codes, strict);
}

}  // namespace platform::i18n::detail
