#include "morva-sdk/morva-sdk.h"

#include <algorithm>
#include <cstdio>
#include <mutex>
#include <sstream>

#include "kernels/math_setup.h"
#include "morva-sdk/cpu_support.h"
#include "morva-sdk/error_funnel.h"
#include "morva-sdk/handles.h"
#include "morva-sdk/instance.h"
#include "morva-sdk/vocabulary.h"

namespace {

using namespace MORVA::MORVA_SDK;
using MODE = MorvaInstanceT::MODE;

constexpr char const* kUnit = "src/morva-sdk/morva-sdk";

template <class Register>
int registerModel(bool hasInput, char const* nullWarning, Register&& add) {
    return funnel(kIntFailures, [&] {
        if (!hasInput) {
            MORVA::UTILS::say(MORVA::UTILS::Channel::output, nullWarning);
            return 2;
        }
        auto& instance = engine();
        std::lock_guard const lock(MorvaInstanceT::mutexForInputs_);
        return add(instance) ? 0 : 2;
    });
}

template <class Create>
void* createSession(std::initializer_list<MorvaSamplingRate> rates, Create&& create) {
    return funnel(kHandleFailures, [&]() -> void* {
        if (!std::all_of(rates.begin(), rates.end(), isSamplingRate)) {
            printError("Unsupported Sampling rates!");
            return nullptr;
        }
        return create(engine());
    });
}

int closeSession(void* handle, MorvaSessionType type) {
    return funnel(kIntFailures, [&] {
        if (!engine().closeSession(static_cast<MorvaSessionT*>(handle), type)) {
            MORVA::UTILS::raise(
                "Trying to close a non-existant session or session of incompatible type", kUnit,
                "closeSession");
        }
        return 0;
    });
}

template <class Sample>
int cleanFrame(void* handle, Sample const* input, unsigned inputSize, Sample* output,
               unsigned outputSize) {
    return funnel(kIntFailures, [&] {
        auto* const session = liveSession(handle, MorvaSessionType::NoiseCancellation);
        if (session == nullptr) {
            printError(kWrongSession);
            return 2;
        }
        return session->cleanNoise(input, inputSize, output, outputSize) ? 0 : 1;
    });
}

enum class Range { any, unit };

// `frame` maps a session to its value for the frame. With Range::unit a value outside 0..1 (a NaN
// too, or the session's own -2 for a wrong size) is reported and then treated like a wrong session.
template <class Frame>
float frameValue(void* handle, MorvaSessionType type, Range range, Frame&& frame) {
    return funnel(kFloatFailures, [&] {
        if (auto* const session = liveSession(handle, type)) {
            float const value = frame(*session);
            if (range == Range::any || (value >= 0.0f && value <= 1.0f)) return value;
            std::ostringstream text;
            text << "THE CLEANING ERROR OUTPUT result " << value;
            MORVA::UTILS::say(MORVA::UTILS::Channel::error, text.str());
        }
        printError(kWrongSession);
        return -4.0f;
    });
}

}  // namespace

