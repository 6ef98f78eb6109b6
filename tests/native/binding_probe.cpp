// Test module: the script binding layer driven from native threads and between environments, and
// with allocations that fail.
#include <node_api.h>

#include <chrono>
#include <cstddef>
#include <exception>
#include <mutex>
#include <new>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "native/node_api/environment.h"
#include "native/node_api/native_value.h"
#include "native/node_api/trampoline.h"

namespace {

using quorral::node_api::BindFunction;
using quorral::node_api::Callback;
using quorral::node_api::Environment;
using quorral::node_api::InvokeCallback;
using quorral::node_api::NativeValue;
using quorral::node_api::Object;
using quorral::node_api::Value;
using quorral::node_api::WrapCallback;
using Names = std::vector<std::string>;

constexpr int kDeliveries = 100;
constexpr int kThreads = 4;

// Calls back kDeliveries times from each of several threads with [thread, count].
void DeliverFromThreads(Callback callback) {
    for (int thread = 0; thread < kThreads; ++thread) {
        std::thread([deliver = WrapCallback<Names>(callback), thread] {
            for (int i = 0; i < kDeliveries; ++i) {
                deliver({std::to_string(thread), std::to_string(i)});
            }
        }).detach();
    }
}

// The last copy of the callback dies on another thread.
void DropOnThread(Callback callback) {
    std::thread([held = std::move(callback)]() mutable {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
        held = Callback();
    }).detach();
}

// A thread that goes on calling back until the process ends.
void DeliverForever(Callback callback) {
    std::thread([held = std::move(callback)] {
        for (;;) {
            InvokeCallback<Names>(held, {"again"});
            std::this_thread::sleep_for(std::chrono::microseconds(50));
        }
    }).detach();
}

// Callbacks kept beyond their environment, to be called and dropped from another one.
std::mutex gKeptLock;
std::vector<Callback> gKept;

void Keep(Callback callback) {
    const std::lock_guard guard(gKeptLock);
    gKept.push_back(std::move(callback));
}

void CallAndDropKept() {
    std::vector<Callback> kept;
    {
        const std::lock_guard guard(gKeptLock);
        kept.swap(gKept);
    }
    std::thread([kept = std::move(kept)]() mutable {
        for (const auto& callback : kept) InvokeCallback<Names>(callback, {"late"});
        kept.clear();
    }).join();
}

void ThrowTwice() {
    Environment::Throw("first ", 1);
    Environment::Throw("second ", 2);
}

void ThrowNative() {
    throw std::runtime_error("native failure");
}

// Answers with the number of environment records in the process.
void CountEnvironments(Callback callback) {
    InvokeCallback<Names>(callback, {std::to_string(Environment::LiveCount())});
}

// Throws the text that came in, between brackets: the round trip of a string.
void Echo(Value value) {
    const auto text = NativeValue<std::string>::Get(value);
    Environment::Throw("[", text.value_or("not a string"), "]");
}

// Counts down to the allocation of this thread that fails; 0 when none is to fail.
thread_local unsigned tFailingAllocation = 0;

// Arms the n-th allocation from now on, n given as text.
void FailAllocation(Value value) {
    const auto count = NativeValue<std::string>::Get(value);
    tFailingAllocation = count ? static_cast<unsigned>(std::stoul(*count)) : 0;
}

// Throws when the armed allocation has not come yet, and disarms it.
void Disarm() {
    const bool waiting = tFailingAllocation != 0;
    tFailingAllocation = 0;
    if (waiting) Environment::Throw("not reached");
}

// The whole way of a result: wrapped callback, queued task, delivery.
void Deliver(Callback callback) {
    WrapCallback<Names>(std::move(callback))({"one", "two"});
}

}  // namespace

// Every allocation of this module's own code comes through here: linked with --wrap=_Znwm, the name
// of operator new for the linker.
extern "C" {
void* __real__Znwm(std::size_t size);
void* __wrap__Znwm(std::size_t size);
}
void* __wrap__Znwm(std::size_t size) {
    if (tFailingAllocation != 0 && --tFailingAllocation == 0) throw std::bad_alloc();
    return __real__Znwm(size);
}

NAPI_MODULE_INIT() {
    try {
        Environment::Initialize(env);
        const Object target(exports);
        BindFunction(target, "deliverFromThreads", DeliverFromThreads);
        BindFunction(target, "dropOnThread", DropOnThread);
        BindFunction(target, "deliverForever", DeliverForever);
        BindFunction(target, "keep", Keep);
        BindFunction(target, "callAndDropKept", CallAndDropKept);
        BindFunction(target, "throwTwice", ThrowTwice);
        BindFunction(target, "throwNative", ThrowNative);
        BindFunction(target, "countEnvironments", CountEnvironments);
        BindFunction(target, "echo", Echo);
        BindFunction(target, "failAllocation", FailAllocation);
        BindFunction(target, "disarm", Disarm);
        BindFunction(target, "deliver", Deliver);
    } catch (const std::exception& failure) {
        napi_throw_error(env, nullptr, failure.what());
    }
    return exports;
}
