// Sessions for script, over the exported entry points. A frame call allocates nothing of its own.
#include "native_modules/quorral_valto/src/bindings/sessions.h"

#include <array>
#include <cstdint>
#include <limits>
#include <memory>
#include <stdexcept>
#include <string>
#include <unordered_set>
#include <utility>

#include "morva-sdk/morva-ext.h"
#include "native/node_api/optional.h"
#include "native_modules/quorral_valto/src/bindings/diagnostics.h"
#include "native_modules/quorral_valto/src/valto_wrapper/entry_points.h"
#include "native_modules/quorral_valto/src/valto_wrapper/models.h"
#include "native_modules/quorral_valto/src/valto_wrapper/valto_wrapper.h"

namespace quorral {
namespace {

// Codes of the engine for a frame and for a handle that is none.
constexpr int kRefusedFrame = 1;
constexpr int kNoNcSession = 2;
constexpr double kNoVadSession = -4.0;

// What a session holds, 90 to 140 KB as measured. Script's collector is told, since all that it
// sees of a session is a handle.
constexpr std::int64_t kSessionBytes = 128'000;

struct Session;
// The sessions of this thread that script may still hold.
thread_local std::unordered_set<Session*> tSessions;

// What a script value of its own owns, from `Open` until that value is finalized.
struct Session {
    void* handle = nullptr;
    int (*closeHandle)(void*) = nullptr;
    napi_env env = nullptr;
    napi_ref watch = nullptr;  // weak: tells whether the script value was collected

    Session(napi_env ofScript, int (*close)(void*)) : closeHandle(close), env(ofScript) {
        tSessions.insert(this);
    }
    ~Session() {
        tSessions.erase(this);
        if (watch != nullptr) napi_delete_reference(env, watch);
        Close();
    }
    Session(const Session&) = delete;
    Session& operator=(const Session&) = delete;

    void Hold(void* opened) {
        handle = opened;
        AdjustMemory(kSessionBytes);
    }
    bool Is(int (*close)(void*)) const { return handle != nullptr && closeHandle == close; }
    bool IsCollected() const {
        napi_value value = nullptr;
        return watch != nullptr && napi_get_reference_value(env, watch, &value) == napi_ok &&
               value == nullptr;
    }
    void Close() {
        if (handle == nullptr) return;
        closeHandle(std::exchange(handle, nullptr));
        AdjustMemory(-kSessionBytes);
    }

private:
    void AdjustMemory(std::int64_t change) const {
        std::int64_t total = 0;
        napi_adjust_external_memory(env, change, &total);
    }
};

// The runtime finalizes what it has collected on a later turn of the event loop. Script that opens
// session after session in one turn would never see the earlier ones end.
void CloseCollected(napi_env env) {
    napi_handle_scope scope = nullptr;
    if (napi_open_handle_scope(env, &scope) != napi_ok) return;
    for (Session* const session : tSessions) {
        if (session->IsCollected()) session->Close();
    }
    napi_close_handle_scope(env, scope);
}

void DestroySession(napi_env /*env*/, void* data, void* /*hint*/) {
    const std::unique_ptr<Session> owned(static_cast<Session*>(data));
}

template <std::size_t N>
std::array<napi_value, N> ArgumentsOf(napi_env env, napi_callback_info info) {
    std::array<napi_value, N> values{};
    std::size_t count = N;
    napi_get_cb_info(env, info, &count, values.data(), nullptr, nullptr);
    return values;
}

Session* SessionOf(napi_env env, napi_value value) {
    napi_valuetype type = napi_undefined;
    void* data = nullptr;
    if (napi_typeof(env, value, &type) != napi_ok || type != napi_external ||
        napi_get_value_external(env, value, &data) != napi_ok) {
        return nullptr;
    }
    return static_cast<Session*>(data);
}

// The samples of a frame. No data for what is neither kind of array; a detached one has none
// either.
struct Samples {
    napi_typedarray_type type = napi_int16_array;
    void* data = nullptr;
    unsigned count = 0;

