// SPDX-License-Identifier: Apache-2.0
// What happens to the memory that requests free.
#pragma once

#include <cstddef>

namespace host {

/// The most that a thread that answers requests keeps.
inline constexpr std::size_t keptMemory = std::size_t{32} << 20U;

/// Makes the C library keep freed memory for later requests, about `keptMemory` for each thread
/// that answers them. By default it returns most of it to the system, which then has to find and
/// clear every page again: about as long as the rest of reading a document takes. Must be called
/// before there are other threads.
void keepFreedMemory();

/// Gives all freed memory back to the system, including what is kept for later requests. Takes time
/// in proportion to the pages that are given back.
void returnFreedMemory();

}  // namespace host
