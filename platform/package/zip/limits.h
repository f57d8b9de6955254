// SPDX-License-Identifier: Apache-2.0
// How much of a package is accepted. A package is expanded into memory as a whole, and a file of a
// few kilobytes can claim to expand to anything, so all of these are checked against what the
// archive declares before memory is allocated. The writer keeps to them too: what it writes can be
// read.
#pragma once

#include <cstddef>
#include <cstdint>

namespace platform::package::zip {

constexpr std::uint64_t mebibyte = std::uint64_t{1} << 20U;

/// Entries of an archive. As many as an end record can count without ZIP64; office documents have
/// some hundreds.
constexpr std::uint64_t maxEntries = 65'534;

/// Bytes of an archive's directory: room for maxEntries names of a thousand bytes.
constexpr std::uint64_t maxDirectoryBytes = 64 * mebibyte;

/// Bytes of one part, expanded. Several copies of a part exist while it becomes JSON.
constexpr std::uint64_t maxEntryBytes = 1024 * mebibyte;

/// Bytes of all entries that are read together, expanded.
constexpr std::uint64_t maxTotalBytes = 2048 * mebibyte;

/// Expanded bytes per byte of the archive. Sheets full of equal cells reach 150, archives made to
/// fill memory 1000 and more.
constexpr std::uint64_t maxExpansionRatio = 256;

/// Expanded bytes that are accepted at any ratio.
constexpr std::uint64_t harmlessBytes = 64 * mebibyte;

/// The most that one byte of deflated data can expand to: 258 bytes take two bits. A declared size
/// beyond that is wrong.
constexpr std::uint64_t maxDeflateRatio = 1032;

}  // namespace platform::package::zip
