#include "noise_canceller/band_model.h"

#include <limits>

namespace MORVA::NOISE_CANCELLER {
namespace {

constexpr float kNotYet = std::numeric_limits<float>::quiet_NaN();

}  // namespace

BandParams::BandParams(Environment& environment, std::size_t frameMs)
    : BackgroundSpeakerStage::Params(ParameterReader(environment, kSuffix)),
      sessionFrameMs(frameMs) {
    auto const& weight = *environment.first;
    sampleRate = positiveNumber(weight, "SampleRate");
    step = positiveNumber(weight, "Step");
    frameLength = positiveNumber(weight, "FrameLength");
    if (sampleRate != 16000 && sampleRate != 48000) {
        refuseStructure("SampleRate is " + std::to_string(sampleRate) + ", must be 16000 or 48000");
    }
    constexpr std::size_t kFrameMs[] = {20};
    checkLengths(weight, kFrameMs, "20 ms");
    FrameTunables::read(ParameterReader(environment, kSuffix), LevelReference::MeanEnergy);
    weights = detail::findOrMake<BandWeights>(environment.second, "GEN_BandWeights", [&] {
        return readBandWeights(weight, frameLength / 2);
    });
}

BandModel::BandModel(BandParams::Environment& environment, std::size_t frameMs)
    : params_(environment, frameMs),
      spectrum_(params_, params_, environment.second, WindowPair::Vorbis, Synthesis::FromKept),
      features_(params_.weights->layout, params_.weights->shape.kinds),
      network_(params_.weights),
      stage_(params_, params_.modelFrameMs, spectrum_.synthesisWindow()),
      pipeline_(params_.pipeline(frameMs)),
      voiceScore_(kNotYet),
      mask_(params_.bins()) {}

void BandModel::reset() {
    spectrum_.reset();
    features_.reset();
    network_.reset();
    pipeline_.reset();
    meter_.reset();
    voiceScore_ = kNotYet;
}

void BandModel::hear(std::span<float const> in) {
    auto const& spectrum = spectrum_.analyse(in);
    network_.run(features_.of(spectrum, spectrum_.levelGain(in)));
    voiceScore_ = network_.voiceScore();
    // The window halves the power of a frame, and half of its spectrum is mirrored.
    auto const length = static_cast<double>(params_.frameLength);
    double const noise = features_.powerOf(network_.noiseShares());
    meter_.add(static_cast<float>(noise * 4.0 / (length * length)));
}

void BandModel::speak(std::vector<float>& out) {
    params_.weights->layout.expand(network_.masks(), mask_);
    mask_.resize(params_.bins());  // at half the rate there is no sound
    spectrum_.applyMask(mask_, maskFloor_.load(std::memory_order_relaxed));
    stage_(spectrum_.frame());
    spectrum_.finish(out);
}

void BandModel::clean(std::vector<float>& frame) {
    pipeline_.process(frame, [this](std::span<float const> in, std::vector<float>& out) {
        hear(in);
        speak(out);
    });
}

void BandModel::listen(std::vector<float>& frame) {
    pipeline_.process(frame, [this](std::span<float const> in, std::vector<float>&) { hear(in); });
}

}  // namespace MORVA::NOISE_CANCELLER
