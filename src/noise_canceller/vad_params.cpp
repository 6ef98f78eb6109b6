#include "noise_canceller/vad_params.h"

#include <algorithm>
#include <cmath>
#include <string>

#include "noise_canceller/vad_features.h"
#include "weights/weight.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

using Values = std::vector<float>;

// Points that coincide (or are not numbers) cannot span a scale: they count as absent.
std::optional<Calibration> readCalibration(WEIGHTS::Weight const& weight) {
    auto const range = weight.values().find<Values>("Test_MINMAX");
    auto const middle = weight.values().find<Values>("Test_BestF1");
    if (!range || !middle || range->size() < 2 || middle->empty()) return std::nullopt;
    Calibration const points{(*range)[0], (*middle)[0], (*range)[1]};
    bool const finite =
        std::isfinite(points.low) && std::isfinite(points.middle) && std::isfinite(points.high);
    if (!finite || points.middle == points.low || points.high == points.middle) {
        return std::nullopt;
    }
    return points;
}

// Of the two environment keys the second decides when both are there; without either the weight's
// own entry does.
bool readStateReset(VadParams::Environment const& environment) {
    std::string const key = "MORVA_VAD_ENABLE_STATE_RESET_v0_0_1";
    std::string const controlKey = "CONTROL_" + key;
    auto const first = environment.second.find<std::string>(key);
    auto const second = environment.second.find<std::string>(controlKey);
    if (first || second) return (second ? *second : *first) == "TRUE";
    auto const stored = environment.first->values().find<std::string>(controlKey);
    return stored && *stored == "t";
}

std::size_t readFrameLength(WEIGHTS::Weight const& weight) {
    int const length = weight.getReference<int>("FrameLength");
    weight.getWeightInfo();  // refuses rates and lengths that the sessions do not know
    return static_cast<std::size_t>(length);
}

}  // namespace

float Calibration::apply(float raw) const {
    float const score = raw >= middle ? (raw - middle) * 0.5f / (high - middle) + 0.5f
                                      : (raw - low) * 0.5f / (middle - low);
    if (score > 0.99999f) return 0.99999f;
    if (score < 0.00001f) return 0.00001f;
    return score;
}

VadParams::VadParams(Environment& environment)
    : FeatureStatistics(*environment.first),
      GatedWeights(*environment.first),
      sampleRate(static_cast<std::size_t>(environment.first->getReference<int>("SampleRate"))),
      frameLength(readFrameLength(*environment.first)),
      bins(frameLength / 2 + 1),
      featureCount(pooledBandCount(bins)),
      stateSize(weightNonLinear.empty() ? 0 : weightNonLinear.back().rows),
      calibration(readCalibration(*environment.first)),
      enableStateReset(readStateReset(environment)) {
    checkShapes();
    std::size_t const layers = weightLinear.size();
    packed = sharedPackedNetwork(environment.second, static_cast<GatedWeights const&>(*this),
                                 {layers - 1, layers});
    hammingWindow = sharedHammingWindow(environment.second, frameLength);
    transform = sharedTransform(environment.second, frameLength);
}

float VadParams::standardise(float value, std::size_t k) const {
    return (value - mu[k]) / std::sqrt(sd[k] + kEpsilon);
}

void VadParams::checkShapes() const {
    requireLength("MU", mu, featureCount);
    requireLength("SD", sd, featureCount);
    if (!std::all_of(sd.begin(), sd.end(), [](float v) { return v + kEpsilon > 0.0f; })) {
        refuseWeight("SD holds a variance that is not positive");
    }
    std::size_t const features = (kContextFrames + 1) * featureCount;
    checkGate(stateSize, features);

    requireCount("WeightLinear", weightLinear.size(), 1);
    std::size_t const hidden = weightLinear.size() - 1;
    requireCount("BaesLinear", baesLinear.size(), hidden + 1);
    requireCount("WeightNonLinear", weightNonLinear.size(), hidden);
    requireCount("BaesNonLinear", baesNonLinear.size(), hidden);
    std::size_t const width = checkHiddenLayers(hidden, stateSize + features, stateSize);
    requireShape("WeightLinear", weightLinear.back(), width, 1);
    requireLength("BaesLinear", baesLinear[hidden], 1);
}

}  // namespace MORVA::NOISE_CANCELLER
