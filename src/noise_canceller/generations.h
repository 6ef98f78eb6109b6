// Which parts the noise models of each weight version are made of. Each generation is the next one
// with fewer of them.
//
//   version  windows               level reference      bands       network                  stage
//   0.0.1    Hamming / triangular  running noise mean   every bin   feed-forward
//   0.0.2    Vorbis                running noise mean   every bin   feed-forward
//   0.0.3    Vorbis                mean energy          every bin   gated
//   0.0.4    Vorbis                mean energy          compressed  gated
//   0.0.5    Vorbis                mean energy          compressed  gated
//   0.0.6    Vorbis                mean energy          compressed  gated, layer-normalised speaker
//
// Version NC_1.0.0 shares the frames around its network with them, and is a model of its own
// (band_model.h).
#pragma once

#include <type_traits>

#include "noise_canceller/background_speaker_stage.h"
#include "noise_canceller/network_weights.h"
#include "noise_canceller/spectral_params.h"

namespace MORVA::NOISE_CANCELLER {

inline constexpr Generation kGenerations[] = {
    {"_v0_0_1", WindowPair::HammingTriangular, LevelReference::RunningNoiseMean, false, false},
    {"_v0_0_2", WindowPair::Vorbis, LevelReference::RunningNoiseMean, false, false},
    {"_v0_0_3", WindowPair::Vorbis, LevelReference::MeanEnergy, false, false},
    {"_v0_0_4", WindowPair::Vorbis, LevelReference::MeanEnergy, true, false},
    {"_v0_0_5", WindowPair::Vorbis, LevelReference::MeanEnergy, true, false},
    {"_v0_0_6", WindowPair::Vorbis, LevelReference::MeanEnergy, true, true},
};
constexpr Generation const& generation(int number) {
    return kGenerations[number - 1];
}

template <int number>
using NetworkOf =
    std::conditional_t<number <= 2, FeedForwardWeights,
                       std::conditional_t<number <= 5, GatedWeights, LayernormWeights>>;

template <int number>
using StageOf = std::conditional_t<number == 6, BackgroundSpeakerStage, NoStage>;

}  // namespace MORVA::NOISE_CANCELLER
