// SPDX-License-Identifier: Apache-2.0
// The kernels that every machine can run, and the choice among all.
#include "platform/base64/kernels.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "platform/runnable_kernels.h"

namespace platform::base64 {

#ifdef HAS_AVX2_KERNELS
extern const Kernels avx2Kernels;
#endif
#ifdef HAS_NEON_KERNELS
extern const Kernels neonKernels;
#endif

namespace {

constexpr std::string_view alphabet =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

constexpr std::uint32_t outside = 0xFF00'0000;

/// For each place of a group, what a character there adds to the 24 bits of the group's bytes; for
/// a character outside the alphabet, bits above these.
constexpr auto parts = [] {
    std::array<std::array<std::uint32_t, 256>, charactersPerGroup> table{};
    for (std::size_t place = 0; place < charactersPerGroup; ++place) {
        table[place].fill(outside);
        for (std::uint32_t value = 0; value < alphabet.size(); ++value) {
            table[place][static_cast<unsigned char>(alphabet[value])] = value << (18 - 6 * place);
        }
    }
    return table;
}();

std::uint32_t byteAt(const char* bytes, std::size_t index) {
    return static_cast<unsigned char>(bytes[index]);
}

void encode(const char* bytes, std::size_t groups, char* text) {
    for (; groups != 0; --groups, bytes += bytesPerGroup, text += charactersPerGroup) {
        const std::uint32_t bits =
            byteAt(bytes, 0) << 16 | byteAt(bytes, 1) << 8 | byteAt(bytes, 2);
        text[0] = alphabet[bits >> 18];
        text[1] = alphabet[bits >> 12 & 63];
        text[2] = alphabet[bits >> 6 & 63];
        text[3] = alphabet[bits & 63];
    }
}

std::size_t decode(const char* text, std::size_t groups, char* bytes) {
    for (std::size_t done = 0; done < groups; ++done) {
        const std::uint32_t bits = parts[0][byteAt(text, 0)] | parts[1][byteAt(text, 1)] |
                                   parts[2][byteAt(text, 2)] | parts[3][byteAt(text, 3)];
        if (bits >= outside) {
            return done;
        }
        bytes[0] = static_cast<char>(bits >> 16);
        bytes[1] = static_cast<char>(bits >> 8);
        bytes[2] = static_cast<char>(bits);
        text += charactersPerGroup;
        bytes += bytesPerGroup;
    }
    return groups;
}

RunnableKernels<Kernels, 2> findRunnable() {
    RunnableKernels<Kernels, 2> runnable;
    runnable.add(plainKernels);
#ifdef HAS_AVX2_KERNELS
    if (__builtin_cpu_supports("avx2")) {
        runnable.add(avx2Kernels);
    }
#endif
#ifdef HAS_NEON_KERNELS
    runnable.add(neonKernels);
#endif
    return runnable;
}

}  // namespace

constexpr Kernels plainKernels = {"plain", encode, decode};

std::span<const Kernels* const> runnableKernels() {
    static const RunnableKernels<Kernels, 2> runnable = findRunnable();
    return runnable.all();
}

const Kernels& kernels() {
    static const Kernels& quickest = *runnableKernels().back();
    return quickest;
}

}  // namespace platform::base64
