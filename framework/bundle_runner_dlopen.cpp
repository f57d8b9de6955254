// SPDX-License-Identifier: Apache-2.0
// BundleRunner without CppMicroServices: dlopen and the three functions that a bundle exports,
//
//   void _us_set_bundle_context_instance_<name>(BundleContextPrivate*)
//   BundleActivator* _us_create_activator_<name>()
//   void _us_destroy_activator_<name>(BundleActivator*)
//
// where <name> is the bundle's symbolic name.

#include <dlfcn.h>

#include <exception>
#include <stdexcept>
#include <string>

#include "cppmicroservices/BundleActivator.h"
#include "framework/bundle_runner.h"

namespace cppmicroservices {

// The bundle only gets its address.
class BundleContextPrivate {};

}  // namespace cppmicroservices

namespace framework {
namespace {

using cppmicroservices::BundleActivator;
using cppmicroservices::BundleContext;
using cppmicroservices::BundleContextPrivate;

using SetContext = void(BundleContextPrivate*);
using CreateActivator = BundleActivator*();
using DestroyActivator = void(BundleActivator*);

struct CloseLibrary {
    void operator()(void* library) const noexcept { dlclose(library); }
};
using Library = std::unique_ptr<void, CloseLibrary>;

// `bundle` is absolute: dlopen would look for a bare name in the system's library folders.
Library openLibrary(const std::filesystem::path& bundle) {
    if (!std::filesystem::exists(bundle)) {
        throw std::runtime_error("no bundle at " + bundle.string());
    }
    Library library(dlopen(bundle.c_str(), RTLD_NOW | RTLD_LOCAL));
    if (!library) {
        throw std::runtime_error(std::string("cannot load bundle ") + dlerror());
    }
    return library;
}

// The name in lib<name>.so.
std::string symbolicName(const std::filesystem::path& bundle) {
    std::string name = bundle.stem().string();
    if (name.starts_with("lib")) {
        name.erase(0, 3);
    }
    return name;
}

template <typename Function>
Function* entryPoint(const Library& library, const std::filesystem::path& bundle,
                     const std::string& prefix) {
    const std::string name = prefix + symbolicName(bundle);
    void* const address = dlsym(library.get(), name.c_str());
    if (address == nullptr) {
        throw std::runtime_error(bundle.string() + " is not a bundle: it has no function " + name);
    }
    return reinterpret_cast<Function*>(address);
}

}  // namespace

// The members are in the order of loading: the activator's code goes away with the library.
class BundleRunner::Implementation {
public:
    explicit Implementation(const std::filesystem::path& bundle)
        : bundle_(bundle),
          library_(openLibrary(bundle)),
          setContext_(entryPoint<SetContext>(library_, bundle, "_us_set_bundle_context_instance_")),
          activator_(nullptr,
                     entryPoint<DestroyActivator>(library_, bundle, "_us_destroy_activator_")) {
        const auto createActivator =
            entryPoint<CreateActivator>(library_, bundle, "_us_create_activator_");
        setContext_(context_.get());
        attempt("start", [&] {
            activator_.reset(createActivator());
            if (!activator_) {
                throw std::runtime_error("it created no activator");
            }
            activator_->Start(BundleContext(context_));
        });
    }

    void stop() {
        if (!activator_) {
            return;
        }
        // However this ends, the activator is destroyed first, and then the context is reset.
        const ContextEnd contextEnd{setContext_};
        const auto activator = std::move(activator_);
        attempt("stop", [&] { activator->Stop(BundleContext(context_)); });
    }

private:
    struct ContextEnd {
        SetContext* setContext;
        ~ContextEnd() { setContext(nullptr); }
    };

    // Runs code of the bundle. Its exceptions are replaced, since their types are unloaded with the
    // library.
    template <typename Call>
    void attempt(const char* what, Call call) const {
        const std::string failure =
            std::string("cannot ") + what + " bundle " + bundle_.string() + ": ";
        try {
            call();
        } catch (const std::exception& error) {
            throw std::runtime_error(failure + error.what());
        } catch (...) {
            throw std::runtime_error(failure + "unknown exception");
        }
    }

    const std::filesystem::path bundle_;
    const Library library_;
    SetContext* const setContext_;
    const std::shared_ptr<BundleContextPrivate> context_ = std::make_shared<BundleContextPrivate>();
    std::unique_ptr<BundleActivator, DestroyActivator*> activator_;
};

BundleRunner::BundleRunner(const std::filesystem::path& bundle)
    : implementation_(std::make_unique<Implementation>(std::filesystem::absolute(bundle))) {}

BundleRunner::~BundleRunner() {
    try {
        stop();
    } catch (const std::exception&) {
        // A caller that wants to know calls stop itself.
    }
}

void BundleRunner::stop() {
    implementation_->stop();
}

}  // namespace framework
