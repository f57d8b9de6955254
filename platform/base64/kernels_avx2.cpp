// SPDX-License-Identifier: Apache-2.0
// The kernels for machines with AVX2: eight groups at once, as W. Mula and D. Lemire describe it in
// "Faster Base64 Encoding and Decoding using AVX2 Instructions". This file alone is compiled for
// such machines; it calls no shared inline function, of which the linker could take this version
// for all.
#include <immintrin.h>

#include "platform/base64/kernels.h"

namespace platform::base64 {
namespace {

constexpr std::size_t groupsPerStep = 8;

__m256i inBothLanes(__m128i lane) {
    return _mm256_broadcastsi128_si256(lane);
}

/// The 6-bit values of 24 bytes, each in a byte. Those of the low twelve bytes are read from the
/// low lane, and of the others from the high one.
__m256i valuesOf(__m256i bytes) {
    // In each word of four bytes, b a c b of the group's bytes a b c.
    const __m256i groups = _mm256_shuffle_epi8(
        bytes, inBothLanes(_mm_setr_epi8(1, 0, 2, 1, 4, 3, 5, 4, 7, 6, 8, 7, 10, 9, 11, 10)));
    // Shifts by different counts, as multiplications.
    const __m256i oddValues = _mm256_mulhi_epu16(
        _mm256_and_si256(groups, _mm256_set1_epi32(0x0FC0FC00)), _mm256_set1_epi32(0x04000040));
    const __m256i evenValues = _mm256_mullo_epi16(
        _mm256_and_si256(groups, _mm256_set1_epi32(0x003F03F0)), _mm256_set1_epi32(0x01000010));
    return _mm256_or_si256(oddValues, evenValues);
}

/// The characters of 6-bit values: each value plus an offset that depends on its range.
__m256i charactersOf(__m256i values) {
    const __m256i offsets =
        inBothLanes(_mm_setr_epi8(65, 71, -4, -4, -4, -4, -4, -4, -4, -4, -4, -4, -19, -16, 0, 0));
    // 0 for capitals and 1 for small letters; 2 to 11 for digits, 12 for "+", 13 for "/".
    const __m256i beyondLetters = _mm256_subs_epu8(values, _mm256_set1_epi8(51));
    const __m256i beyondCapitals = _mm256_cmpgt_epi8(values, _mm256_set1_epi8(25));
    const __m256i range = _mm256_sub_epi8(beyondLetters, beyondCapitals);
    return _mm256_add_epi8(values, _mm256_shuffle_epi8(offsets, range));
}

void encode(const char* bytes, std::size_t groups, char* text) {
    // Each step reads 28 bytes for the 24 that it encodes.
    while (groups >= groupsPerStep + 2) {
        const __m128i low = _mm_loadu_si128(reinterpret_cast<const __m128i*>(bytes));
        const __m128i high = _mm_loadu_si128(reinterpret_cast<const __m128i*>(bytes + 12));
        const __m256i characters = charactersOf(valuesOf(_mm256_set_m128i(high, low)));
        _mm256_storeu_si256(reinterpret_cast<__m256i*>(text), characters);
        bytes += groupsPerStep * bytesPerGroup;
        text += groupsPerStep * charactersPerGroup;
        groups -= groupsPerStep;
    }
    plainKernels.encode(bytes, groups, text);
}

/// Whether all characters are in the alphabet. Each half of a character stands for a set of
/// classes; a character is outside exactly when both halves have a class in common.
bool areInAlphabet(__m256i characters, __m256i highHalves) {
    const __m256i lowClasses =
        inBothLanes(_mm_setr_epi8(0x15, 0x11, 0x11, 0x11, 0x11, 0x11, 0x11, 0x11, 0x11, 0x11, 0x13,
                                  0x1A, 0x1B, 0x1B, 0x1B, 0x1A));
    const __m256i highClasses =
        inBothLanes(_mm_setr_epi8(0x10, 0x10, 0x01, 0x02, 0x04, 0x08, 0x04, 0x08, 0x10, 0x10, 0x10,
                                  0x10, 0x10, 0x10, 0x10, 0x10));
    const __m256i lowHalves = _mm256_and_si256(characters, _mm256_set1_epi8(0x2F));
    return _mm256_testz_si256(_mm256_shuffle_epi8(lowClasses, lowHalves),
                              _mm256_shuffle_epi8(highClasses, highHalves)) != 0;
}

std::size_t decode(const char* text, std::size_t groups, char* bytes) {
    const __m256i offsets =
        inBothLanes(_mm_setr_epi8(0, 16, 19, 4, -65, -65, -71, -71, 0, 0, 0, 0, 0, 0, 0, 0));
    const __m256i slash = _mm256_set1_epi8('/');
    std::size_t done = 0;
    // Each step writes 32 bytes for the 24 that it decodes.
    while (groups - done >= groupsPerStep + 3) {
        const __m256i characters = _mm256_loadu_si256(reinterpret_cast<const __m256i*>(text));
        const __m256i highHalves =
            _mm256_and_si256(_mm256_srli_epi32(characters, 4), _mm256_set1_epi8(0x2F));
        if (!areInAlphabet(characters, highHalves)) {
            break;
        }
        // By the high half, where "/" is set apart from the digits.
        const __m256i range = _mm256_add_epi8(_mm256_cmpeq_epi8(characters, slash), highHalves);
        const __m256i values = _mm256_add_epi8(characters, _mm256_shuffle_epi8(offsets, range));
        // Joins two values, then two of these pairs, and takes the three bytes of each word
        // together.
        const __m256i pairs = _mm256_maddubs_epi16(values, _mm256_set1_epi32(0x01400140));
        const __m256i words = _mm256_madd_epi16(pairs, _mm256_set1_epi32(0x00011000));
        const __m256i inLanes = _mm256_shuffle_epi8(
            words,
            inBothLanes(_mm_setr_epi8(2, 1, 0, 6, 5, 4, 10, 9, 8, 14, 13, 12, -1, -1, -1, -1)));
        const __m256i joined =
            _mm256_permutevar8x32_epi32(inLanes, _mm256_setr_epi32(0, 1, 2, 4, 5, 6, 3, 7));
        _mm256_storeu_si256(reinterpret_cast<__m256i*>(bytes), joined);
        text += groupsPerStep * charactersPerGroup;
        bytes += groupsPerStep * bytesPerGroup;
        done += groupsPerStep;
    }
    return done + plainKernels.decode(text, groups - done, bytes);
}

}  // namespace

extern const Kernels avx2Kernels;
constexpr Kernels avx2Kernels = {"AVX2", encode, decode};

}  // namespace platform::base64
