// SPDX-License-Identifier: Apache-2.0
// Each value is counted where it begins in the text: the first element of an array or object at its
// opening, every other one at the comma before it.
#include "json/parse_memory.h"

#include <algorithm>

#include "json/string_kernels.h"
#include "json/value.h"

namespace json {
namespace {

/// What malloc uses for an allocation of `bytes`: a multiple of 16, of which 8 are its own.
constexpr std::size_t allocated(std::size_t bytes) {
    constexpr std::size_t smallest = 32;
    return std::max(smallest, (bytes + 8 + 15) / 16 * 16);
}

// While a vector grows, there is room for twice its elements, and the old room for all of them.
constexpr std::size_t perGrowingElement = 3;

/// The node of a std::map, which links it to three others.
constexpr std::size_t memberSize = allocated(4 * sizeof(void*) + sizeof(Object::value_type));

constexpr std::size_t elementSize = perGrowingElement * sizeof(Value);

/// What the parser remembers of a container while it is open.
constexpr std::size_t openArraySize = perGrowingElement * sizeof(Value*);
constexpr std::size_t openObjectSize = openArraySize + perGrowingElement * 3 * sizeof(char*);

constexpr std::size_t perArray = openArraySize + allocated(sizeof(Value));
constexpr std::size_t perObject = openObjectSize + memberSize;
constexpr std::size_t perComma = std::max(elementSize, memberSize);

/// What a string takes in addition to its bytes.
constexpr std::size_t perString = allocated(1) - 1;

// One container at a time moves to a larger allocation; all but the first are counted above.
constexpr std::size_t always = 4096;

}  // namespace

std::size_t memoryToParse(std::string_view text) noexcept {
    const detail::StringKernels& kernels = detail::stringKernels();
    const char* const end = text.data() + text.size();
    std::size_t memory = always;
    for (const char* in = text.data(); in != end; ++in) {
        switch (*in) {
            case '[':
                memory += perArray;
                break;
            case '{':
                memory += perObject;
                break;
            case ',':
                memory += perComma;
                break;
            case '"': {
                const char* const closing = kernels.measure(in + 1, end).end;
                memory += perString + static_cast<std::size_t>(closing - in);
                if (closing == end)
                    return memory;
                in = closing;
                break;
            }
            default:
                break;
        }
    }
    return memory;
}

std::size_t mostMemoryToParse(std::size_t length) noexcept {
    return always + length * std::max({perArray, perObject, perComma, perString + 1});
}

}  // namespace json
