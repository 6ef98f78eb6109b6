#include "noise_canceller/noise_cleaner.h"

#include <limits>
#include <utility>

namespace MORVA::NOISE_CANCELLER {

NoiseCleaner::NoiseCleaner(ModelEnvironment environment) : environment_(std::move(environment)) {}

std::string NoiseCleaner::getVersion() const {
    return environment_->first->getWeightVersion();
}

ModelEnvironment NoiseCleaner::selectModel(std::vector<ModelEnvironment> const& environments,
                                           MorvaSamplingRate rate,
                                           MORVA_SDK::MorvaSessionType type) {
    bool const wantsVad = type == MORVA_SDK::MorvaSessionType::VoiceActivity;
    auto bestDistance = std::numeric_limits<unsigned>::max();
    ModelEnvironment best;
    for (auto const& environment : environments) {
        bool const isVad = environment->first->getWeightVersion().find("VAD") != std::string::npos;
        if (isVad != wantsVad) continue;
        auto const weightRate = static_cast<unsigned>(environment->first->getWeightInfo().first);
        auto const wantedRate = static_cast<unsigned>(rate);
        if (weightRate > wantedRate) continue;
        unsigned const distance = wantedRate - weightRate;
        if (distance < bestDistance) {
            bestDistance = distance;
            best = environment;
        }
        if (distance == 0) break;
    }
    return best;
}

}  // namespace MORVA::NOISE_CANCELLER
