// SPDX-License-Identifier: Apache-2.0
// BundleContext: what the framework gives a bundle at start and stop. Stands in for the header of
// the same name of CppMicroServices 3.8, of which it has what our bundle and loader use.
#pragma once

#include <memory>
#include <utility>

namespace cppmicroservices {

class BundleContextPrivate;

/// A bundle's access to its framework: one shared pointer and nothing else. The size and the way in
/// which it is passed (by the address of a temporary of the caller's) are part of the binary
/// interface.
class BundleContext {
public:
    /// A context without a framework.
    BundleContext() = default;

    explicit BundleContext(std::shared_ptr<BundleContextPrivate> context) : d(std::move(context)) {}

    /// Whether the context belongs to a framework.
    explicit operator bool() const { return d != nullptr; }

private:
    std::shared_ptr<BundleContextPrivate> d;
};

static_assert(sizeof(BundleContext) == 2 * sizeof(void*));

}  // namespace cppmicroservices
