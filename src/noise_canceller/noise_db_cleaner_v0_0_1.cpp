#include "noise_canceller/noise_db_cleaner_v0_0_1.h"

#include <utility>

namespace MORVA::NOISE_CANCELLER {

NoiseDBCleaner_v0_0_1::NoiseDBCleaner_v0_0_1(ModelEnvironment model, std::size_t frameMs)
    : NoiseCleaner(std::move(model)), model_(*environment(), frameMs, Synthesis::FromRemoved) {}

bool NoiseDBCleaner_v0_0_1::cleanNoise(std::vector<float>& frame) {
    model_.process(frame, [this](auto in, auto& out) { model_.run(in, out); });
    frame.assign(1, model_.noiseLevelDb());
    return true;
}

bool NoiseDBCleaner_v0_0_1::resetSession() {
    model_.reset();
    return true;
}

}  // namespace MORVA::NOISE_CANCELLER
