// SPDX-License-Identifier: Apache-2.0
// The program's standard input and output, read and written without a buffer between.
//
// Results leave through the standard output that the program was started with, and nothing else
// does: the process's own standard output is pointed at standard error, so that no library's output
// gets between the results.
#pragma once

#include <cstddef>
#include <initializer_list>
#include <string_view>
#include <system_error>

#include "platform/posix/file_descriptor.h"

namespace host {

/// The reader of the standard output is gone.
class ReaderGone : public std::system_error {
    using std::system_error::system_error;
};

/// Makes sure that no file opened later takes the place of a standard stream that is closed.
/// Reading or writing such a stream stays an error. Throws std::system_error.
void openMissingStandardStreams();

/// Points descriptor 1 at standard error and returns what it was. Throws std::system_error.
platform::FileDescriptor divertStandardOutput();

/// Writes all `pieces`, one after the other, waiting while `fd` takes nothing more. Throws
/// std::system_error when it cannot, ReaderGone when that is for good; part of the bytes may have
/// been written by then.
void writeAll(int fd, std::initializer_list<std::string_view> pieces);

/// Reads up to `room` bytes to `to`, waiting for the first of them. Returns how many there were;
/// zero means the end of the input. Throws std::system_error.
std::size_t readSome(int fd, char* to, std::size_t room);

}  // namespace host
