#include "noise_canceller/noise_cleaner_v0_0_6.h"

#include <utility>

#include "utils/diagnostics.h"

namespace MORVA::NOISE_CANCELLER {

NoiseCleaner_v0_0_6::NoiseCleaner_v0_0_6(ModelEnvironment model, std::size_t frameMs)
    : NoiseCleaner(std::move(model)), model_(*environment(), frameMs) {}

bool NoiseCleaner_v0_0_6::cleanNoise(std::vector<float>& frame) {
    model_.process(frame, [this](auto in, auto& out) { mainCleaner(in.data(), out); });
    return true;
}

bool NoiseCleaner_v0_0_6::mainCleaner(float const* in, std::vector<float>& out) {
    return model_.run(in, out);
}

bool NoiseCleaner_v0_0_6::background_speaker_fix_switch(bool on) {
    model_.switchBackgroundSpeaker(on);
    UTILS::say(UTILS::Channel::output,
               on ? "Parameter env_enable_background_speaker_fix set to: 1"
                  : "Parameter env_enable_background_speaker_fix set to: 0");
    return true;
}

}  // namespace MORVA::NOISE_CANCELLER
