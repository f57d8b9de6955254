// SPDX-License-Identifier: Apache-2.0
// The inner loops over the bytes of strings in JSON text: finding a string's end, taking its
// escapes out and putting them in.
//
// Each loop exists once for every set of instructions that it can use; all give the same results.
// No loop reads or writes outside the ranges that it is given.
#pragma once

#include <cstddef>
#include <span>

namespace json::detail {

/// A string of JSON text, from after its opening quote.
struct StringExtent {
    const char* end;      // the closing quote, or the end of the text when there is none
    std::size_t escapes;  // backslashes that begin an escape
};

/// How far a copying loop has come.
struct Copied {
    const char* in;  // one past the last byte that was read
    char* out;       // one past the last byte that was written
};

struct StringKernels {
    const char* name;

    /// Finds the end of the string that begins at `in`. Does not check whether the escapes are
    /// valid.
    StringExtent (*measure)(const char* in, const char* end);

    /// Copies string content up to `end`, with each escape of two characters replaced by what it
    /// stands for. Stops before the backslash of an escape that is none of those, "\u" among them,
    /// or that `end` cuts off. `out` up to `outEnd` has room for the content without the
    /// backslashes that begin its escapes; what follows the result up to `outEnd` may be
    /// overwritten.
    Copied (*unescape)(const char* in, const char* end, char* out, char* outEnd);

    /// Copies bytes up to `end`, with an escape in place of each that cannot be in a string of JSON
    /// text as it stands. Stops earlier when fewer than `maxEscapeLength` bytes are left before
    /// `outEnd`. What follows the result up to `outEnd` may be overwritten.
    Copied (*escape)(const char* in, const char* end, char* out, char* outEnd);

    /// The number of bytes up to `end` that cannot be in a string of JSON text as they stand.
    std::size_t (*countEscapes)(const char* in, const char* end);
};

/// The length of the longest escape that `escape` writes, as "\u001f" is.
constexpr std::ptrdiff_t maxEscapeLength = 6;

/// The fastest kernels that this machine can run.
const StringKernels& stringKernels();

/// All kernels that this machine can run; the first need no instructions that are not everywhere.
std::span<const StringKernels* const> runnableStringKernels();

}  // namespace json::detail
