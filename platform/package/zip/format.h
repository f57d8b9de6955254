// SPDX-License-Identifier: Apache-2.0
// The zip format, as far as packages use it. All numbers are little-endian.
//
//   archive          = { local header, data [, data descriptor] } directory
//                      [ZIP64 end record, ZIP64 locator] end record
//
//   local header     0 signature      4 version needed  6 flags         8 method
//                   10 time          12 date           14 CRC-32       18 compressed size
//                   22 size          26 name length    28 extra length 30 name, extra
//
//   directory entry  0 signature      4 version made by 6 version needed 8 flags
//                   10 method        12 time           14 date         16 CRC-32
//                   20 compressed    24 size           28 name length  30 extra length
//                   32 comment len.  34 disk           36 attributes (2 + 4 bytes)
//                   42 offset of the local header      46 name, extra, comment
//
//   end record       0 signature      4 this disk       6 directory's disk
//                    8 entries here  10 entries        12 directory size
//                   16 directory offset                20 comment length, comment
//
//   ZIP64 locator    0 signature      4 disk            8 offset of the ZIP64 end record
//   ZIP64 end record 0 signature     24 entries here   32 entries      40 directory size
//                   48 directory offset
//
// Numbers that do not fit their field are all ones, and stand in the ZIP64 records or in the
// entry's extra field 1, which holds, of size, compressed size and offset, those that did not fit.
#pragma once

#include <cstddef>
#include <cstdint>

namespace platform::package::zip {

constexpr std::uint32_t localSignature = 0x04034B50;
constexpr std::uint32_t directorySignature = 0x02014B50;
constexpr std::uint32_t endSignature = 0x06054B50;
constexpr std::uint32_t zip64LocatorSignature = 0x07064B50;
constexpr std::uint32_t zip64EndSignature = 0x06064B50;

constexpr std::size_t localHeaderSize = 30;
constexpr std::size_t directoryEntrySize = 46;
constexpr std::size_t endSize = 22;
constexpr std::size_t zip64LocatorSize = 20;
constexpr std::size_t zip64EndSize = 56;

constexpr std::uint16_t methodStored = 0;
constexpr std::uint16_t methodDeflated = 8;

constexpr std::uint16_t encryptedFlag = 1U << 0U;
constexpr std::uint16_t strongEncryptionFlag = 1U << 6U;
constexpr std::uint16_t utf8Flag = 1U << 11U;
constexpr std::uint16_t maskedDirectoryFlag = 1U << 13U;

constexpr std::uint16_t notIn16Bits = 0xFFFF;
constexpr std::uint32_t notIn32Bits = 0xFFFFFFFF;

constexpr std::uint16_t zip64Extra = 0x0001;
constexpr std::uint16_t unicodePathExtra = 0x7075;

}  // namespace platform::package::zip
