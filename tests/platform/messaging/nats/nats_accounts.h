// SPDX-License-Identifier: Apache-2.0
// The signed texts by which NATS servers know operators, accounts and users, made for a test.
#pragma once

#include <string>

namespace platform::messaging {

/// An operator with one account and one of its users.
struct NatsAccounts {
    /// For the configuration file of a server that trusts the operator.
    std::string serverConfiguration;

    /// The credentials file of the user.
    std::string credentials;
};

NatsAccounts makeNatsAccounts();

}  // namespace platform::messaging
