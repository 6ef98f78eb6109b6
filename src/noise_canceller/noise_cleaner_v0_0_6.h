// The newest noise cleaner: the layer-normalised gated network on compressed bands, and a stage
// that pushes background speakers down. One thread at a time.
#pragma once

#include <atomic>
#include <memory>

#include "noise_canceller/mask_controls.h"
#include "noise_canceller/mask_model.h"
#include "noise_canceller/noise_cleaner.h"
#include "utils/background_speaker_fix.h"

namespace MORVA::NOISE_CANCELLER {

class NoiseCleaner_v0_0_6 : public NoiseCleaner, public MaskControls {
public:
    using Model = MaskModel<LayernormWeights>;
    struct Params : Model::Params {
        Params(Model::Params::Environment& environment, std::size_t frameMs);

        bool enableBackgroundSpeakerFix;
        float cutStartDb;
        float cutEndDb;
        unsigned long runFrameCount;
        unsigned long runMinLen;
        float utteranceLen;  // seconds
        bool varWindMode;
    };

    NoiseCleaner_v0_0_6(ModelEnvironment model, std::size_t frameMs);

    bool cleanNoise(std::vector<float>& frame) override;

    // One model frame: FrameLength samples in, as many windowed, cleaned samples out.
    bool mainCleaner(float const* in, std::vector<float>& out);

    // Switches the background-speaker stage; says so on standard output. Always true. [any thread]
    virtual bool background_speaker_fix_switch(bool on);

    void setMaskFloor(float floor) override { model_.setMaskFloor(floor); }
    float noiseLevelDb() const override { return model_.noiseLevelDb(); }
    bool switchBackgroundSpeaker(bool on) override {
        backgroundSpeakerOn_ = on;
        return true;
    }

private:
    void suppressBackgroundSpeaker(std::vector<float>& frame);

    Params params_;
    Model model_;
    std::shared_ptr<UTILS::BackgroundSpeakerFix> backgroundSpeakerFix_;
    std::atomic<bool> backgroundSpeakerOn_;
};

}  // namespace MORVA::NOISE_CANCELLER
