// Exported entry points: argument defaults and model choice in front of the engine's C interface.
// Setup takes the models lock; Process takes none.
#include "native_modules/quorral_valto/src/valto_wrapper/entry_points.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <mutex>
#include <string>

#include "morva-sdk/morva-sdk.h"
#include "native_modules/quorral_valto/src/valto_wrapper/diagnostics.h"
#include "native_modules/quorral_valto/src/valto_wrapper/models.h"

namespace quorral {
namespace {

constexpr std::array kRatesHz{8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000};
constexpr int kDefaultRateHz = 16000;
// 15 and 32 pass here although the engine refuses them: the caller then gets null.
constexpr std::array kDurationsMs{10, 15, 20, 30, 32, 40};
constexpr int kDefaultDurationMs = 10;

MorvaSamplingRate AcceptRate(int rateHz) {
    if (std::ranges::count(kRatesHz, rateHz) == 0) {
        Say("The input sampling rate " + std::to_string(static_cast<std::size_t>(rateHz)) +
            " is not supported; using default: " + std::to_string(kDefaultRateHz));
        rateHz = kDefaultRateHz;
    }
    return static_cast<MorvaSamplingRate>(rateHz);
}

MorvaFrameDuration AcceptDuration(int durationMs) {
    if (std::ranges::count(kDurationsMs, durationMs) == 0) {
        Say("The input frame duration " + std::to_string(static_cast<std::size_t>(durationMs)) +
            " is not supported; using default: " + std::to_string(kDefaultDurationMs));
        durationMs = kDefaultDurationMs;
    }
    return static_cast<MorvaFrameDuration>(durationMs);
}

}  // namespace
}  // namespace quorral

void* ValtoNCSetup(int samplingRate, int frameDurationMs) {
    const std::lock_guard guard(quorral::ModelsLock());
    const std::string model = quorral::NcModelFor(samplingRate);
    if (model.empty()) return nullptr;
    quorral::Say("Setting Valto model: " + model);
    const MorvaSamplingRate rate = quorral::AcceptRate(samplingRate);
    const MorvaFrameDuration duration = quorral::AcceptDuration(frameDurationMs);
    return Morva_NC_CreateSession(rate, rate, duration, model.c_str());
}

int ValtoNCProcess(void* session, const short* input, unsigned int inputSize, short* output,
                   unsigned int outputSize) {
    return Morva_NC_CleanAmbientNoiseInt16(session, input, inputSize, output, outputSize);
}

int ValtoNCReset(void* session) {
    return Morva_NC_CloseSession(session);
}

void* ValtoVADSetup(int samplingRate, int frameDurationMs) {
    const std::lock_guard guard(quorral::ModelsLock());
    const MorvaSamplingRate rate = quorral::AcceptRate(samplingRate);
    const MorvaFrameDuration duration = quorral::AcceptDuration(frameDurationMs);
    return Morva_VAD_CreateSession(rate, duration, quorral::gVadModel.c_str());
}

float ValtoVADProcess(void* session, const short* input, unsigned int inputSize) {
    return Morva_VAD_FrameInt16(session, input, inputSize);
}

int ValtoVADReset(void* session) {
    return Morva_VAD_CloseSession(session);
}
