#include "noise_canceller/background_speaker_stage.h"

#include <string>

#include "utils/exception.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

// The stage keeps an energy per counted frame; half an hour of them is more than anyone means.
constexpr float kMaxRunFrameCount = 100000.0f;

std::size_t frameCount(float value) {
    if (!(value >= 1.0f && value <= kMaxRunFrameCount)) {
        UTILS::raise("BACKGROUND_SPEAKER_FIX_RUN_FRAME_COUNT is " + std::to_string(value) +
                         ", must be 1..100000",
                     "src/noise_canceller/background_speaker_stage", "Params");
    }
    return static_cast<std::size_t>(value);
}

}  // namespace

BackgroundSpeakerStage::Params::Params(ParameterReader const& reader)
    : enableBackgroundSpeakerFix(reader.isOn("ENABLE_BACKGROUND_SPEAKER_FIX", false)),
      cutStartDb(reader.real("BACKGROUND_SPEAKER_FIX_CUT_START_DB", 10.0f)),
      cutEndDb(reader.real("BACKGROUND_SPEAKER_FIX_CUT_END_DB", 15.0f)),
      runFrameCount(frameCount(reader.real("BACKGROUND_SPEAKER_FIX_RUN_FRAME_COUNT", 40.0f))),
      runMinLen(static_cast<std::size_t>(reader.integer("BACKGROUND_SPEAKER_FIX_RUN_MIN_LEN", 2))),
      utteranceLen(reader.real("BACKGROUND_SPEAKER_FIX_UTTERANCE_LEN", 2.0f)),
      varWindMode(reader.isOn("BACKGROUND_SPEAKER_FIX_VAR_WIND_MODE", true)) {}

BackgroundSpeakerStage::BackgroundSpeakerStage(Params const& params, std::size_t modelFrameMs,
                                               std::vector<float> const& window)
    : fix_(params.cutStartDb, params.cutEndDb, params.runFrameCount, params.runMinLen,
           params.utteranceLen, params.varWindMode, modelFrameMs, window),
      on_(params.enableBackgroundSpeakerFix) {}

void BackgroundSpeakerStage::operator()(std::vector<float>& frame) {
    if (on_.load(std::memory_order_relaxed)) fix_.frame_compute(frame);
}

bool BackgroundSpeakerStage::switchTo(bool on) {
    on_.store(on, std::memory_order_relaxed);
    return true;
}

}  // namespace MORVA::NOISE_CANCELLER
