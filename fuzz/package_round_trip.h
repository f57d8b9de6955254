// SPDX-License-Identifier: Apache-2.0
// What the package fuzz targets do with the bytes of an archive.
#pragma once

#include <cstdint>
#include <span>

namespace fuzzing {

/// Reads `archive` as a package, which may fail with a std::runtime_error only. What can be read
/// and written must read back the same; aborts if it does not.
void readAndWriteBack(std::span<const char> archive);

}  // namespace fuzzing
