#include "workbench.h"

#include "rates.h"

namespace morva::cli {

Workbench::Workbench(EngineOptions const& options)
    : streams(options.verbose),
      engine(streams),
      models(engine, options.models),
      model(modelFiles(options.model)),
      frameMs(options.frameMs) {}

SessionSetup Workbench::setup(ShippedKind kind, ModelFiles const& chosen, std::string const& sound,
                              int rateHz) {
    int const engineRateHz = requireEngineRate(sound, rateHz);
    return {engineRateHz, frameMs, models.name(kind, chosen, engineRateHz)};
}

}  // namespace morva::cli
