#include "noise_canceller/shared_objects.h"

#include "kernels/windows.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

using detail::findOrMake;

template <class Generator>
SharedWindow window(CONTAINERS::AnyMap& environment, char const* name, std::size_t length,
                    Generator&& generate) {
    return findOrMake<std::vector<float>>(environment, name, [&] {
        std::vector<float> values(length);
        generate(length, values.data(), values.size());
        return values;
    });
}

}  // namespace

SharedWindow sharedHammingWindow(CONTAINERS::AnyMap& environment, std::size_t length) {
    return window(environment, "GEN_HammingWindow", length,
                  UTIL_FUNCTIONS::generateHammingWindowVector);
}

SharedWindow sharedTriangularWindow(CONTAINERS::AnyMap& environment, std::size_t length) {
    return window(environment, "GEN_TriangularWindow", length,
                  UTIL_FUNCTIONS::generateTriangularWindowVector);
}

SharedWindow sharedVorbisWindow(CONTAINERS::AnyMap& environment, std::size_t length) {
    return window(environment, "GEN_VorbisWindow", length,
                  UTIL_FUNCTIONS::generateVorbisWindowVector);
}

SharedTransform sharedTransform(CONTAINERS::AnyMap& environment, std::size_t length) {
    return *findOrMake<std::shared_ptr<UTILS::FFT>>(environment, "GEN_FFTCalculator",
                                                    [&] { return UTILS::FFT::create(length); });
}

}  // namespace MORVA::NOISE_CANCELLER
