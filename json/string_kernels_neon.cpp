// SPDX-License-Identifier: Apache-2.0
// The string kernels for arm64, where every machine has NEON.
#include <arm_neon.h>

#include <cstdint>

#include "json/string_kernel_loops.h"

namespace json::detail {
namespace {

/// 64 bytes as four vectors.
class NeonBlock {
public:
    explicit NeonBlock(const char* bytes)
        : vectors(vld1q_u8_x4(reinterpret_cast<const std::uint8_t*>(bytes))) {}

    void store(char* out) const { vst1q_u8_x4(reinterpret_cast<std::uint8_t*>(out), vectors); }

    Mask backslashes() const {
        return maskOf([](uint8x16_t vector) { return equal(vector, '\\'); });
    }
    Mask quotes() const {
        return maskOf([](uint8x16_t vector) { return equal(vector, '"'); });
    }
    Mask specials() const {
        return maskOf([](uint8x16_t vector) {
            return vorrq_u8(vorrq_u8(equal(vector, '\\'), equal(vector, '"')),
                            vcltq_u8(vector, vdupq_n_u8(0x20)));
        });
    }

private:
    static uint8x16_t equal(uint8x16_t vector, std::uint8_t c) {
        return vceqq_u8(vector, vdupq_n_u8(c));
    }

    template <typename Find>
    Mask maskOf(Find find) const {
        // Each byte keeps the bit of its place among eight. Adding neighbours three times gathers
        // these eight in a byte.
        const uint8x16_t places = {1, 2, 4, 8, 16, 32, 64, 128, 1, 2, 4, 8, 16, 32, 64, 128};
        const auto bits = [&](int i) { return vandq_u8(find(vectors.val[i]), places); };
        const uint8x16_t pairs =
            vpaddq_u8(vpaddq_u8(bits(0), bits(1)), vpaddq_u8(bits(2), bits(3)));
        return vgetq_lane_u64(vreinterpretq_u64_u8(vpaddq_u8(pairs, pairs)), 0);
    }

    uint8x16x4_t vectors;
};

}  // namespace

extern const StringKernels neonStringKernels;
constexpr StringKernels neonStringKernels = kernelsOf<NeonBlock>("NEON");

}  // namespace json::detail
