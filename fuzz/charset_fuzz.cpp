// SPDX-License-Identifier: Apache-2.0
// Detection on any bytes: what it returns must decode all of them and, unless they have escape
// sequences, give them back, and the converters must neither crash nor read beyond their input
// under any name, nor lose what they decoded strictly.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <sstream>
#include <stdexcept>
#include <string>

#include "platform/i18n/codecvt.h"
#include "platform/i18n/detect_charset.h"

namespace {

void checkDetection(const std::string& bytes) {
    std::ostringstream diagnostics;
    const std::string charset =
        platform::i18n::detect_charset(bytes.data(), bytes.size(), diagnostics, u"input");
    platform::i18n::codecvt_string_to_ustring decoder(charset, true);
    platform::i18n::codecvt_ustring_to_string encoder(charset, true);
    const std::u16string text = to_ustring(bytes, decoder);
    const std::string encoded = to_string(text, encoder);
    if (encoded != bytes &&
        !(platform::i18n::hasEscapeSequences(charset) && to_ustring(encoded, decoder) == text)) {
        std::abort();
    }
}

// What decodes strictly encodes again, to bytes of the same text.
void checkStrictConversion(const std::string& name, const std::string& bytes) {
    std::u16string text;
    try {
        platform::i18n::codecvt_string_to_ustring decoder(name, true);
        text = to_ustring(bytes, decoder);
    } catch (const std::runtime_error&) {
        return;
    }
    platform::i18n::codecvt_string_to_ustring decoder(name, true);
    platform::i18n::codecvt_ustring_to_string encoder(name, true);
    if (to_ustring(to_string(text, encoder), decoder) != text) {
        std::abort();
    }
}

// Takes the first line for a charset's name, and the rest for text in it.
void checkConversion(const std::string& input) {
    const std::size_t end = input.find('\n');
    const std::string name = input.substr(0, end);
    const std::string bytes = end == std::string::npos ? std::string() : input.substr(end + 1);
    checkStrictConversion(name, bytes);
    try {
        platform::i18n::codecvt_string_to_ustring decoder(name, false);
        platform::i18n::codecvt_ustring_to_string encoder(name, false);
        to_string(to_ustring(bytes, decoder), encoder);
    } catch (const std::runtime_error&) {
        // The name means nothing.
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string input(reinterpret_cast<const char*>(data), size);
    checkDetection(input);
    checkConversion(input);
    return 0;
}
