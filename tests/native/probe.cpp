// Test module: the script binding layer driven from native threads and between environments, an
// audio engine that finds the host module's entry points in the same process, and allocations that
// fail. Asked for sessions, it is a copy of the host module in which these fail, too.
#include <dlfcn.h>
#include <node_api.h>

#include <chrono>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <exception>
#include <mutex>
#include <new>
#include <random>
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

using quorral::node_api::BindFunction;
using quorral::node_api::Callback;
using quorral::node_api::Environment;
using quorral::node_api::InvokeCallback;
using quorral::node_api::NativeValue;
using quorral::node_api::Object;
using quorral::node_api::Value;
using quorral::node_api::WrapCallback;
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
    std::thread([] {
        const std::lock_guard guard(gKeptLock);
        for (const auto& callback : gKept) InvokeCallback<Names>(callback, {"late"});
        gKept.clear();
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
    Environment::Throw("[", TextOf(value), "]");
}

// Counts down to the allocation of this thread that fails; 0 when none is to fail.
thread_local unsigned tFailingAllocation = 0;

// Arms the n-th allocation from now on, n given as text.
void FailAllocation(Value value) {
    tFailingAllocation = static_cast<unsigned>(std::stoul(TextOf(value)));
}

// Throws when the armed allocation has not come yet, and disarms it.
void Disarm() {
    if (std::exchange(tFailingAllocation, 0) != 0) Environment::Throw("not reached");
}

// The whole way of a result: wrapped callback, queued task, delivery.
void Deliver(Callback callback) {
    WrapCallback<Names>(std::move(callback))({"one", "two"});
}

struct EntryPoints {
    ValtoNCSetupFn ncSetup = nullptr;
    ValtoNCProcessFn ncProcess = nullptr;
    ValtoNCResetFn ncReset = nullptr;
    ValtoVADSetupFn vadSetup = nullptr;
    ValtoVADProcessFn vadProcess = nullptr;
    ValtoVADResetFn vadReset = nullptr;
};
EntryPoints gValto;

// Finds the entry points of the loaded module whose path is given.
void Attach(Value path) {
    void* const library = dlopen(TextOf(path).c_str(), RTLD_NOW | RTLD_NOLOAD);
    if (library == nullptr) throw std::runtime_error("the module is not loaded");
    const auto find = [&](const char* name, auto& function) {
        function = reinterpret_cast<std::decay_t<decltype(function)>>(dlsym(library, name));
        if (function == nullptr) throw std::runtime_error(name);
    };
    find("ValtoNCSetup", gValto.ncSetup);
    find("ValtoNCProcess", gValto.ncProcess);
    find("ValtoNCReset", gValto.ncReset);
    find("ValtoVADSetup", gValto.vadSetup);
    find("ValtoVADProcess", gValto.vadProcess);
    find("ValtoVADReset", gValto.vadReset);
}

constexpr int kRateHz = 48000;
constexpr unsigned kFrame = kRateHz / 100;

// Cleans six seconds of noise on the engine's thread; answers "set up" as soon as the sessions are
// open, then with a digest of all that came out and by how many dB the noise went down.
void Clean(Callback callback) {
    std::thread([answer = WrapCallback<Names>(std::move(callback))] {
        void* const cleaner = gValto.ncSetup(kRateHz, 10);
        void* const detector = gValto.vadSetup(kRateHz, 10);
        answer({"set up"});
        std::mt19937 random(7);
        std::size_t digest = 0;
        double before = 0;
        double after = 1e-9;
        for (int n = 0; n < 600; ++n) {
            std::vector<std::int16_t> frame(kFrame);
            for (auto& sample : frame) {
                sample = static_cast<std::int16_t>(static_cast<int>(random() % 6000) - 3000);
                if (n > 200) before += sample * sample;
            }
            const float score = gValto.vadProcess(detector, frame.data(), kFrame);
            if (gValto.ncProcess(cleaner, frame.data(), kFrame, frame.data(), kFrame) != 0) return;
            digest = digest * 31 + std::hash<float>()(score);
            for (const auto sample : frame) {
                digest = digest * 31 + static_cast<std::uint16_t>(sample);
                if (n > 200) after += sample * sample;
            }
        }
        if (gValto.ncReset(cleaner) != 0 || gValto.vadReset(detector) != 0) return;
        answer({std::to_string(digest), std::to_string(10 * std::log10(before / after))});
    }).detach();
}

// Threads that open, feed and close sessions until the process is gone.
void RunForever() {
    std::thread([] {
        std::vector<std::int16_t> frame(kFrame);
        void* const session = gValto.ncSetup(kRateHz, 10);
        for (unsigned n = 0;; ++n) {
            for (auto& sample : frame) sample = static_cast<std::int16_t>(n++ * 7919U);
            gValto.ncProcess(session, frame.data(), kFrame, frame.data(), kFrame);
        }
    }).detach();
    std::thread([] {
        std::vector<std::int16_t> frame(kFrame);
        for (;;) {
            void* const session = gValto.vadSetup(kRateHz, 10);
            gValto.vadProcess(session, frame.data(), kFrame);
            gValto.vadReset(session);
        }
    }).detach();
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
        BindFunction(target, "attach", Attach);
        BindFunction(target, "clean", Clean);
        BindFunction(target, "runForever", RunForever);
    } catch (const std::exception& failure) {
        napi_throw_error(env, nullptr, failure.what());
    }
    return exports;
}
