// Test module: a native audio engine that finds the host module's entry points in the same process
// and pushes frames through them on a thread of its own.
#include <dlfcn.h>
#include <node_api.h>

#include <array>
#include <atomic>
#include <cstdint>
#include <cstring>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "native_modules/quorral_valto/include/quorral_valto.h"

namespace {

struct EntryPoints {
    ValtoNCSetupFn ncSetup = nullptr;
    ValtoNCProcessFn ncProcess = nullptr;
    ValtoNCResetFn ncReset = nullptr;
    ValtoVADSetupFn vadSetup = nullptr;
    ValtoVADProcessFn vadProcess = nullptr;
    ValtoVADResetFn vadReset = nullptr;
};

EntryPoints gValto;

// What a copy of the module with failing allocations has in addition; null in the module itself.
struct AllocationControl {
    void (*fail)(unsigned) = nullptr;
    int (*isPending)() = nullptr;
    long (*held)() = nullptr;
    void (*forgetEngine)() = nullptr;
};

AllocationControl gAllocations;

template <class F>
void FindOptional(void* library, const char* name, F& function) {
    function = reinterpret_cast<F>(dlsym(library, name));
}

template <class F>
void Find(void* library, const char* name, F& function) {
    FindOptional(library, name, function);
    if (function == nullptr) throw std::runtime_error(std::string("no symbol ") + name);
}

void FindAll(const std::string& path) {
    void* const library = dlopen(path.c_str(), RTLD_NOW | RTLD_NOLOAD);
    if (library == nullptr) throw std::runtime_error("the module is not loaded: " + path);
    Find(library, "ValtoNCSetup", gValto.ncSetup);
    Find(library, "ValtoNCProcess", gValto.ncProcess);
    Find(library, "ValtoNCReset", gValto.ncReset);
    Find(library, "ValtoVADSetup", gValto.vadSetup);
    Find(library, "ValtoVADProcess", gValto.vadProcess);
    Find(library, "ValtoVADReset", gValto.vadReset);
    FindOptional(library, "FailAllocation", gAllocations.fail);
    FindOptional(library, "IsFailurePending", gAllocations.isPending);
    FindOptional(library, "HeldAllocations", gAllocations.held);
    FindOptional(library, "ForgetEngine", gAllocations.forgetEngine);
}

// One stream on its own thread: cleans the input, reads a voice score per frame.
struct Stream {
    std::vector<std::int16_t> audio;
    std::vector<float> scores;
    std::size_t frameSize = 0;
    std::string error;
    std::atomic<bool> done{false};
    std::thread thread;

    void Run(int rateHz, int frameMs) {
        void* const cleaner = gValto.ncSetup(rateHz, frameMs);
        void* const detector = gValto.vadSetup(rateHz, frameMs);
        if (cleaner == nullptr || detector == nullptr) error = "set-up failed";
        const auto size = static_cast<unsigned>(frameSize);
        for (std::size_t at = 0; error.empty() && at + frameSize <= audio.size(); at += frameSize) {
            std::int16_t* const frame = audio.data() + at;
            scores.push_back(gValto.vadProcess(detector, frame, size));
            if (gValto.ncProcess(cleaner, frame, size, frame, size) != 0) error = "frame failed";
        }
        if (cleaner != nullptr && gValto.ncReset(cleaner) != 0) error = "close failed";
        if (detector != nullptr && gValto.vadReset(detector) != 0) error = "close failed";
        done = true;
    }
    ~Stream() {
        if (thread.joinable()) thread.join();
    }
};

std::unique_ptr<Stream> gStream;

struct Call {
    napi_env env;
    std::array<napi_value, 5> arguments{};

