// SPDX-License-Identifier: Apache-2.0
// The string kernels for machines with AVX2. This file alone is compiled for them.
#include <immintrin.h>

#include "json/string_kernel_loops.h"

namespace json::detail {
namespace {

/// 64 bytes as two vectors.
class Avx2Block {
public:
    explicit Avx2Block(const char* bytes)
        : low(_mm256_loadu_si256(reinterpret_cast<const __m256i*>(bytes))),
          high(_mm256_loadu_si256(reinterpret_cast<const __m256i*>(bytes) + 1)) {}

    void store(char* out) const {
        _mm256_storeu_si256(reinterpret_cast<__m256i*>(out), low);
        _mm256_storeu_si256(reinterpret_cast<__m256i*>(out) + 1, high);
    }

    Mask backslashes() const { return mask(equal(low, '\\'), equal(high, '\\')); }
    Mask quotes() const { return mask(equal(low, '"'), equal(high, '"')); }
    Mask specials() const { return mask(special(low), special(high)); }

private:
    static __m256i equal(__m256i vector, char c) {
        return _mm256_cmpeq_epi8(vector, _mm256_set1_epi8(c));
    }

    static __m256i special(__m256i vector) {
        const __m256i atMostControl = _mm256_min_epu8(vector, _mm256_set1_epi8(0x1F));
        return _mm256_or_si256(_mm256_or_si256(equal(vector, '\\'), equal(vector, '"')),
                               _mm256_cmpeq_epi8(vector, atMostControl));
    }

    static Mask mask(__m256i found, __m256i foundHigh) {
        const auto lowBits = static_cast<unsigned>(_mm256_movemask_epi8(found));
        const auto highBits = static_cast<unsigned>(_mm256_movemask_epi8(foundHigh));
        return lowBits | static_cast<Mask>(highBits) << 32;
    }

    __m256i low;
    __m256i high;
};

}  // namespace

extern const StringKernels avx2StringKernels;
constexpr StringKernels avx2StringKernels = kernelsOf<Avx2Block>("AVX2");

}  // namespace json::detail
