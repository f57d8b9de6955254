// SPDX-License-Identifier: Apache-2.0
// The entry points that tests cannot reach in the bundle's file: linked into the test program
// itself.

#include <gtest/gtest.h>

#include <cstddef>

#include "cppmicroservices/BundleActivator.h"

extern "C" {
void _us_set_bundle_context_instance_com_vorplanex_serialization(
    cppmicroservices::BundleContextPrivate* context);
cppmicroservices::BundleContextPrivate*
_us_get_bundle_context_instance_com_vorplanex_serialization();
}

namespace {

TEST(BundleContextInstance, IsWhatTheHostHasSet) {
    ASSERT_EQ(_us_get_bundle_context_instance_com_vorplanex_serialization(), nullptr);

    std::byte contextOfTheHost{};
    auto* const context =
        reinterpret_cast<cppmicroservices::BundleContextPrivate*>(&contextOfTheHost);
    _us_set_bundle_context_instance_com_vorplanex_serialization(context);
    EXPECT_EQ(_us_get_bundle_context_instance_com_vorplanex_serialization(), context);

    _us_set_bundle_context_instance_com_vorplanex_serialization(nullptr);
    EXPECT_EQ(_us_get_bundle_context_instance_com_vorplanex_serialization(), nullptr);
}

}  // namespace
