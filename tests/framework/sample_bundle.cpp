// SPDX-License-Identifier: Apache-2.0
// A bundle that does what its control says and records what is done with it.

#include <exception>
#include <memory>

#include "cppmicroservices/BundleActivator.h"
#include "tests/framework/sample_bundle_control.h"

namespace {

using cppmicroservices::BundleActivator;
using cppmicroservices::BundleContext;
using cppmicroservices::BundleContextPrivate;
using sample::Behaviour;
using sample::control;

// Its code and its text are gone once the bundle is unloaded.
class SampleFailure : public std::exception {
public:
    const char* what() const noexcept override { return "the sample bundle does not feel like it"; }
};

void behave(Behaviour behaviour) {
    if (behaviour == Behaviour::throwException) {
        throw SampleFailure();
    }
    if (behaviour == Behaviour::throwNumber) {
        throw 42;
    }
}

class SampleActivator final : public BundleActivator {
public:
    ~SampleActivator() override { control().events.emplace_back("destroy"); }

    void Start(BundleContext context) override {
        control().events.emplace_back(context ? "start" : "start without a context");
        behave(control().start);
    }

    void Stop(BundleContext context) override {
        control().events.emplace_back(context ? "stop" : "stop without a context");
        behave(control().stop);
    }
};

}  // namespace

extern "C" {

[[gnu::visibility("default")]] void _us_set_bundle_context_instance_sample_bundle(
    BundleContextPrivate* context) {
    control().events.emplace_back(context != nullptr ? "set context" : "clear context");
}

[[gnu::visibility("default")]] BundleActivator* _us_create_activator_sample_bundle() {
    control().events.emplace_back("create");
    return control().create == Behaviour::createNothing
               ? nullptr
               : std::make_unique<SampleActivator>().release();
}

[[gnu::visibility("default")]] void _us_destroy_activator_sample_bundle(
    BundleActivator* activator) {
    delete activator;
}

}  // extern "C"
