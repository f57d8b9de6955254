// SPDX-License-Identifier: Apache-2.0
// The activator, and the functions through which the host's framework reaches it. The bundle
// exports nothing else; the suffix of their names is the bundle's symbolic name.

#include <atomic>
#include <memory>

#include "cppmicroservices/BundleActivator.h"
#include "serialization/serialization.h"

namespace {

using cppmicroservices::BundleActivator;
using cppmicroservices::BundleContext;
using cppmicroservices::BundleContextPrivate;

class Activator final : public BundleActivator {
public:
    /// Makes the service object, which connects itself to the message service. A service object of
    /// an earlier start is destroyed when the new one exists, and stays when making the new one
    /// fails.
    void Start(BundleContext) override {
        service_ = std::make_unique<EditorServices::Serialization>();
    }

    /// The service object keeps working until the activator is destroyed.
    void Stop(BundleContext) override {
        if (service_) {
            service_->stop();
        }
    }

private:
    std::unique_ptr<EditorServices::Serialization> service_;
};

std::atomic<BundleContextPrivate*> bundleContextInstance{nullptr};

}  // namespace

extern "C" {

[[gnu::visibility("default")]] void _us_set_bundle_context_instance_com_vorplanex_serialization(
    BundleContextPrivate* context) {
    // Sequentially consistent, so a full memory fence comes with it.
    bundleContextInstance.store(context);
}

BundleContextPrivate* _us_get_bundle_context_instance_com_vorplanex_serialization() {
    return bundleContextInstance.load();
}

[[gnu::visibility("default")]] BundleActivator* _us_create_activator_com_vorplanex_serialization() {
    return std::make_unique<Activator>().release();
}

[[gnu::visibility("default")]] void _us_destroy_activator_com_vorplanex_serialization(
    BundleActivator* activator) {
    delete activator;
}

}  // extern "C"
