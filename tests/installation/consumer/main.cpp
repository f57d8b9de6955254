// SPDX-License-Identifier: Apache-2.0
// A host that has nothing but the installed files: sets up the message service and loads the
// bundle.

#include <dlfcn.h>

#include <iostream>
#include <memory>

#include "platform/messaging/in_process_bus.h"
#include "platform/messaging/transport.h"

namespace messaging = platform::messaging;

int main() {
    const auto bus = messaging::InProcessBus::create();
    messaging::setTransport(
        [&](const std::string& clientName, const messaging::MessageServiceOptions&) {
            return bus->connect(clientName);
        });
    if (!messaging::createMessageService("consumer", {}).get()) {
        std::cerr << "no client\n";
        return 1;
    }

    void* const bundle = dlopen(BUNDLE, RTLD_NOW | RTLD_LOCAL);
    if (bundle == nullptr) {
        std::cerr << dlerror() << '\n';
        return 1;
    }
    if (dlsym(bundle, "_us_create_activator_com_vorplanex_serialization") == nullptr) {
        std::cerr << dlerror() << '\n';
        return 1;
    }
}
