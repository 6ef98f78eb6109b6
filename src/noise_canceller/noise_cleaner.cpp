#include "noise_canceller/noise_cleaner.h"

#include <limits>
#include <utility>

namespace MORVA::NOISE_CANCELLER {
namespace {

// The highest weight rate not above `rate` among the versions that suit.
template <class Suits>
ModelEnvironment nearest(std::vector<ModelEnvironment> const& environments, MorvaSamplingRate rate,
                         Suits&& suits) {
    auto bestDistance = std::numeric_limits<unsigned>::max();
    ModelEnvironment best;
    for (auto const& environment : environments) {
        if (!suits(environment->first->getWeightVersion())) continue;
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

}  // namespace

NoiseCleaner::NoiseCleaner(ModelEnvironment environment) : environment_(std::move(environment)) {}

std::string NoiseCleaner::getVersion() const {
    return environment_->first->getWeightVersion();
}

ModelEnvironment NoiseCleaner::selectModel(std::vector<ModelEnvironment> const& environments,
                                           MorvaSamplingRate rate,
                                           MORVA_SDK::MorvaSessionType type) {
    using MORVA_SDK::MorvaSessionType;
    bool const wantsSound = type == MorvaSessionType::NoiseCancellation;
    bool const wantsVad = type == MorvaSessionType::VoiceActivity;
    auto best = nearest(environments, rate, [&](std::string const& version) {
        bool const isVad = version.find("VAD") != std::string::npos;
        return isVad == wantsVad && (wantsSound || version != WEIGHTS::BAND_VERSION);
    });
    if (best || wantsSound) return best;
    // Voice and noise level are asked of the models for sound that know them too only where there
    // is no other.
    return nearest(environments, rate,
                   [](std::string const& version) { return version == WEIGHTS::BAND_VERSION; });
}

}  // namespace MORVA::NOISE_CANCELLER
