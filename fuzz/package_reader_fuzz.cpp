// SPDX-License-Identifier: Apache-2.0
// Reads any bytes as a document package.
#include <cstddef>
#include <cstdint>

#include "package_round_trip.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    fuzzing::readAndWriteBack({reinterpret_cast<const char*>(data), size});
    return 0;
}
