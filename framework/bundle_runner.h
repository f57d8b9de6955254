// SPDX-License-Identifier: Apache-2.0
// BundleRunner: loads one bundle, starts it and stops it again. A build with CppMicroServices runs
// the bundle in that framework, one without it in the loader of this folder.
#pragma once

#include <filesystem>
#include <memory>

namespace framework {

/// A bundle that is loaded and started. Belongs to one thread at a time.
///
/// The loader of this folder takes the bundle's symbolic name from its file's name, lib<name>.so;
/// CppMicroServices takes it from the manifest inside the file.
class BundleRunner {
public:
    /// Loads the shared library `bundle`, creates its activator and starts it. A relative path is
    /// relative to the working folder. When this returns, the bundle's Start has returned; what it
    /// began on other threads may still be running. Throws std::runtime_error naming the file when
    /// there is no such file, when it is not a loadable library or not a bundle, when it creates no
    /// activator, and when its start fails (with the text of that failure); an activator that was
    /// created is destroyed then.
    explicit BundleRunner(const std::filesystem::path& bundle);

    BundleRunner(const BundleRunner&) = delete;
    BundleRunner& operator=(const BundleRunner&) = delete;

    /// Does what `stop` does, dropping its failures. The loader of this folder also unloads the
    /// library; CppMicroServices keeps it until the process ends.
    ~BundleRunner();

    /// Stops the bundle and destroys its activator, and with it the bundle's subscriptions. Does
    /// nothing the second time. Throws std::runtime_error naming the bundle when its Stop throws;
    /// the activator is destroyed anyway.
    void stop();

private:
    class Implementation;
    std::unique_ptr<Implementation> implementation_;
};

}  // namespace framework
