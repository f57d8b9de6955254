// SPDX-License-Identifier: Apache-2.0
// Adds the subject to error texts.
#pragma once

#include <stdexcept>
#include <string>

#include "platform/text/quoted.h"

namespace platform::package {

using text::quoted;

/// Does `work`, and puts `subject` before the text of a std::runtime_error that it throws.
template <class Work>
auto about(const std::string& subject, Work work) {
    try {
        return work();
    } catch (const std::runtime_error& error) {
        throw std::runtime_error(subject + " " + error.what());
    }
}

}  // namespace platform::package
