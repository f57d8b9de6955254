// SPDX-License-Identifier: Apache-2.0
// Tells what the host's converters make of codes and characters, for the page's to be compared
// with.
//
//   charset_oracle CHARSET encode FIRST LAST   for each of these characters: a byte with the length
//   of
//                                              its code, and the code; 0 where it does not come
//                                              back
//   charset_oracle CHARSET decode              standard input has codes, each behind a byte with
//   its length;
//                                              for each: a byte with the number of its UTF-16
//                                              units, and these, little-endian; FF (hex) where it
//                                              means nothing
#include <unicode/utf16.h>

#include <cstdint>
#include <iostream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <string_view>

#include "platform/i18n/codecvt.h"

namespace {

using platform::i18n::codecvt_string_to_ustring;
using platform::i18n::codecvt_ustring_to_string;

class Oracle {
public:
    explicit Oracle(const std::string& charset)
        : strict_(charset, true), replacing_(charset, false), lenient_(charset, false) {}

    std::string encode(std::uint32_t character) {
        std::u16string text;
        if (character > 0xFFFF) {
            text = {static_cast<char16_t>(U16_LEAD(character)),
                    static_cast<char16_t>(U16_TRAIL(character))};
        } else {
            text = {static_cast<char16_t>(character)};
        }
        // Without exceptions, which most characters would be: what was replaced does not come back.
        const std::string code = lenient_.do_convert(text.data(), text.size());
        if (code.empty() || replacing_.do_convert(code.data(), code.size()) != text) {
            return std::string(1, '\0');
        }
        return static_cast<char>(code.size()) + code;
    }

    std::string decode(std::string_view code) {
        try {
            const std::u16string text = strict_.do_convert(code.data(), code.size());
            std::string units(1, static_cast<char>(text.size()));
            for (const char16_t unit : text) {
                units += static_cast<char>(unit & 0xFF);
                units += static_cast<char>(unit >> 8);
            }
            return units;
        } catch (const std::runtime_error&) {
            return "\xFF";
        }
    }

private:
    codecvt_string_to_ustring strict_;
    codecvt_string_to_ustring replacing_;
    codecvt_ustring_to_string lenient_;
};

}  // namespace

int main(int argc, char** argv) {
    std::ios::sync_with_stdio(false);
    const std::string operation = argc > 2 ? argv[2] : "";
    if (operation == "encode" && argc == 5) {
        Oracle oracle(argv[1]);
        const std::uint32_t last = static_cast<std::uint32_t>(std::stoul(argv[4]));
        for (auto one = static_cast<std::uint32_t>(std::stoul(argv[3])); one <= last; ++one) {
            std::cout << oracle.encode(one);
        }
    } else if (operation == "decode" && argc == 3) {
        Oracle oracle(argv[1]);
        const std::string codes(std::istreambuf_iterator<char>(std::cin), {});
        for (std::size_t at = 0; at < codes.size();) {
            const auto length = static_cast<unsigned char>(codes[at]);
            std::cout << oracle.decode(std::string_view(codes).substr(at + 1, length));
            at += 1 + std::size_t{length};
        }
    } else {
        std::cerr << "usage: charset_oracle CHARSET encode FIRST LAST | CHARSET decode\n";
        return 2;
    }
}
