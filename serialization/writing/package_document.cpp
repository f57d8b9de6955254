// Writes document packages.

#include <stdexcept>

#include "platform/i18n/codecvt.h"
#include "serialization/serialization.h"

namespace EditorServices {

using platform::i18n::codecvt_string_to_ustring;
using platform::i18n::codecvt_ustring_to_string;
using platform::i18n::to_string;
using platform::i18n::to_ustring;

bool Serialization::writePackageDocument(std::u16string, json::Object) const {
    throw std::runtime_error("Document packages cannot be written yet.");
}

std::vector<std::uint8_t> Serialization::cleanTextToUtf8(std::string text) const {
    codecvt_string_to_ustring decoder("UTF-8", true);
    std::u16string units = to_ustring(text, decoder);
    for (char16_t& unit : units) {
        if (isDisallowedControl(unit) || isNonCharacter(unit) || isZeroWidthSpace(unit)) {
            unit = replacementChar;
        }
    }
    codecvt_ustring_to_string encoder("UTF-8", true);
    const std::string cleaned = to_string(units, encoder);
    return {cleaned.begin(), cleaned.end()};
}

}  // namespace EditorServices
