// Builds the cleaner class that matches a weight's version string and the session's type.
#include <algorithm>
#include <iterator>

#include "noise_canceller/noise_cleaner.h"
#include "noise_canceller/noise_cleaner_generations.h"
#include "noise_canceller/noise_cleaner_v0_0_6.h"
#include "noise_canceller/noise_db_cleaner_v0_0_1.h"
#include "noise_canceller/vad_cleaner_v0_0_1.h"
#include "utils/exception.h"
#include "weights/model_registry.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

using MORVA_SDK::MorvaSessionType;

// These lines are part of the texts that callers see; they do not follow the source.
constexpr int kLineNameNotFound = 100;
constexpr int kLineNoWeight = 105;
constexpr int kLineUnsupportedVersion = 127;
constexpr char const* kUnsupported = "Unsupported weight version";

[[noreturn]] void fail(char const* message, int line) {
    throw UTILS::MORVA_Exception(message, "src/noise_canceller/noise_cleaner", line, "create");
}

template <class Cleaner>
NoiseModel buildNoiseModel(ModelEnvironment environment, std::size_t frameMs) {
    auto cleaner = std::make_unique<Cleaner>(std::move(environment), frameMs);
    SoundControls& controls = cleaner->controls();
    return {std::move(cleaner), controls};
}

struct NoiseRow {
    char const* version;
    NoiseModel (*build)(ModelEnvironment, std::size_t);
};
constexpr NoiseRow kNoiseCleaners[] = {
    {"0.0.1", buildNoiseModel<NoiseCleaner_v0_0_1>},
    {"0.0.2", buildNoiseModel<NoiseCleaner_v0_0_2>},
    {"0.0.3", buildNoiseModel<NoiseCleaner_v0_0_3>},
    {"0.0.4", buildNoiseModel<NoiseCleaner_v0_0_4>},
    {"0.0.5", buildNoiseModel<NoiseCleaner_v0_0_5>},
    {"0.0.6", buildNoiseModel<NoiseCleaner_v0_0_6>},
};

ModelEnvironment findEnvironment(MorvaSamplingRate rate, char const* modelName,
                                 MorvaSessionType type) {
    auto const& registry = WEIGHTS::ModelRegistry::current();
    if (modelName == nullptr) {
        return NoiseCleaner::selectModel(registry.environments(), rate, type);
    }
    auto const found = registry.names().find(modelName);
    if (found == registry.names().end()) {
        fail("Weight with this name isn't found", kLineNameNotFound);
    }
    return registry.environments()[found->second];
}

ModelEnvironment requireEnvironment(MorvaSamplingRate rate, char const* modelName,
                                    MorvaSessionType type) {
    auto environment = findEnvironment(rate, modelName, type);
    if (!environment) fail("Weight not found ", kLineNoWeight);
    return environment;
}

}  // namespace

NoiseModel createNoiseModel(MorvaSamplingRate rate, MorvaFrameDuration frameMs,
                            char const* modelName) {
    auto environment = requireEnvironment(rate, modelName, MorvaSessionType::NoiseCancellation);
    auto const version = environment->first->getWeightVersion();
    auto const row = std::find_if(std::begin(kNoiseCleaners), std::end(kNoiseCleaners),
                                  [&](NoiseRow const& each) { return each.version == version; });
    if (row == std::end(kNoiseCleaners)) fail(kUnsupported, kLineUnsupportedVersion);
    return row->build(std::move(environment), static_cast<std::size_t>(frameMs));
}

std::unique_ptr<NoiseCleaner> NoiseCleaner::create(MorvaSamplingRate rate,
                                                   MorvaFrameDuration frameMs,
                                                   char const* modelName, MorvaSessionType type) {
    if (type == MorvaSessionType::NoiseCancellation) {
        return createNoiseModel(rate, frameMs, modelName).cleaner;
    }
    auto environment = requireEnvironment(rate, modelName, type);
    auto const version = environment->first->getWeightVersion();
    auto const ms = static_cast<std::size_t>(frameMs);
    if (type == MorvaSessionType::VoiceActivity && version == "VAD_0.0.1") {
        return std::make_unique<VadCleaner_v0_0_1>(std::move(environment), ms);
    }
    // The noise-level model runs on the weights of the fifth noise cleaner; the session type tells
    // the two apart.
    if (type == MorvaSessionType::NoiseLevel && version == "0.0.5") {
        return std::make_unique<NoiseDBCleaner_v0_0_1>(std::move(environment), ms);
    }
    fail(kUnsupported, kLineUnsupportedVersion);
}

}  // namespace MORVA::NOISE_CANCELLER
