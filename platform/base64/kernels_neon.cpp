// SPDX-License-Identifier: Apache-2.0
// The kernels for arm64, where every machine has NEON: sixteen groups at once. Its loads and stores
// of structures take the bytes, and the characters, of the groups apart and together.
#include <arm_neon.h>

#include <cstdint>

#include "platform/base64/kernels.h"

namespace platform::base64 {
namespace {

constexpr std::size_t groupsPerStep = 16;

constexpr char alphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

/// The value of each ASCII character; for one outside the alphabet, a byte with its highest bit
/// set.
struct ValueTable {
    constexpr ValueTable() {
        for (std::uint8_t& value : values) {
            value = 0x80;
        }
        for (std::uint8_t value = 0; value < 64; ++value) {
            values[static_cast<unsigned char>(alphabet[value])] = value;
        }
    }
    std::uint8_t values[128] = {};
};

constexpr ValueTable valueTable;

const std::uint8_t* unsignedBytes(const char* bytes) {
    return reinterpret_cast<const std::uint8_t*>(bytes);
}

void encode(const char* bytes, std::size_t groups, char* text) {
    const uint8x16x4_t characters = vld1q_u8_x4(unsignedBytes(alphabet));
    const uint8x16_t sixBits = vdupq_n_u8(63);
    for (; groups >= groupsPerStep; groups -= groupsPerStep) {
        const uint8x16x3_t in = vld3q_u8(unsignedBytes(bytes));
        // vsliq_n_u8 puts the lower bits of one byte above those of another.
        const uint8x16x4_t values = {
            {vshrq_n_u8(in.val[0], 2),
             vandq_u8(vsliq_n_u8(vshrq_n_u8(in.val[1], 4), in.val[0], 4), sixBits),
             vandq_u8(vsliq_n_u8(vshrq_n_u8(in.val[2], 6), in.val[1], 2), sixBits),
             vandq_u8(in.val[2], sixBits)}};
        const uint8x16x4_t out = {
            {vqtbl4q_u8(characters, values.val[0]), vqtbl4q_u8(characters, values.val[1]),
             vqtbl4q_u8(characters, values.val[2]), vqtbl4q_u8(characters, values.val[3])}};
        vst4q_u8(reinterpret_cast<std::uint8_t*>(text), out);
        bytes += groupsPerStep * bytesPerGroup;
        text += groupsPerStep * charactersPerGroup;
    }
    plainKernels.encode(bytes, groups, text);
}

std::size_t decode(const char* text, std::size_t groups, char* bytes) {
    const uint8x16x4_t lowTable = vld1q_u8_x4(valueTable.values);
    const uint8x16x4_t highTable = vld1q_u8_x4(valueTable.values + 64);
    std::size_t done = 0;
    for (; groups - done >= groupsPerStep; done += groupsPerStep) {
        const uint8x16x4_t in = vld4q_u8(unsignedBytes(text));
        // A table gives 0 for what is behind its end, or leaves the other's value.
        const auto valueOf = [&](uint8x16_t characters) {
            return vqtbx4q_u8(vqtbl4q_u8(lowTable, characters), highTable,
                              veorq_u8(characters, vdupq_n_u8(64)));
        };
        const uint8x16x4_t values = {
            {valueOf(in.val[0]), valueOf(in.val[1]), valueOf(in.val[2]), valueOf(in.val[3])}};
        // Characters beyond ASCII are in neither table.
        const uint8x16_t faults =
            vorrq_u8(vorrq_u8(vorrq_u8(values.val[0], values.val[1]),
                              vorrq_u8(values.val[2], values.val[3])),
                     vorrq_u8(vorrq_u8(in.val[0], in.val[1]), vorrq_u8(in.val[2], in.val[3])));
        if (vmaxvq_u8(faults) >= 0x80) {
            break;
        }
        const uint8x16x3_t out = {{vsliq_n_u8(vshrq_n_u8(values.val[1], 4), values.val[0], 2),
                                   vsliq_n_u8(vshrq_n_u8(values.val[2], 2), values.val[1], 4),
                                   vsliq_n_u8(values.val[3], values.val[2], 6)}};
        vst3q_u8(reinterpret_cast<std::uint8_t*>(bytes), out);
        text += groupsPerStep * charactersPerGroup;
        bytes += groupsPerStep * bytesPerGroup;
    }
    return done + plainKernels.decode(text, groups - done, bytes);
}

}  // namespace

extern const Kernels neonKernels;
constexpr Kernels neonKernels = {"NEON", encode, decode};

}  // namespace platform::base64
