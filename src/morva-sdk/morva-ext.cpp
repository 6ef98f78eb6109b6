#include "morva-sdk/morva-ext.h"

#include <algorithm>
#include <cstdlib>
#include <mutex>

#include "morva-sdk/cpu_support.h"
#include "morva-sdk/error_funnel.h"
#include "morva-sdk/handles.h"
#include "morva-sdk/instance.h"
#include "morva-sdk/last_error.h"
#include "morva-sdk/model_facts.h"
#include "utils/diagnostics.h"

namespace {

using namespace MORVA::MORVA_SDK;

constexpr int kDone = 0;
constexpr int kCannot = 1;

// Runs `body` on the live session that `type`, where it is given, allows behind a handle; 2 with
// the usual line when there is none.
template <class Body, class... Type>
int withSession(void* handle, Body&& body, Type... type) {
    return funnel(kIntFailures, [&] {
        auto* const session = liveSession(handle, type...);
        if (session == nullptr) {
            printError(kWrongSession);
            return 2;
        }
        return static_cast<int>(body(*session));
    });
}
template <class Body>
int withNoiseSession(void* handle, Body&& body) {
    return withSession(handle, body, MorvaSessionType::NoiseCancellation);
}
template <class Body>
int withSound(void* handle, Body&& body) {
    return withNoiseSession(handle, [&](auto& session) { return body(session.sound()); });
}

void copyText(char* target, std::size_t room, std::string const& text) {
    std::size_t const length = std::min(text.size(), room - 1);
    std::copy_n(text.data(), length, target);
    target[length] = '\0';
}

MorvaExtModelInfo describe(std::string const& name, MORVA::WEIGHTS::Weight const& weight) {
    auto const facts = modelFacts(weight);
    MorvaExtModelInfo info{};
    copyText(info.name, sizeof info.name, name);
    copyText(info.version, sizeof info.version, facts.version);
    info.sampleRate = facts.sampleRate;
    info.frameMs = facts.frameMs;
    info.size = facts.bytes;
    return info;
}

}  // namespace

extern "C" {

int MorvaExt_SessionLatencySamples(void* handle) {
    int latency = 0;
    int const code = withSound(handle, [&](auto& sound) {
        latency = static_cast<int>(sound.latencySamples());
        return kDone;
    });
    return code == kDone ? latency : -std::abs(code);
}

int MorvaExt_SessionExactLatency(void* handle, double* samples) {
    return withSound(handle, [&](auto& sound) {
        if (samples == nullptr) return 2;
        *samples = sound.exactLatency();
        return kDone;
    });
}

int MorvaExt_SessionFrameSizes(void* handle, unsigned int* inputSize, unsigned int* outputSize) {
    return withSession(handle, [&](auto& session) {
        if (inputSize != nullptr) *inputSize = static_cast<unsigned>(session.inputFrameSize());
        if (outputSize != nullptr) *outputSize = static_cast<unsigned>(session.outputFrameSize());
        return kDone;
    });
}

int MorvaExt_NC_SetAttenuationLimit(void* handle, float limitDb) {
    return withSound(
        handle, [&](auto& sound) { return sound.setAttenuationLimit(limitDb) ? kDone : kCannot; });
}

int MorvaExt_NC_SetBypass(void* handle, int on) {
    return withSound(handle, [&](auto& sound) {
        sound.setBypass(on != 0);
        return kDone;
    });
}

int MorvaExt_NC_SetBackgroundSpeaker(void* handle, int on) {
    return withSound(
        handle, [&](auto& sound) { return sound.setBackgroundSpeaker(on != 0) ? kDone : kCannot; });
}

int MorvaExt_NC_EnableVoice(void* handle, char const* vadModel) {
    return withNoiseSession(handle, [&](auto& session) {
        std::lock_guard const lock(MorvaInstanceT::mutexForInputs_);
        session.enableVoice(vadModel);
        return kDone;
    });
}

int MorvaExt_NC_FrameMeters(void* handle, float* voice, float* noiseDb) {
    return withSound(handle, [&](auto& sound) {
        if (voice != nullptr) *voice = sound.voiceScore();
        if (noiseDb != nullptr) *noiseDb = sound.noiseLevelDb();
        return kDone;
    });
}

int MorvaExt_NoiseDB_FrameFloat(void* handle, float const* input, unsigned int inputSize,
                                float* levelDb) {
    auto const frame = [&](MorvaSessionT& session) {
        if (input == nullptr || levelDb == nullptr) return 2;
        if (inputSize != session.inputFrameSize()) return kCannot;
        *levelDb = session.frameNoiseDB(input, inputSize);
        return kDone;
    };
    return withSession(handle, frame, MorvaSessionType::NoiseLevel);
}

int MorvaExt_ListModels(MorvaExtModelInfo* models, int capacity) {
    return funnel(kIntFailures, [&] {
        auto const& registry = engine().registry();
        std::lock_guard const lock(MorvaInstanceT::mutexForInputs_);
        int written = 0;
        for (auto const& [name, index] : registry.names()) {
            if (models == nullptr || written >= capacity) break;
            models[written++] = describe(name, *registry.environments()[index]->first);
        }
        return static_cast<int>(registry.names().size());
    });
}

char const* MorvaExt_Version(void) {
    return MORVA_VERSION;
}

char const* MorvaExt_ProcessorFeatures(void) {
    return processorFeatures();
}

void MorvaExt_SetDiagnostics(MorvaExtDiagnostic take) {
    MORVA::UTILS::takeDiagnostics(take);
}

char const* MorvaExt_LastError(void) {
    return lastError();
}

}  // extern "C"
