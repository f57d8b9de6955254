// SPDX-License-Identifier: Apache-2.0
#include "tests/support/source_root.h"

namespace test {

const std::string& sourceRoot() {
    static const std::string root = PROJECT_SOURCE_ROOT;
    return root;
}

}  // namespace test
