// Builds the cleaner class that matches a weight's version string and the session's type.
#include <algorithm>
#include <span>
#include <string_view>
#include <utility>

#include "noise_canceller/noise_cleaner.h"
#include "noise_canceller/noise_cleaner_generations.h"
#include "noise_canceller/noise_cleaner_v0_0_6.h"
#include "noise_canceller/noise_cleaner_v1_0_0.h"
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

template <class Cleaner>
std::unique_ptr<NoiseCleaner> buildListener(ModelEnvironment environment, std::size_t frameMs) {
    return std::make_unique<Cleaner>(std::move(environment), frameMs);
}

// A version and what builds its cleaner.
template <class Built>
using Row = std::pair<std::string_view, Built (*)(ModelEnvironment, std::size_t)>;

constexpr Row<NoiseModel> kNoiseCleaners[] = {
    {"0.0.1", buildNoiseModel<NoiseCleaner_v0_0_1>},
    {"0.0.2", buildNoiseModel<NoiseCleaner_v0_0_2>},
    {"0.0.3", buildNoiseModel<NoiseCleaner_v0_0_3>},
    {"0.0.4", buildNoiseModel<NoiseCleaner_v0_0_4>},
    {"0.0.5", buildNoiseModel<NoiseCleaner_v0_0_5>},
    {"0.0.6", buildNoiseModel<NoiseCleaner_v0_0_6>},
    {WEIGHTS::BAND_VERSION, buildNoiseModel<NoiseCleaner_v1_0_0>},
};

// What answers with one value a frame. The level of the noise comes of the weights of the fifth
// noise cleaner; the session type tells the two apart.
constexpr Row<std::unique_ptr<NoiseCleaner>> kVoiceCleaners[] = {
    {"VAD_0.0.1", buildListener<VadCleaner_v0_0_1>},
    {WEIGHTS::BAND_VERSION, buildListener<VadCleaner_v1_0_0>},
};
constexpr Row<std::unique_ptr<NoiseCleaner>> kLevelCleaners[] = {
    {"0.0.5", buildListener<NoiseDBCleaner_v0_0_1>},
    {WEIGHTS::BAND_VERSION, buildListener<NoiseDBCleaner_v1_0_0>},
};

template <class Built>
Built buildFrom(std::span<Row<Built> const> table, ModelEnvironment environment,
                MorvaFrameDuration frameMs) {
    auto const version = environment->first->getWeightVersion();
    auto const row = std::find_if(table.begin(), table.end(),
                                  [&](auto const& each) { return each.first == version; });
    if (row == table.end()) fail(kUnsupported, kLineUnsupportedVersion);
    return row->second(std::move(environment), static_cast<std::size_t>(frameMs));
}

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
    return buildFrom<NoiseModel>(
        kNoiseCleaners, requireEnvironment(rate, modelName, MorvaSessionType::NoiseCancellation),
        frameMs);
}

std::unique_ptr<NoiseCleaner> NoiseCleaner::create(MorvaSamplingRate rate,
                                                   MorvaFrameDuration frameMs,
                                                   char const* modelName, MorvaSessionType type) {
    if (type == MorvaSessionType::NoiseCancellation) {
        return createNoiseModel(rate, frameMs, modelName).cleaner;
    }
    auto environment = requireEnvironment(rate, modelName, type);
    std::span<Row<std::unique_ptr<NoiseCleaner>> const> table;
    if (type == MorvaSessionType::VoiceActivity) table = kVoiceCleaners;
    if (type == MorvaSessionType::NoiseLevel) table = kLevelCleaners;
    return buildFrom(table, std::move(environment), frameMs);
}

}  // namespace MORVA::NOISE_CANCELLER
