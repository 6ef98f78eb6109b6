#include "noise_canceller/noise_cleaner_v0_0_6.h"

#include <iostream>
#include <string>
#include <utility>

#include "noise_canceller/noise_cleaner_generations.h"
#include "noise_canceller/parameter_reader.h"
#include "utils/exception.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

// The stage keeps an energy per counted frame; half an hour of them is more than anyone means.
constexpr float kMaxRunFrameCount = 100000.0f;

unsigned long frameCount(float value) {
    if (!(value >= 1.0f && value <= kMaxRunFrameCount)) {
        UTILS::raise("BACKGROUND_SPEAKER_FIX_RUN_FRAME_COUNT is " + std::to_string(value) +
                         ", must be 1..100000",
                     "src/noise_canceller/noise_cleaner_v0_0_6", "Params");
    }
    return static_cast<unsigned long>(value);
}

}  // namespace

NoiseCleaner_v0_0_6::Params::Params(Model::Params::Environment& environment, std::size_t frameMs)
    : Model::Params(environment, frameMs, generation(6)) {
    ParameterReader const reader(environment, generation(6).suffix);
    enableBackgroundSpeakerFix = reader.isOn("ENABLE_BACKGROUND_SPEAKER_FIX", false);
    cutStartDb = reader.real("BACKGROUND_SPEAKER_FIX_CUT_START_DB", 10.0f);
    cutEndDb = reader.real("BACKGROUND_SPEAKER_FIX_CUT_END_DB", 15.0f);
    runFrameCount = frameCount(reader.real("BACKGROUND_SPEAKER_FIX_RUN_FRAME_COUNT", 40.0f));
    runMinLen = static_cast<unsigned long>(reader.integer("BACKGROUND_SPEAKER_FIX_RUN_MIN_LEN", 2));
    utteranceLen = reader.real("BACKGROUND_SPEAKER_FIX_UTTERANCE_LEN", 2.0f);
    varWindMode = reader.isOn("BACKGROUND_SPEAKER_FIX_VAR_WIND_MODE", true);
}

NoiseCleaner_v0_0_6::NoiseCleaner_v0_0_6(ModelEnvironment model, std::size_t frameMs)
    : NoiseCleaner(std::move(model)),
      params_(*environment(), frameMs),
      model_(params_, environment()->second, generation(6)),
      backgroundSpeakerFix_(std::make_shared<UTILS::BackgroundSpeakerFix>(
          params_.cutStartDb, params_.cutEndDb, params_.runFrameCount, params_.runMinLen,
          params_.utteranceLen, params_.varWindMode, params_.modelFrameMs,
          model_.synthesisWindow())),
      backgroundSpeakerOn_(params_.enableBackgroundSpeakerFix) {}

void NoiseCleaner_v0_0_6::suppressBackgroundSpeaker(std::vector<float>& frame) {
    if (backgroundSpeakerOn_.load(std::memory_order_relaxed)) {
        backgroundSpeakerFix_->frame_compute(frame);
    }
}

bool NoiseCleaner_v0_0_6::cleanNoise(std::vector<float>& frame) {
    model_.process(frame,
                   [this](std::vector<float>& cleaned) { suppressBackgroundSpeaker(cleaned); });
    return true;
}

bool NoiseCleaner_v0_0_6::mainCleaner(float const* in, std::vector<float>& out) {
    return model_.run(in, out,
                      [this](std::vector<float>& cleaned) { suppressBackgroundSpeaker(cleaned); });
}

bool NoiseCleaner_v0_0_6::background_speaker_fix_switch(bool on) {
    backgroundSpeakerOn_ = on;
    std::cout << "Parameter env_enable_background_speaker_fix set to: " << on << std::endl;
    return true;
}

}  // namespace MORVA::NOISE_CANCELLER