    Call(napi_env callEnv, napi_callback_info info) : env(callEnv) {
        std::size_t count = arguments.size();
        napi_get_cb_info(env, info, &count, arguments.data(), nullptr, nullptr);
    }
    std::int32_t Int(std::size_t i) const {
        std::int32_t value = 0;
        napi_get_value_int32(env, arguments[i], &value);
        return value;
    }
    void* Pointer(std::size_t i) const {
        std::uint64_t value = 0;
        bool lossless = false;
        napi_get_value_bigint_uint64(env, arguments[i], &value, &lossless);
        void* pointer = nullptr;
        std::memcpy(&pointer, &value, sizeof pointer);
        return pointer;
    }
    std::string Text(std::size_t i) const {
        std::array<char, 4096> text{};
        std::size_t length = 0;
        napi_get_value_string_utf8(env, arguments[i], text.data(), text.size(), &length);
        return {text.data(), length};
    }
    // Null for script's null.
    std::int16_t* Samples(std::size_t i, std::size_t* count = nullptr) const {
        std::size_t length = 0;
        void* data = nullptr;
        napi_get_typedarray_info(env, arguments[i], nullptr, &length, &data, nullptr, nullptr);
        if (count != nullptr) *count = length;
        return static_cast<std::int16_t*>(data);
    }
    napi_value Number(double number) const {
        napi_value value = nullptr;
        napi_create_double(env, number, &value);
        return value;
    }
    napi_value Handle(void* pointer) const {
        napi_value value = nullptr;
        napi_create_bigint_uint64(env, reinterpret_cast<std::uintptr_t>(pointer), &value);
        return value;
    }
    napi_value Throw(const char* text) const {
        napi_throw_error(env, nullptr, text);
        return nullptr;
    }
};

napi_value Attach(napi_env env, napi_callback_info info) {
    const Call call(env, info);
    try {
        FindAll(call.Text(0));
    } catch (const std::exception& failure) {
        return call.Throw(failure.what());
    }
    return nullptr;
}

napi_value NcSetup(napi_env env, napi_callback_info info) {
    const Call call(env, info);
    return call.Handle(gValto.ncSetup(call.Int(0), call.Int(1)));
}

napi_value NcProcess(napi_env env, napi_callback_info info) {
    const Call call(env, info);
    return call.Number(gValto.ncProcess(call.Pointer(0), call.Samples(1),
                                        static_cast<unsigned>(call.Int(2)), call.Samples(3),
                                        static_cast<unsigned>(call.Int(4))));
}

napi_value NcReset(napi_env env, napi_callback_info info) {
    const Call call(env, info);
    return call.Number(gValto.ncReset(call.Pointer(0)));
}

napi_value VadSetup(napi_env env, napi_callback_info info) {
    const Call call(env, info);
    return call.Handle(gValto.vadSetup(call.Int(0), call.Int(1)));
}

napi_value VadProcess(napi_env env, napi_callback_info info) {
    const Call call(env, info);
    return call.Number(static_cast<double>(
        gValto.vadProcess(call.Pointer(0), call.Samples(1), static_cast<unsigned>(call.Int(2)))));
}

napi_value VadReset(napi_env env, napi_callback_info info) {
    const Call call(env, info);
    return call.Number(gValto.vadReset(call.Pointer(0)));
}

// failAllocation(n): the n-th allocation of the module fails; 0 disarms.
napi_value FailAllocation(napi_env env, napi_callback_info info) {
    gAllocations.fail(static_cast<unsigned>(Call(env, info).Int(0)));
    return nullptr;
}

napi_value IsFailurePending(napi_env env, napi_callback_info info) {
    return Call(env, info).Number(gAllocations.isPending());
}

napi_value HeldAllocations(napi_env env, napi_callback_info info) {
    return Call(env, info).Number(static_cast<double>(gAllocations.held()));
}

napi_value ForgetEngine(napi_env /*env*/, napi_callback_info /*info*/) {
    gAllocations.forgetEngine();
    return nullptr;
}

// start(rateHz, frameMs, input): runs the whole input once on the engine's thread.
napi_value Start(napi_env env, napi_callback_info info) {
    const Call call(env, info);
    auto stream = std::make_unique<Stream>();
    std::size_t count = 0;
    const std::int16_t* const samples = call.Samples(2, &count);
    stream->audio.assign(samples, samples + count);
    const int rateHz = call.Int(0);
    const int frameMs = call.Int(1);
    stream->frameSize = static_cast<std::size_t>(rateHz) * static_cast<std::size_t>(frameMs) / 1000;
    stream->thread =
        std::thread([&running = *stream, rateHz, frameMs] { running.Run(rateHz, frameMs); });
    gStream = std::move(stream);
    return nullptr;
}

// running(): whether the engine's thread still works.
napi_value Running(napi_env env, napi_callback_info /*info*/) {
    napi_value value = nullptr;
    napi_get_boolean(env, gStream && !gStream->done, &value);
    return value;
}

// result(output, scores): waits for the thread and copies what it made; the number of scores.
napi_value Result(napi_env env, napi_callback_info info) {
    const Call call(env, info);
    if (!gStream) return call.Throw("nothing was started");
    gStream->thread.join();
    const std::unique_ptr<Stream> stream = std::move(gStream);
    if (!stream->error.empty()) return call.Throw(stream->error.c_str());
    std::memcpy(call.Samples(0), stream->audio.data(), stream->audio.size() * sizeof(std::int16_t));
    std::memcpy(call.Samples(1), stream->scores.data(), stream->scores.size() * sizeof(float));
    return call.Number(static_cast<double>(stream->scores.size()));
}

// runForever(rateHz, frameMs): threads that open, feed and close sessions until the process is
// gone.
napi_value RunForever(napi_env env, napi_callback_info info) {
    const Call call(env, info);
    const int rateHz = call.Int(0);
    const int frameMs = call.Int(1);
    const auto size = static_cast<unsigned>(rateHz * frameMs / 1000);
    std::thread([rateHz, frameMs, size] {
        std::vector<std::int16_t> frame(size);
        void* const session = gValto.ncSetup(rateHz, frameMs);
        for (unsigned n = 0;; ++n) {
            for (auto& sample : frame) sample = static_cast<std::int16_t>(n++ * 7919U);
            gValto.ncProcess(session, frame.data(), size, frame.data(), size);
        }
    }).detach();
    std::thread([rateHz, frameMs, size] {
        std::vector<std::int16_t> frame(size);
        for (;;) {
            void* const session = gValto.vadSetup(rateHz, frameMs);
            gValto.vadProcess(session, frame.data(), size);
            gValto.vadReset(session);
        }
    }).detach();
    return nullptr;
}

}  // namespace

NAPI_MODULE_INIT() {
    const auto method = [](const char* name, napi_callback callback) {
        return napi_property_descriptor{.utf8name = name,
                                        .name = nullptr,
                                        .method = callback,
                                        .getter = nullptr,
                                        .setter = nullptr,
                                        .value = nullptr,
                                        .attributes = napi_enumerable,
                                        .data = nullptr};
    };
    const std::array methods{
        method("attach", Attach),
        method("ncSetup", NcSetup),
        method("ncProcess", NcProcess),
        method("ncReset", NcReset),
        method("vadSetup", VadSetup),
        method("vadProcess", VadProcess),
        method("vadReset", VadReset),
        method("start", Start),
        method("running", Running),
        method("result", Result),
        method("runForever", RunForever),
        method("failAllocation", FailAllocation),
        method("isFailurePending", IsFailurePending),
        method("heldAllocations", HeldAllocations),
        method("forgetEngine", ForgetEngine),
    };
    napi_define_properties(env, exports, methods.size(), methods.data());
    return exports;
}
