#include "noise_canceller/vad_cleaner_v0_0_1.h"

#include <algorithm>
#include <utility>

#include "kernels/elementary.h"
#include "kernels/vector_math.h"
#include "utils/diagnostics.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

constexpr std::size_t kFrameDurationsMs[] = {10, 15, 20, 30, 32, 40};

}  // namespace

VadCleaner_v0_0_1::VadCleaner_v0_0_1(ModelEnvironment model, std::size_t frameMs)
    : NoiseCleaner(std::move(model)),
      params_(*environment()),
      samples_(5 * params_.frameLength),
      features_((5 * Params::kContextFrames + 5) * params_.featureCount),
      state_(params_.stateSize),
      windowed_(params_.frameLength),
      spectrum_(params_.bins),
      powers_(params_.bins) {
    if (std::find(std::begin(kFrameDurationsMs), std::end(kFrameDurationsMs), frameMs) ==
        std::end(kFrameDurationsMs)) {
        UTILS::say(UTILS::Channel::output, "ERROR FRAMEDURATIONS");
    }
    resetSession();
}

bool VadCleaner_v0_0_1::resetSession() {
    level_ = LevelTracker();
    watchdog_ = StateWatchdog();
    std::fill(state_.begin(), state_.end(), 0.0f);
    samples_.start = samples_.end = 0;
    samples_.push_backNULL(params_.frameLength);
    features_.start = features_.end = 0;
    fillContext();
    return true;
}

// The first frame already sees a full context, of silence.
void VadCleaner_v0_0_1::fillContext() {
    std::vector<float> silence(params_.featureCount);
    for (std::size_t k = 0; k < silence.size(); ++k) silence[k] = params_.standardise(0.0f, k);
    // One frame more than the context holds, since every new frame first drops the oldest.
    for (std::size_t i = 0; i <= Params::kContextFrames; ++i) {
        features_.push_back(silence.data(), silence.size());
    }
}

bool VadCleaner_v0_0_1::cleanNoise(std::vector<float>& frame) {
    float const gain = level_.gainFor(frame);
    samples_.push_backNULL(frame.size());
    float* const newest = samples_.data.data() + samples_.end - frame.size();
    for (std::size_t i = 0; i < frame.size(); ++i) newest[i] = frame[i] * gain;
    samples_.start += frame.size();

    float const raw = probabilityCalc(samples_.readPosition(), params_.frameLength);
    frame.assign(1, params_.calibration ? params_.calibration->apply(raw) : raw);
    return true;
}

float VadCleaner_v0_0_1::probabilityCalc(float const* window, std::size_t n) {
    UTIL_FUNCTIONS::multiply(window, params_.hammingWindow->data(), windowed_.data(), n);
    params_.transform->computeForward(windowed_, spectrum_);
    powers_.resize(spectrum_.size());
    std::transform(
        spectrum_.begin(), spectrum_.end(), powers_.begin(),
        [](std::complex<float> bin) { return bin.real() * bin.real() + bin.imag() * bin.imag(); });
    poolBands(powers_);
    for (float& power : powers_) power += 1.0f;
    UTILS::logarithms(powers_);
    for (std::size_t k = 0; k < powers_.size(); ++k) {
        powers_[k] = params_.standardise(powers_[k], k);
    }
    features_.start += powers_.size();
    features_.push_back(powers_.data(), powers_.size());
    x_.assign(features_.readPosition(), features_.readPosition() + features_.unread());
    NOISE_CLEANER_FUNCTIONS::calcRMForwardProp_GRU_VAD_Modify(state_, x_, params_, scratch_);
    float const logit = x_.front();
    if (params_.enableStateReset) state_reset_functionality(logit);
    return logit;
}

void VadCleaner_v0_0_1::state_reset_functionality(float logit) {
    if (watchdog_.observe(logit)) std::fill(state_.begin(), state_.end(), 0.0f);
}

}  // namespace MORVA::NOISE_CANCELLER
