// SPDX-License-Identifier: Apache-2.0
// BundleActivator: the interface through which a framework starts and stops a bundle. Stands in for
// the header of the same name of CppMicroServices 3.8 and has the same binary interface.
#pragma once

#include "cppmicroservices/BundleContext.h"

namespace cppmicroservices {

/// Implemented by a bundle. The order of the virtual functions is part of the binary interface.
struct BundleActivator {
    virtual ~BundleActivator() = default;

    /// Called once the bundle's library is loaded. An exception that leaves it makes the start
    /// fail.
    virtual void Start(BundleContext context) = 0;

    /// Called before the activator is destroyed, when `Start` has succeeded.
    virtual void Stop(BundleContext context) = 0;
};

}  // namespace cppmicroservices
