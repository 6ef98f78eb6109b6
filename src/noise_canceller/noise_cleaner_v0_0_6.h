// The newest noise cleaner: the layer-normalised gated network on compressed bands, and a stage
// that pushes background speakers down.
#pragma once

#include "noise_canceller/mask_model.h"
#include "noise_canceller/noise_cleaner.h"

namespace MORVA::NOISE_CANCELLER {

class NoiseCleaner_v0_0_6 : public NoiseCleaner {
public:
    using Model = MaskModel<6>;
    using Params = Model::Params;

    NoiseCleaner_v0_0_6(ModelEnvironment model, std::size_t frameMs);

    bool cleanNoise(std::vector<float>& frame) override;

    // One model frame: FrameLength samples in, as many windowed, cleaned samples out.
    bool mainCleaner(float const* in, std::vector<float>& out);

    // Switches the background-speaker stage; says so on standard output. Always true. [any thread]
    virtual bool background_speaker_fix_switch(bool on);

    SoundControls& controls() { return model_; }

private:
    Model model_;
};

}  // namespace MORVA::NOISE_CANCELLER
