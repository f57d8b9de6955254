// SPDX-License-Identifier: Apache-2.0
// Values of any shape, made by the parser, into text and back: the text says the same value.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "json/parser.h"
#include "json/serialize.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const json::Object value = json::parse({reinterpret_cast<const char*>(data), size});
    const std::string text = json::serialize(json::Value(value));
    const json::Object again = json::parse(text);
    // Numbers that no text can give, integers of 64 bits and infinities, have become others once;
    // after that nothing changes any more.
    const std::string textAgain = json::serialize(json::Value(again));
    const json::Object andAgain = json::parse(textAgain);
    const bool isLost = again.size() != value.size();
    if (isLost || andAgain != again || json::serialize(json::Value(andAgain)) != textAgain) {
        std::abort();
    }
    return 0;
}
