// Windows, transforms and packed matrices that all sessions of one model share. They are kept in
// the model's environment under names that begin with "GEN_", made by the first session that asks.
// [control thread], under the engine's lock; read-only afterwards.
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

#include "kernels/fft.h"
#include "noise_canceller/network_weights.h"
#include "weights/model_environment.h"

namespace MORVA::NOISE_CANCELLER {

using SharedWindow = std::shared_ptr<std::vector<float> const>;
using SharedTransform = std::shared_ptr<UTILS::FFT const>;

namespace detail {

// An environment value of another type under the same name (a control file may hold any key) gives
// way.
template <class T, class Make>
std::shared_ptr<T> findOrMake(CONTAINERS::AnyMap& environment, char const* name, Make&& make) {
    if (auto found = environment.find<T>(name)) return found;
    environment.insert<T>(name, make(), CONTAINERS::InsertMode::replace);
    return environment.find<T>(name);
}

}  // namespace detail

SharedWindow sharedHammingWindow(CONTAINERS::AnyMap& environment, std::size_t length);
SharedWindow sharedTriangularWindow(CONTAINERS::AnyMap& environment, std::size_t length);
SharedWindow sharedVorbisWindow(CONTAINERS::AnyMap& environment, std::size_t length);
SharedTransform sharedTransform(CONTAINERS::AnyMap& environment, std::size_t length);

// The network's matrices packed for fast products; `weights` have been checked.
template <class NetworkWeights>
std::shared_ptr<PackedNetwork const> sharedPackedNetwork(CONTAINERS::AnyMap& environment,
                                                         NetworkWeights const& weights,
                                                         LayerCounts const& used) {
    return detail::findOrMake<PackedNetwork>(environment, "GEN_PackedNetwork", [&] {
        return packNetwork(weights, weights.gates(), used);
    });
}

}  // namespace MORVA::NOISE_CANCELLER
