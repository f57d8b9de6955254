// SPDX-License-Identifier: Apache-2.0
// Futures beside those of the standard library and Boost: one made, resolved and read, and one with
// a continuation. std::future has no continuations. Names are "<what>/<who>".
#define BOOST_THREAD_VERSION 4
#include <benchmark/benchmark.h>

#include <boost/thread/future.hpp>
#include <future>
#include <utility>

#include "futures/future.h"

namespace {

void getOurs(benchmark::State& state) {
    for (auto _ : state) {
        futures::Promise<int> promise;
        futures::Future<int> future = promise.getFuture();
        promise.setValue(1);
        benchmark::DoNotOptimize(future.get());
    }
}

template <typename Promise>
void getPeer(benchmark::State& state) {
    for (auto _ : state) {
        Promise promise;
        auto future = promise.get_future();
        promise.set_value(1);
        benchmark::DoNotOptimize(future.get());
    }
}

void thenOurs(benchmark::State& state) {
    for (auto _ : state) {
        futures::Promise<int> promise;
        futures::Future<int> result = promise.getFuture().then(
            [](futures::Future<int> resolved) { return resolved.get() + 1; });
        promise.setValue(1);
        benchmark::DoNotOptimize(result.get());
    }
}

/// Runs the continuation on the thread that resolves the promise, as ours.
void thenBoost(benchmark::State& state) {
    for (auto _ : state) {
        boost::promise<int> promise;
        auto result = promise.get_future().then(
            boost::launch::sync, [](boost::future<int> resolved) { return resolved.get() + 1; });
        promise.set_value(1);
        benchmark::DoNotOptimize(result.get());
    }
}

BENCHMARK(getOurs)->Name("futures: create, set, get/ours");
BENCHMARK(getPeer<std::promise<int>>)->Name("futures: create, set, get/std::promise");
BENCHMARK(getPeer<boost::promise<int>>)->Name("futures: create, set, get/boost::promise");
BENCHMARK(thenOurs)->Name("futures: then/ours");
BENCHMARK(thenBoost)->Name("futures: then/boost::promise");

}  // namespace
