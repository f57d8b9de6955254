// SPDX-License-Identifier: Apache-2.0
// What the sample bundle is to do and what it has done: shared between the tests and the bundle,
// which exports nothing but its entry points.
#pragma once

#include <string>
#include <vector>

namespace sample {

enum class Behaviour {
    succeed,
    createNothing,
    throwException,
    throwNumber,
};

struct Control {
    Behaviour create = Behaviour::succeed;
    Behaviour start = Behaviour::succeed;
    Behaviour stop = Behaviour::succeed;
    std::vector<std::string> events;
};

/// The one instance in the process.
[[gnu::visibility("default")]] Control& control();

}  // namespace sample
