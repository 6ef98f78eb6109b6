// Windows and transforms that all sessions of one model share. They are kept in the model's
// environment under names that begin with "GEN_", made by the first session that asks. [control
// thread], under the engine's lock; read-only afterwards.
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

#include "utils/fft.h"
#include "weights/model_environment.h"

namespace MORVA::NOISE_CANCELLER {

using SharedWindow = std::shared_ptr<std::vector<float> const>;
using SharedTransform = std::shared_ptr<UTILS::FFT const>;

SharedWindow sharedHammingWindow(CONTAINERS::AnyMap& environment, std::size_t length);
SharedWindow sharedTriangularWindow(CONTAINERS::AnyMap& environment, std::size_t length);
SharedWindow sharedVorbisWindow(CONTAINERS::AnyMap& environment, std::size_t length);
SharedTransform sharedTransform(CONTAINERS::AnyMap& environment, std::size_t length);

}  // namespace MORVA::NOISE_CANCELLER
