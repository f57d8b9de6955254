// SPDX-License-Identifier: Apache-2.0
// The loops for wider vectors beside those for plain words, of JSON strings and of base64: on the
// same bytes, each gives the same result. The memory is of exactly the size that each may use.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "json/string_kernels.h"
#include "platform/base64/kernels.h"

namespace {

using json::detail::StringKernels;
using platform::base64::Kernels;

/// What a string kernel does with `in`: how far it reads and what it writes into `room` bytes.
using Copying = std::pair<std::ptrdiff_t, std::string>;

template <typename Kernel>
Copying copied(Kernel kernel, const std::vector<char>& in, std::size_t room) {
    std::vector<char> out(room);
    const auto end = kernel(in.data(), in.data() + in.size(), out.data(), out.data() + room);
    return {end.in - in.data(), std::string(out.data(), end.out)};
}

bool agree(const StringKernels& kernels, const StringKernels& plain, const std::vector<char>& in) {
    const char* const end = in.data() + in.size();
    const auto extent = kernels.measure(in.data(), end);
    const auto plainExtent = plain.measure(in.data(), end);
    // Up to its closing quote, the input is the content of a string.
    const std::vector<char> content(in.data(), plainExtent.end);
    const std::size_t room = content.size() - plainExtent.escapes;
    return extent.end == plainExtent.end && extent.escapes == plainExtent.escapes &&
           copied(kernels.unescape, content, room) == copied(plain.unescape, content, room) &&
           copied(kernels.escape, in, 6 * in.size()) == copied(plain.escape, in, 6 * in.size()) &&
           kernels.countEscapes(in.data(), end) == plain.countEscapes(in.data(), end);
}

std::string encoded(const Kernels& kernels, const std::vector<char>& bytes) {
    const std::size_t groups = bytes.size() / platform::base64::bytesPerGroup;
    std::vector<char> text(groups * platform::base64::charactersPerGroup);
    kernels.encode(bytes.data(), groups, text.data());
    return {text.begin(), text.end()};
}

std::string decoded(const Kernels& kernels, const std::vector<char>& text) {
    const std::size_t groups = text.size() / platform::base64::charactersPerGroup;
    std::vector<char> bytes(groups * platform::base64::bytesPerGroup);
    const std::size_t done = kernels.decode(text.data(), groups, bytes.data());
    return {bytes.data(), bytes.data() + done * platform::base64::bytesPerGroup};
}

bool agree(const Kernels& kernels, const Kernels& plain, const std::vector<char>& in) {
    return encoded(kernels, in) == encoded(plain, in) && decoded(kernels, in) == decoded(plain, in);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::vector<char> in(data, data + size);
    const auto stringKernels = json::detail::runnableStringKernels();
    for (const StringKernels* kernels : stringKernels) {
        if (!agree(*kernels, *stringKernels.front(), in)) {
            std::abort();
        }
    }
    for (const Kernels* kernels : platform::base64::runnableKernels()) {
        if (!agree(*kernels, platform::base64::plainKernels, in)) {
            std::abort();
        }
    }
    return 0;
}
