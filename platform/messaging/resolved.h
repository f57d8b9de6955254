// SPDX-License-Identifier: Apache-2.0
// Futures of operations that are done when they return.
#pragma once

#include <exception>
#include <type_traits>

#include "futures/future.h"

namespace platform::messaging {

/// The resolved future of what `make` returns or throws.
template <typename Make>
auto resolved(Make&& make) {
    using Result = std::invoke_result_t<Make>;
    futures::Promise<Result> promise;
    try {
        if constexpr (std::is_void_v<Result>) {
            make();
            promise.setValue();
        } else {
            promise.setValue(make());
        }
    } catch (...) {
        promise.setException(std::current_exception());
    }
    return promise.getFuture();
}

}  // namespace platform::messaging