extern "C" {

int Morva_SDK_GlobalInit(wchar_t const* workingPath, unsigned int threads) {
    // Before anything that may run newer instructions, and with nothing but the C library.
    if (char const* const missing = missingProcessorFeature()) {
        char text[128];
        std::snprintf(text, sizeof text,
                      "The processor does not support %s, which this engine needs", missing);
        printError(text);
        return kIntFailures.engine;
    }
    return funnel(kIntFailures, [&] {
        MORVA::UTILS::configureMathLibrary(threads);
        return MorvaInstanceT::Instance(MODE::create, workingPath) != nullptr ? 0 : 1;
    });
}

int Morva_SDK_GlobalDestroy(void) {
    return funnel(kIntFailures, [] {
        MorvaInstanceT::Instance(MODE::destroy, nullptr);
        return 0;
    });
}

int Morva_SDK_SetModel(wchar_t const* weightPath, char const* modelName) {
    return registerModel(
        weightPath != nullptr, "WARRNING Morva_SetWeight FUNCTION CALL with nullptr",
        [&](auto& instance) { return instance.addWeightWithControlFile(weightPath, modelName); });
}

int Morva_SDK_SetModel_Blob(char const* weightBytes, unsigned int size, char const* modelName) {
    return registerModel(
        weightBytes != nullptr, "WARRNING Morva_SDK_SetModel_Blob FUNCTION CALL with nullptr",
        [&](auto& instance) { return instance.addWeightBlob(weightBytes, size, modelName); });
}

void* Morva_NC_CreateSession(MorvaSamplingRate inputRate, MorvaSamplingRate outputRate,
                             MorvaFrameDuration duration, char const* modelName) {
    return createSession({inputRate, outputRate}, [&](auto& instance) {
        return instance.createNCSession(inputRate, outputRate, duration, modelName);
    });
}

void* Morva_VAD_CreateSession(MorvaSamplingRate rate, MorvaFrameDuration duration,
                              char const* modelName) {
    return createSession({rate}, [&](auto& instance) {
        return instance.createVADSession(rate, duration, modelName);
    });
}

void* Morva_NoiseDB_CreateSession(MorvaSamplingRate rate, MorvaFrameDuration duration,
                                  char const* modelName) {
    return createSession({rate}, [&](auto& instance) {
        return instance.createNoiseDBSession(rate, duration, modelName);
    });
}

int Morva_NC_CloseSession(void* session) {
    return closeSession(session, MorvaSessionType::NoiseCancellation);
}

int Morva_VAD_CloseSession(void* session) {
    return closeSession(session, MorvaSessionType::VoiceActivity);
}

int Morva_NoiseDB_CloseSession(void* session) {
    return closeSession(session, MorvaSessionType::NoiseLevel);
}

int Morva_NoiseDB_ResetSession(void* handle) {
    return funnel(kIntFailures, [&] {
        auto* const session = liveSession(handle, MorvaSessionType::NoiseLevel);
        if (session == nullptr) {
            MORVA::UTILS::raise(
                "Trying to reset a non-existant session or session of incompatible type", kUnit,
                "Morva_NoiseDB_ResetSession");
        }
        // The session's own "true" is the result: success is 1 here.
        return static_cast<int>(session->resetNoiseDBSession());
    });
}

int Morva_NC_CleanAmbientNoiseInt16(void* session, short const* input, unsigned int inputSize,
                                    short* output, unsigned int outputSize) {
    return cleanFrame(session, input, inputSize, output, outputSize);
}

int Morva_NC_CleanAmbientNoiseFloat(void* session, float const* input, unsigned int inputSize,
                                    float* output, unsigned int outputSize) {
    return cleanFrame(session, input, inputSize, output, outputSize);
}

float Morva_VAD_FrameInt16(void* session, short const* input, unsigned int inputSize) {
    return frameValue(session, MorvaSessionType::VoiceActivity, Range::any,
                      [&](auto& vad) { return vad.frameVad(input, inputSize); });
}

float Morva_VAD_FrameFloat(void* session, float const* input, unsigned int inputSize) {
    return frameValue(session, MorvaSessionType::VoiceActivity, Range::unit,
                      [&](auto& vad) { return vad.frameVad(input, inputSize); });
}

float Morva_NoiseDB_FrameInt16(void* session, short const* input, unsigned int inputSize) {
    return frameValue(session, MorvaSessionType::NoiseLevel, Range::any,
                      [&](auto& level) { return level.frameNoiseDB(input, inputSize); });
}

float Morva_NoiseDB_FrameFloat(void* session, float const* input, unsigned int inputSize) {
    return frameValue(session, MorvaSessionType::NoiseLevel, Range::unit,
                      [&](auto& level) { return level.frameNoiseDB(input, inputSize); });
}

}  // extern "C"
