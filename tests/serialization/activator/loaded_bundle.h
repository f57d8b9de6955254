// SPDX-License-Identifier: Apache-2.0
// The bundle's file, loaded, and an activator of it, reached as a framework reaches them.
#pragma once

#include <dlfcn.h>

#include <memory>
#include <stdexcept>
#include <string>

#include "cppmicroservices/BundleActivator.h"

namespace test {

/// Loads the library BUNDLE and creates an activator; destroys and unloads them in the end.
class LoadedBundle {
public:
    LoadedBundle() : library_(dlopen(BUNDLE, RTLD_NOW | RTLD_LOCAL)) {
        if (!library_) {
            throw std::runtime_error(dlerror());
        }
        destroyActivator_ = function<void(Activator*)>("_us_destroy_activator_");
        activator_ = {function<Activator*()>("_us_create_activator_")(), destroyActivator_};
    }

    void start() { activator_->Start(cppmicroservices::BundleContext()); }
    void stop() { activator_->Stop(cppmicroservices::BundleContext()); }
    void destroyActivator() { activator_.reset(); }
    void destroyNoActivator() { destroyActivator_(nullptr); }

private:
    using Activator = cppmicroservices::BundleActivator;

    struct Unload {
        void operator()(void* library) const { dlclose(library); }
    };

    template <typename Function>
    Function* function(const std::string& prefix) {
        void* const address =
            dlsym(library_.get(), (prefix + "com_vorplanex_serialization").c_str());
        if (address == nullptr) {
            throw std::runtime_error(dlerror());
        }
        return reinterpret_cast<Function*>(address);
    }

    const std::unique_ptr<void, Unload> library_;
    void (*destroyActivator_)(Activator*) = nullptr;
    std::unique_ptr<Activator, void (*)(Activator*)> activator_{nullptr, nullptr};
};

}  // namespace test
