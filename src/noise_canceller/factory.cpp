// Builds the cleaner class that matches a weight's version string and the session's type.
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

[[noreturn]] void fail(char const* message, int line) {
    throw UTILS::MORVA_Exception(message, "src/noise_canceller/noise_cleaner", line, "create");
}

using Builder = std::unique_ptr<NoiseCleaner> (*)(ModelEnvironment, std::size_t);

template <class Cleaner>
std::unique_ptr<NoiseCleaner> build(ModelEnvironment environment, std::size_t frameMs) {
    return std::make_unique<Cleaner>(std::move(environment), frameMs);
}

struct Row {
    MorvaSessionType type;
    char const* version;
    Builder builder;
};

constexpr Row kCleaners[] = {
    {MorvaSessionType::NoiseCancellation, "0.0.1", build<NoiseCleaner_v0_0_1>},
    {MorvaSessionType::NoiseCancellation, "0.0.2", build<NoiseCleaner_v0_0_2>},
    {MorvaSessionType::NoiseCancellation, "0.0.3", build<NoiseCleaner_v0_0_3>},
    {MorvaSessionType::NoiseCancellation, "0.0.4", build<NoiseCleaner_v0_0_4>},
    {MorvaSessionType::NoiseCancellation, "0.0.5", build<NoiseCleaner_v0_0_5>},
    {MorvaSessionType::NoiseCancellation, "0.0.6", build<NoiseCleaner_v0_0_6>},
    {MorvaSessionType::VoiceActivity, "VAD_0.0.1", build<VadCleaner_v0_0_1>},
    // The noise-level model runs on the weights of the fifth noise cleaner; the session type tells
    // the two apart.
    {MorvaSessionType::NoiseLevel, "0.0.5", build<NoiseDBCleaner_v0_0_1>},
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

}  // namespace

std::unique_ptr<NoiseCleaner> NoiseCleaner::create(MorvaSamplingRate rate,
                                                   MorvaFrameDuration frameMs,
                                                   char const* modelName, MorvaSessionType type) {
    auto environment = findEnvironment(rate, modelName, type);
    if (!environment) fail("Weight not found ", kLineNoWeight);
    auto const version = environment->first->getWeightVersion();
    for (auto const& row : kCleaners) {
        if (row.type == type && version == row.version) {
            return row.builder(std::move(environment), static_cast<std::size_t>(frameMs));
        }
    }
    fail("Unsupported weight version", kLineUnsupportedVersion);
}

}  // namespace MORVA::NOISE_CANCELLER
