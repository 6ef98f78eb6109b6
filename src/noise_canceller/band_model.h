// The model of version NC_1.0.0: one network gives cleaned sound, a voice score and the level of
// the noise. The way of a frame is that of the older noise cleaners (frame_spectrum.h); a session
// that wants no sound leaves out the way back.
#pragma once

#include <atomic>
#include <memory>
#include <span>
#include <vector>

#include "noise_canceller/background_speaker_stage.h"
#include "noise_canceller/band_features.h"
#include "noise_canceller/band_network.h"
#include "noise_canceller/band_weights.h"
#include "noise_canceller/frame_spectrum.h"
#include "noise_canceller/hop_pipeline.h"
#include "noise_canceller/noise_level_meter.h"
#include "noise_canceller/sound_controls.h"

namespace MORVA::NOISE_CANCELLER {

// What the model reads of its weight and environment; its checks make every frame call safe.
struct BandParams : FrameShape, FrameTunables, BackgroundSpeakerStage::Params {
    using Environment = CONTAINERS::ModelEnvironment::element_type;

    static constexpr char const* kSuffix = "_v1_0_0";  // of its parameter keys

    // Throws MORVA_Exception for missing values and for what does not fit.
    BandParams(Environment& environment, std::size_t frameMs);

    std::size_t sessionFrameMs;
    std::shared_ptr<BandWeights const> weights;
};

class BandModel final : public SoundControls {
public:
    using Params = BandParams;

    BandModel(BandParams::Environment& environment, std::size_t frameMs);

    // Back to the state after construction; the mask floor stays. Allocates nothing.
    void reset();

    // One session frame at the model's rate, cleaned in place.
    void clean(std::vector<float>& frame);
    // The same for a caller who wants the score or the level only; the frame's samples are lost.
    void listen(std::vector<float>& frame);

    void setMaskFloor(float floor) override { maskFloor_.store(floor, std::memory_order_relaxed); }
    bool switchBackgroundSpeaker(bool on) override { return stage_.switchTo(on); }
    float noiseLevelDb() const override { return meter_.levelDb(); }
    float voiceScore() const override { return voiceScore_; }
    std::size_t delay() const override { return pipeline_.delay(); }

private:
    void hear(std::span<float const> in);
    void speak(std::vector<float>& out);

    BandParams const params_;
    FrameSpectrum spectrum_;
    BandFeatures features_;
    BandNetwork network_;
    BackgroundSpeakerStage stage_;
    HopPipeline pipeline_;
    NoiseLevelMeter meter_;
    float voiceScore_;
    std::vector<float> mask_;  // of every bin
    std::atomic<float> maskFloor_ = 0.0f;
};

}  // namespace MORVA::NOISE_CANCELLER
