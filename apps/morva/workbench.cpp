#include "workbench.h"

#include <algorithm>

#include "error.h"
#include "morva-sdk/vocabulary.h"

namespace morva::cli {
namespace {

constexpr int highestRateHz = 384000;

// The rate at which the sound passes through the engine: its own, or the next higher one that the
// engine takes, so that nothing of its band is lost; at most the engine's highest.
int engineRateFor(std::string const& sound, int rateHz) {
    auto const& taken = MORVA::MORVA_SDK::kSamplingRatesHz;
    if (rateHz <= 0 || rateHz > highestRateHz) {
        throw Error(sound + ": a rate of " + std::to_string(rateHz) +
                    " Hz is not supported (at most " + std::to_string(highestRateHz) + " Hz)");
    }
    auto const found = std::ranges::lower_bound(taken, rateHz);
    return found != taken.end() ? *found : taken.back();
}

}  // namespace

Workbench::Workbench(EngineOptions const& options)
    : streams(options.verbose),
      models(engine, options.models),
      model(modelFiles(options.model)),
      frameMs(options.frameMs),
      limitDb(options.limitDb) {}

SessionSetup Workbench::setup(ShippedKind kind, ModelFiles const& chosen, std::string const& sound,
                              int rateHz) {
    int const engineRateHz = engineRateFor(sound, rateHz);
    return {engineRateHz, frameMs, models.name(kind, chosen, engineRateHz), limitDb};
}

}  // namespace morva::cli
