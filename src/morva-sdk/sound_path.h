// The sound of a noise-cancellation session: through the model and back to the caller's rate, with
// what can be changed and read while it runs. All samples are floats on the 16-bit scale.
//
//   remember     a copy for the bypass                                bypass
//   listen       a copy for the voice-activity model, where enabled   VoiceMeter
//   run          the caller's rate -> the model's, clip, clean        model_stage
//   convert      -> the output rate                                   frame_converter
//   mix          the remembered sound, as far as the bypass is on     bypass
//   clip
#pragma once

#include <cstddef>
#include <limits>
#include <memory>
#include <span>
#include <vector>

#include "morva-sdk/bypass.h"
#include "morva-sdk/frame_converter.h"
#include "morva-sdk/model_stage.h"
#include "noise_canceller/noise_cleaner.h"

namespace MORVA::MORVA_SDK {

// The score that a voice-activity model gives each frame, heard beside the cleaning.
class VoiceMeter {
public:
    // Takes a frame's memory, so that the first real one allocates nothing.
    VoiceMeter(std::unique_ptr<NOISE_CANCELLER::NoiseCleaner> cleaner, std::size_t inputFrame,
               MorvaFrameDuration duration);

    void listen(std::span<float const> frame);
    float score() const { return score_; }  // of the last frame

private:
    ModelStage model_;
    std::vector<float> frame_;
    float score_ = std::numeric_limits<float>::quiet_NaN();
};

class SoundPath : private UTILS::NonCopyMovable {
public:
    // Frame lengths in samples at the caller's two rates.
    SoundPath(NOISE_CANCELLER::NoiseModel model, std::size_t inputFrame, std::size_t outputFrame,
              MorvaFrameDuration duration);

    // Replaces an input frame by the output frame.
    void clean(std::vector<float>& frame);

    // From sound in to sound out, in output samples.
    double exactLatency() const { return exactLatency_; }
    long latencySamples() const { return latency_; }

    // [any thread] No limit: infinity. False, and nothing changed, for a negative one or a NaN.
    bool setAttenuationLimit(float limitDb);
    void setBypass(bool on) { bypass_.set(on); }
    // False when the model has no such stage.
    bool setBackgroundSpeaker(bool on);

    void enableVoice(std::unique_ptr<VoiceMeter> voice);

    // Of the last frame: that of the enabled voice-activity model, or the model's own; a NaN where
    // there is neither.
    float voiceScore() const;
    // Of the noise, as noise-level sessions report it.
    float noiseLevelDb() const;

private:
    NOISE_CANCELLER::SoundControls& controls_;  // of the model
    ModelStage model_;
    FrameConverter toOutput_;
    double exactLatency_;
    long latency_;  // rounded
    Bypass bypass_;
    std::unique_ptr<VoiceMeter> voice_;  // once enabled
};

}  // namespace MORVA::MORVA_SDK
