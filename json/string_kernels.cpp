// SPDX-License-Identifier: Apache-2.0
// The kernels that every machine can run, and the choice among all.
#include "json/string_kernels.h"

#include <cstdint>

#ifdef __SSE2__
#include <emmintrin.h>
#endif

#include "json/string_kernel_loops.h"
#include "json/word_bytes.h"
#include "platform/runnable_kernels.h"

namespace json::detail {

#ifdef HAS_AVX2_KERNELS
extern const StringKernels avx2StringKernels;
#endif
#ifdef HAS_NEON_KERNELS
extern const StringKernels neonStringKernels;
#endif

namespace {

/// 64 bytes as eight words.
class WordBlock {
public:
    explicit WordBlock(const char* bytes) { __builtin_memcpy(words, bytes, sizeof words); }

    void store(char* out) const { __builtin_memcpy(out, words, sizeof words); }

    Mask backslashes() const {
        return maskOf([](std::uint64_t word) { return zeroBytes(word ^ repeated('\\')); });
    }
    Mask quotes() const {
        return maskOf([](std::uint64_t word) { return zeroBytes(word ^ repeated('"')); });
    }
    Mask specials() const {
        return maskOf([](std::uint64_t word) {
            return zeroBytes(word ^ repeated('\\')) | zeroBytes(word ^ repeated('"')) |
                   zeroBytes(word & repeated(0xE0));
        });
    }

private:
    template <typename Find>
    Mask maskOf(Find find) const {
        Mask mask = 0;
        for (int i = 0; i < 8; ++i) {
            // The multiplication gathers the highest bits of the bytes in the highest byte.
            const std::uint64_t bits = (find(words[i]) >> 7) * 0x0102'0408'1020'4080u >> 56;
            mask |= bits << (8 * i);
        }
        return mask;
    }

    std::uint64_t words[8];
};

constexpr StringKernels wordKernels = kernelsOf<WordBlock>("words");

#ifdef __SSE2__

/// 64 bytes as four vectors.
class Sse2Block {
public:
    explicit Sse2Block(const char* bytes) {
        for (int i = 0; i < 4; ++i)
            vectors[i] = _mm_loadu_si128(reinterpret_cast<const __m128i*>(bytes) + i);
    }

    void store(char* out) const {
        for (int i = 0; i < 4; ++i)
            _mm_storeu_si128(reinterpret_cast<__m128i*>(out) + i, vectors[i]);
    }

    Mask backslashes() const {
        return maskOf([](__m128i vector) { return equal(vector, '\\'); });
    }
    Mask quotes() const {
        return maskOf([](__m128i vector) { return equal(vector, '"'); });
    }
    Mask specials() const {
        return maskOf([](__m128i vector) {
            const __m128i atMostControl = _mm_min_epu8(vector, _mm_set1_epi8(0x1F));
            return _mm_or_si128(_mm_or_si128(equal(vector, '\\'), equal(vector, '"')),
                                _mm_cmpeq_epi8(vector, atMostControl));
        });
    }

private:
    static __m128i equal(__m128i vector, char c) {
        return _mm_cmpeq_epi8(vector, _mm_set1_epi8(c));
    }

    template <typename Find>
    Mask maskOf(Find find) const {
        Mask mask = 0;
        for (int i = 0; i < 4; ++i) {
            const auto bits = static_cast<unsigned>(_mm_movemask_epi8(find(vectors[i])));
            mask |= static_cast<Mask>(bits) << (16 * i);
        }
        return mask;
    }

    __m128i vectors[4];
};

constexpr StringKernels sse2Kernels = kernelsOf<Sse2Block>("SSE2");

#endif

using RunnableKernels = platform::RunnableKernels<StringKernels, 3>;

RunnableKernels findRunnable() {
    RunnableKernels runnable;
    runnable.add(wordKernels);
#ifdef __SSE2__
    runnable.add(sse2Kernels);
#endif
#ifdef HAS_AVX2_KERNELS
    if (__builtin_cpu_supports("avx2") && __builtin_cpu_supports("bmi") &&
        __builtin_cpu_supports("popcnt"))
        runnable.add(avx2StringKernels);
#endif
#ifdef HAS_NEON_KERNELS
    runnable.add(neonStringKernels);
#endif
    return runnable;
}

}  // namespace

std::span<const StringKernels* const> runnableStringKernels() {
    static const RunnableKernels runnable = findRunnable();
    return runnable.all();
}

const StringKernels& stringKernels() {
    static const StringKernels& quickest = *runnableStringKernels().back();
    return quickest;
}

}  // namespace json::detail
