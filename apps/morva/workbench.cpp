#include "workbench.h"

#include <algorithm>

#include "error.h"
#include "morva-sdk/vocabulary.h"

namespace morva::cli {
namespace {

// The rate at which the sound passes through the engine: its own, or the next higher one that the
// engine takes, so that nothing of its band is lost.
int engineRateFor(std::string const& sound, int rateHz) {
    auto const& taken = MORVA::MORVA_SDK::kSamplingRatesHz;
    auto const found = std::ranges::lower_bound(taken, rateHz);
    if (rateHz > 0 && found != taken.end()) return *found;
    throw Error(sound + ": a rate of " + std::to_string(rateHz) + " Hz is not supported (at most " +
                std::to_string(taken.back()) + " Hz)");
}

}  // namespace

Workbench::Workbench(EngineOptions const& options)
    : streams(options.verbose),
      models(engine, options.models),
      model(modelFiles(options.model)),
      frameMs(options.frameMs) {}

SessionSetup Workbench::setup(ShippedKind kind, ModelFiles const& chosen, std::string const& sound,
                              int rateHz) {
    int const engineRateHz = engineRateFor(sound, rateHz);
    return {engineRateHz, frameMs, models.name(kind, chosen, engineRateHz)};
}

}  // namespace morva::cli
