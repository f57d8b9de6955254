// SPDX-License-Identifier: Apache-2.0
// BundleRunner on CppMicroServices: a framework of its own for each bundle.

#include <cppmicroservices/Bundle.h>
#include <cppmicroservices/BundleContext.h>
#include <cppmicroservices/Framework.h>
#include <cppmicroservices/FrameworkEvent.h>
#include <cppmicroservices/FrameworkFactory.h>

#include <chrono>
#include <exception>
#include <new>
#include <stdexcept>
#include <string>
#include <vector>

#include "framework/bundle_runner.h"

namespace framework {
namespace {

class RunningFramework {
public:
    RunningFramework() : framework_(cppmicroservices::FrameworkFactory().NewFramework()) {
        framework_.Start();
    }

    RunningFramework(const RunningFramework&) = delete;
    RunningFramework& operator=(const RunningFramework&) = delete;

    /// Also stops the bundles that still run.
    ~RunningFramework() {
        try {
            framework_.Stop();
            framework_.WaitForStop(std::chrono::milliseconds::zero());  // however long it takes
        } catch (const std::exception&) {
            // It stops on a thread of its own, which the system may refuse; its destructor would
            // try again and, failing, end the process. So it stays until the process ends by
            // itself.
            static_cast<void>(new (std::nothrow) cppmicroservices::Framework(framework_));
        }
    }

    cppmicroservices::Bundle install(const std::filesystem::path& bundle) {
        const std::vector<cppmicroservices::Bundle> installed =
            framework_.GetBundleContext().InstallBundles(bundle.string());
        if (installed.size() != 1) {
            throw std::runtime_error("it holds " + std::to_string(installed.size()) + " bundles");
        }
        return installed.front();
    }

private:
    cppmicroservices::Framework framework_;
};

}  // namespace

class BundleRunner::Implementation {
public:
    explicit Implementation(const std::filesystem::path& bundle) : path_(bundle) {
        if (!std::filesystem::exists(bundle)) {
            throw std::runtime_error("no bundle at " + bundle.string());
        }
        attempt("load", [&] { bundle_ = framework_.install(bundle); });
        attempt("start", [&] { bundle_.Start(); });
    }

    void stop() {
        attempt("stop", [&] { bundle_.Stop(); });
    }

private:
    template <typename Call>
    void attempt(const char* what, Call call) const {
        try {
            call();
        } catch (const std::exception& error) {
            throw std::runtime_error(std::string("cannot ") + what + " bundle " + path_.string() +
                                     ": " + error.what());
        }
    }

    const std::filesystem::path path_;
    RunningFramework framework_;
    cppmicroservices::Bundle bundle_;
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
