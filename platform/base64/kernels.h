// SPDX-License-Identifier: Apache-2.0
// The inner loops of base64: whole groups of three bytes to four characters, and back.
//
// Each exists for plain words, for AVX2 and for NEON; all give the same results. None reads or
// writes outside the groups that it is given.
#pragma once

#include <cstddef>
#include <span>

namespace platform::base64 {

constexpr std::size_t bytesPerGroup = 3;
constexpr std::size_t charactersPerGroup = 4;

struct Kernels {
    const char* name;

    /// Encodes `groups` groups.
    void (*encode)(const char* bytes, std::size_t groups, char* text);

    /// Decodes up to `groups` groups, up to the first that has a character outside the alphabet.
    /// Returns their number. What follows their bytes, up to the end of all groups, may be
    /// overwritten.
    std::size_t (*decode)(const char* text, std::size_t groups, char* bytes);
};

/// Kernels that every machine can run.
extern const Kernels plainKernels;

/// The fastest kernels that this machine can run.
const Kernels& kernels();

/// All kernels that this machine can run.
std::span<const Kernels* const> runnableKernels();

}  // namespace platform::base64
