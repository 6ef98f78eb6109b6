#include "noise_canceller/noise_db_cleaner_v0_0_1.h"

#include <utility>

namespace MORVA::NOISE_CANCELLER {

NoiseDBCleaner_v0_0_1::NoiseDBCleaner_v0_0_1(ModelEnvironment model, std::size_t frameMs)
    : NoiseCleaner(std::move(model)),
      params_(*environment(), frameMs, generation(5)),
      model_(params_, environment()->second, generation(5), Synthesis::FromRemoved) {}

bool NoiseDBCleaner_v0_0_1::cleanNoise(std::vector<float>& frame) {
    model_.process(frame, [](std::vector<float>&) {});
    frame.assign(1, model_.noiseLevelDb());
    return true;
}

bool NoiseDBCleaner_v0_0_1::resetSession() {
    model_.reset();
    return true;
}

}  // namespace MORVA::NOISE_CANCELLER
