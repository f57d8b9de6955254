// SPDX-License-Identifier: Apache-2.0
#include "tests/framework/sample_bundle_control.h"

namespace sample {

Control& control() {
    static Control instance;
    return instance;
}

}  // namespace sample
