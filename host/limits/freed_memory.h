// SPDX-License-Identifier: Apache-2.0
// What becomes of the memory that requests give back.
#pragma once

#include <cstddef>

namespace host {

/// What a thread that answers requests keeps at most.
inline constexpr std::size_t keptMemory = std::size_t{32} << 20U;

/// Has the C library keep freed memory for the requests to come, about `keptMemory` for each thread
/// that answers them. By default it returns most of it to the system, which then has to find and
/// clear every page anew; that takes about as long as all the rest of reading a document. To be
/// called before there are other threads.
void keepFreedMemory();

/// Gives all freed memory back to the system, also what is kept for the requests to come. Takes
/// time in proportion to the pages that are given back.
void returnFreedMemory();

}  // namespace host
