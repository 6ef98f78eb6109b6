// Test module: the script binding layer driven from native threads and between environments, an
// audio engine that finds the host module's entry points in the same process, and allocations that
// fail. Asked for sessions, it is a copy of the host module in which these fail, too.
#include <dlfcn.h>
#include <node_api.h>

#include <cstddef>
#include <cstdint>
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
#include "native_modules/quorral_valto/include/quorral_valto.h"
#include "native_modules/quorral_valto/src/bindings/sessions.h"

namespace {

using namespace quorral::node_api;
using Names = std::vector<std::string>;

std::string TextOf(const Value& value) {
    return NativeValue<std::string>::Get(value).value_or("not a string");
}

// Calls back 100 times from each of 4 threads with [thread, count].
void DeliverFromThreads(Callback callback) {
    for (int thread = 0; thread < 4; ++thread) {
        std::thread([deliver = WrapCallback<Names>(callback), thread] {
            for (int i = 0; i < 100; ++i) deliver({std::to_string(thread), std::to_string(i)});
        }).detach();
    }
}

// Callbacks to be called and dropped on another thread, perhaps beyond their environment.
std::mutex gKeptLock;
std::vector<Callback> gKept;

void Keep(Callback callback) {
    const std::lock_guard guard(gKeptLock);
    gKept.push_back(std::move(callback));
}

void CallAndDropKept() {
    std::thread([] {
        const std::lock_guard guard(gKeptLock);
        for (const auto& callback : gKept) InvokeCallback<Names>(callback, {"late"});
        gKept.clear();
    }).join();
}

// Answers with the number of environment records in the process.
void CountEnvironments(Callback callback) {
    InvokeCallback<Names>(callback, {std::to_string(Environment::LiveCount())});
}

// Throws the text that came in, between brackets: the round trip of a string. The first error wins.
void Echo(Value value) {
    Environment::Throw("[", TextOf(value), "]");
    Environment::Throw("second ", 2);
}

// Counts down to the allocation of this thread that fails; 0 when none is to fail.
thread_local unsigned tFailingAllocation = 0;

// Arms the n-th allocation from now on, n given as text; throws when the one before has not come.
void FailAllocation(Value value) {
    const unsigned next = static_cast<unsigned>(std::stoul(TextOf(value)));
    if (std::exchange(tFailingAllocation, next) != 0) Environment::Throw("not reached");
}

// The whole way of a result: wrapped callback, queued task, delivery.
void Deliver(Callback callback) {
    WrapCallback<Names>(std::move(callback))({"one", "two"});
}

void* gModule = nullptr;

template <class F>
F Find(const char* name) {
    return reinterpret_cast<F>(dlsym(gModule, name));
}

// An audio engine's threads: each feeds a cleaning session and opens, feeds and closes voice
// sessions, until the process is gone. The path is that of the host module, which is loaded
// already.
void RunForever(Value path) {
    gModule = dlopen(TextOf(path).c_str(), RTLD_NOW | RTLD_NOLOAD);
    if (gModule == nullptr) throw std::runtime_error("the module is not loaded");
    for (int thread = 0; thread < 2; ++thread) {
        std::thread([] {
            constexpr unsigned kFrame = 480;
            std::vector<std::int16_t> frame(kFrame);
            void* const cleaner = Find<ValtoNCSetupFn>("ValtoNCSetup")(48000, 10);
            for (unsigned n = 0;; ++n) {
                for (auto& sample : frame) sample = static_cast<std::int16_t>(n++ * 7919U);
                Find<ValtoNCProcessFn>("ValtoNCProcess")(cleaner, frame.data(), kFrame,
                                                         frame.data(), kFrame);
                void* const detector = Find<ValtoVADSetupFn>("ValtoVADSetup")(48000, 10);
                Find<ValtoVADProcessFn>("ValtoVADProcess")(detector, frame.data(), kFrame);
                Find<ValtoVADResetFn>("ValtoVADReset")(detector);
            }
        }).detach();
    }
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
        if (const napi_value sessions = quorral::RequestedSessions(env, exports)) {
            quorral::InstallSessions(env, sessions);
            return exports;
        }
        Environment::Initialize(env);
        const Object target(exports);
        BindFunction(target, "deliverFromThreads", DeliverFromThreads);
        BindFunction(target, "keep", Keep);
        BindFunction(target, "callAndDropKept", CallAndDropKept);
        BindFunction(target, "countEnvironments", CountEnvironments);
        BindFunction(target, "echo", Echo);
        BindFunction(target, "failAllocation", FailAllocation);
        BindFunction(target, "deliver", Deliver);
        BindFunction(target, "runForever", RunForever);
    } catch (const std::exception& failure) {
        napi_throw_error(env, nullptr, failure.what());
    }
    return exports;
}
