// SPDX-License-Identifier: Apache-2.0
// Lets tests see every system call that a piece of work makes, and fail or interrupt any of them.
#pragma once

#include <functional>
#include <vector>

namespace test {

/// Whether this system lets a process supervise its own system calls.
bool canSupervise();

/// Does `work` in a thread of its own. Before each of its system calls but those for memory and
/// locking, `decide` is called in the calling thread with the call's number and the count of calls
/// before it: a positive result is the errno with which the call fails without being made, zero
/// lets it be made. `work` must not throw.
void supervise(const std::function<void()>& work,
               const std::function<int(int call, int index)>& decide);

/// The numbers of the system calls that `work` makes.
std::vector<int> callsOf(const std::function<void()>& work);

}  // namespace test
