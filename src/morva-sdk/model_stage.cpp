#include "morva-sdk/model_stage.h"

#include <utility>

#include "kernels/pcm.h"

namespace MORVA::MORVA_SDK {

ModelStage::ModelStage(std::unique_ptr<NOISE_CANCELLER::NoiseCleaner> cleaner,
                       std::size_t inputFrame, MorvaFrameDuration duration)
    : modelFrame_(getSampleCount(duration, cleaner->environment()->first->getWeightInfo().first)),
      toModel_(inputFrame, modelFrame_),
      cleaner_(std::move(cleaner)) {}

void ModelStage::run(std::vector<float>& frame) {
    toModel_.convert(frame);
    UTILS::clipToPcm16(frame);
    cleaner_->cleanNoise(frame);
}

void ModelStage::reset() {
    cleaner_->resetSession();
    toModel_.reset();
}

}  // namespace MORVA::MORVA_SDK
