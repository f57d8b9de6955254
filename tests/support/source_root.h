// SPDX-License-Identifier: Apache-2.0
// Where the project's own files are, for tests that read them.
#pragma once

#include <string>

namespace test {

/// The folder of the checkout that the tests were built from.
const std::string& sourceRoot();

}  // namespace test
