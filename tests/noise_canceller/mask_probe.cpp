// What the network of a noise model puts out for each model frame of a recording, before the mask
// is shaped: for the comparison with the training code, which loads this library.
#include <algorithm>
#include <cstddef>
#include <memory>
#include <vector>

#include "noise_canceller/mask_model.h"
#include "weights/model_environment.h"

namespace {

using namespace MORVA;
using namespace MORVA::NOISE_CANCELLER;

struct Recording {
    float const* samples;  // 16-bit scale, at the model's rate
    std::size_t count;
};

// Writes frames x bands values from `masks` on, `room` at most; the number of values written.
template <int number>
std::size_t networkOutput(CONTAINERS::ModelEnvironment const& environment,
                          Recording const& recording, float* masks, std::size_t room) {
    typename MaskModel<number>::Params const params(*environment, 10);
    SpectralCleaner spectral(params, params, environment->second, generation(number),
                             Synthesis::FromKept);
    std::vector<float> state(params.stateWidth());
    std::vector<float> x;
    NetworkScratch scratch;
    std::size_t written = 0;
    for (std::size_t at = 0; at + params.frameLength <= recording.count; at += params.step) {
        spectral.analyse(recording.samples + at, x);
        runNetwork(state, x, params, scratch);
        if (written + x.size() > room) break;
        std::ranges::copy(x, masks + written);
        written += x.size();
    }
    return written;
}

}  // namespace

// Of a weight of version 0.0.6 or 0.0.5; 0 when it cannot be used.
extern "C" __attribute__((visibility("default"))) std::size_t mask_probe(
    char const* weight, std::size_t size, float const* samples, std::size_t count, float* masks,
    std::size_t room) try {
    auto const environment = CONTAINERS::makeModelEnvironment();
    environment->first = std::make_shared<WEIGHTS::Weight>();
    environment->first->read(weight, size);
    bool const newest = environment->first->getReference<std::string>("Version") == "0.0.6";
    Recording const recording{samples, count};
    return newest ? networkOutput<6>(environment, recording, masks, room)
                  : networkOutput<5>(environment, recording, masks, room);
} catch (...) {
    return 0;
}
