// SPDX-License-Identifier: Apache-2.0
// Any bytes into each routine of the JSON parser: it has to agree with the reference in status,
// position and value.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>

#include "tests/json/parser_comparison.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view text(reinterpret_cast<const char*>(data), size);
    // The reference is recursive.
    if (std::count_if(text.begin(), text.end(), [](char c) { return c == '[' || c == '{'; }) > 500)
        return 0;
    const std::string difference = json::differenceFromReference(text);
    if (!difference.empty()) {
        std::fputs(difference.c_str(), stderr);
        std::abort();
    }
    return 0;
}
