// SPDX-License-Identifier: Apache-2.0
// The way in which a bundle fails to run.
#pragma once

#include <filesystem>
#include <stdexcept>
#include <string>

#include "framework/bundle_runner.h"

namespace framework {

/// The text of the std::runtime_error that a BundleRunner of `bundle` throws.
inline std::string failureOf(const std::filesystem::path& bundle) {
    try {
        const BundleRunner runner(bundle);
    } catch (const std::runtime_error& error) {
        return error.what();
    }
    return "(the bundle runs)";
}

}  // namespace framework