    template <class Sample>
    Sample* As() const {
        return static_cast<Sample*>(data);
    }
};

Samples SamplesOf(napi_env env, napi_value value) {
    bool isTyped = false;
    napi_typedarray_type type{};
    std::size_t length = 0;
    void* data = nullptr;
    if (napi_is_typedarray(env, value, &isTyped) != napi_ok || !isTyped ||
        napi_get_typedarray_info(env, value, &type, &length, &data, nullptr, nullptr) != napi_ok ||
        (type != napi_int16_array && type != napi_float32_array)) {
        return {};
    }
    return {.type = type, .data = data, .count = static_cast<unsigned>(length)};
}

napi_value Number(napi_env env, double number) {
    napi_value value = nullptr;
    napi_create_double(env, number, &value);
    return value;
}

// A code as an integer needs no heap number.
napi_value Code(napi_env env, int code) {
    napi_value value = nullptr;
    napi_create_int32(env, code, &value);
    return value;
}

Optional<std::string> TextOf(napi_env env, napi_value value) {
    std::size_t length = 0;
    if (napi_get_value_string_utf8(env, value, nullptr, 0, &length) != napi_ok) return {};
    std::string text(length + 1, '\0');
    napi_get_value_string_utf8(env, value, text.data(), text.size(), &length);
    text.resize(length);
    return text;
}

using Opener = OpenResult (*)(int, int, const Optional<std::string>&);

napi_value Open(napi_env env, napi_callback_info info, Opener open, int (*close)(void*)) {
    const auto arguments = ArgumentsOf<3>(env, info);
    std::int32_t rateHz = 0;
    std::int32_t frameMs = 0;
    napi_get_value_int32(env, arguments[0], &rateHz);
    napi_get_value_int32(env, arguments[1], &frameMs);
    try {
        CloseCollected(env);
        // First, since an open session that finds no owner would stay open for ever.
        auto session = std::make_unique<Session>(env, close);
        const OpenResult result = open(rateHz, frameMs, TextOf(env, arguments[2]));
        if (result.status != OpenStatus::kOpen) return Code(env, static_cast<int>(result.status));
        session->Hold(result.session);
        napi_value external = nullptr;
        if (napi_create_external(env, session.get(), DestroySession, nullptr, &external) !=
            napi_ok) {
            return nullptr;
        }
        Session* const owned = session.release();
        napi_create_reference(env, external, 0, &owned->watch);
        return external;
    } catch (const std::exception& failure) {
        napi_throw_error(env, nullptr, failure.what());
        return nullptr;
    }
}

napi_value OpenNc(napi_env env, napi_callback_info info) {
    return Open(env, info, OpenNcSession, ValtoNCReset);
}

napi_value OpenVad(napi_env env, napi_callback_info info) {
    return Open(env, info, OpenVadSession, ValtoVADReset);
}

napi_value ProcessNc(napi_env env, napi_callback_info info) {
    const auto [handle, input, output] = ArgumentsOf<3>(env, info);
    const Session* const session = SessionOf(env, handle);
    if (session == nullptr || !session->Is(ValtoNCReset)) return Code(env, kNoNcSession);
    const Samples from = SamplesOf(env, input);
    const Samples to = SamplesOf(env, output);
    if (from.type != to.type) return Code(env, kRefusedFrame);
    if (from.type == napi_float32_array) {
        return Code(env, Morva_NC_CleanAmbientNoiseFloat(session->handle, from.As<float>(),
                                                         from.count, to.As<float>(), to.count));
    }
    return Code(env, ValtoNCProcess(session->handle, from.As<short>(), from.count, to.As<short>(),
                                    to.count));
}

napi_value ProcessVad(napi_env env, napi_callback_info info) {
    const auto [handle, input] = ArgumentsOf<2>(env, info);
    const Session* const session = SessionOf(env, handle);
    if (session == nullptr || !session->Is(ValtoVADReset)) return Number(env, kNoVadSession);
    const Samples from = SamplesOf(env, input);
    const float score = from.type == napi_float32_array
                            ? Morva_VAD_FrameFloat(session->handle, from.As<float>(), from.count)
                            : ValtoVADProcess(session->handle, from.As<short>(), from.count);
    return Number(env, static_cast<double>(score));
}

// The handle of an open noise-cancellation session, or null, which the engine refuses.
void* NcHandleOf(napi_env env, napi_value value) {
    const Session* const session = SessionOf(env, value);
    return session != nullptr && session->Is(ValtoNCReset) ? session->handle : nullptr;
}

napi_value Latency(napi_env env, napi_callback_info info) {
    return Code(env, MorvaExt_SessionLatencySamples(NcHandleOf(env, ArgumentsOf<1>(env, info)[0])));
}

napi_value SetAttenuationLimit(napi_env env, napi_callback_info info) {
    const auto [handle, limit] = ArgumentsOf<2>(env, info);
    double limitDb = -1.0;
    napi_get_value_double(env, limit, &limitDb);
    return Code(
        env, MorvaExt_NC_SetAttenuationLimit(NcHandleOf(env, handle), static_cast<float>(limitDb)));
}

napi_value SetBypass(napi_env env, napi_callback_info info) {
    const auto [handle, on] = ArgumentsOf<2>(env, info);
    bool isOn = false;
    napi_get_value_bool(env, on, &isOn);
    return Code(env, MorvaExt_NC_SetBypass(NcHandleOf(env, handle), isOn ? 1 : 0));
}

napi_value EnableVoiceMeter(napi_env env, napi_callback_info info) {
    const auto [handle, model] = ArgumentsOf<2>(env, info);
    try {
        return Code(env,
                    static_cast<int>(EnableVoice(NcHandleOf(env, handle), TextOf(env, model))));
    } catch (const std::exception& failure) {
        napi_throw_error(env, nullptr, failure.what());
        return nullptr;
    }
}

napi_value VoiceScore(napi_env env, napi_callback_info info) {
    float score = std::numeric_limits<float>::quiet_NaN();
    MorvaExt_NC_FrameMeters(NcHandleOf(env, ArgumentsOf<1>(env, info)[0]), &score, nullptr);
    return Number(env, static_cast<double>(score));
}

napi_value NoiseLevel(napi_env env, napi_callback_info info) {
    float levelDb = std::numeric_limits<float>::quiet_NaN();
    MorvaExt_NC_FrameMeters(NcHandleOf(env, ArgumentsOf<1>(env, info)[0]), nullptr, &levelDb);
    return Number(env, static_cast<double>(levelDb));
}

napi_value LastError(napi_env env, napi_callback_info /*info*/) {
    napi_value text = nullptr;
    napi_create_string_utf8(env, MorvaExt_LastError(), NAPI_AUTO_LENGTH, &text);
    return text;
}

napi_value Close(napi_env env, napi_callback_info info) {
    if (Session* const session = SessionOf(env, ArgumentsOf<1>(env, info)[0])) session->Close();
    return nullptr;
}

// The weight files in the order of the start-up codes from -5 down.
napi_value WeightFiles(napi_env env) {
    napi_value files = nullptr;
    napi_create_array(env, &files);
    std::uint32_t index = 0;
    for (const auto& model : morva::shippedModels) {
        if (!IsHosted(model)) continue;
        napi_value file = nullptr;
        napi_create_string_utf8(env, model.file, NAPI_AUTO_LENGTH, &file);
        napi_set_element(env, files, index++, file);
    }
    return files;
}

napi_value InitializeEngine(napi_env env, napi_callback_info /*info*/) {
    try {
        return Code(env, EnsureInitialized());
    } catch (const std::exception& failure) {
        napi_throw_error(env, nullptr, failure.what());
        return nullptr;
    }
}

}  // namespace

napi_value RequestedSessions(napi_env env, napi_value exports) {
    napi_value key = nullptr;
    bool has = false;
    napi_value target = nullptr;
    napi_valuetype type = napi_undefined;
    if (napi_create_string_utf8(env, "sessions", NAPI_AUTO_LENGTH, &key) != napi_ok ||
        napi_has_own_property(env, exports, key, &has) != napi_ok || !has ||
        napi_get_property(env, exports, key, &target) != napi_ok ||
        napi_typeof(env, target, &type) != napi_ok || type != napi_object) {
        return nullptr;
    }
    return target;
}

void InstallSessions(napi_env env, napi_value target) {
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
        method("initialize", InitializeEngine),
        method("openNc", OpenNc),
        method("openVad", OpenVad),
        method("processNc", ProcessNc),
        method("processVad", ProcessVad),
        method("latency", Latency),
        method("setAttenuationLimit", SetAttenuationLimit),
        method("setBypass", SetBypass),
        method("enableVoice", EnableVoiceMeter),
        method("voiceScore", VoiceScore),
        method("noiseLevel", NoiseLevel),
        method("lastError", LastError),
        method("takeDiagnostics", TakeDiagnosticsForScript),
        method("diagnostics", FetchDiagnostics),
        method("close", Close),
    };
    if (napi_define_properties(env, target, methods.size(), methods.data()) != napi_ok ||
        napi_set_named_property(env, target, "weightFiles", WeightFiles(env)) != napi_ok) {
        throw std::runtime_error("The runtime refuses the session functions");
    }
}

}  // namespace quorral
