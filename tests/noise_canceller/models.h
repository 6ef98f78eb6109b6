// Cleaners from weight bytes, without the C interface around them, and sounds for them.
#pragma once

#include <algorithm>
#include <cmath>
#include <memory>
#include <string>

#include "noise_canceller/noise_cleaner_generations.h"
#include "noise_canceller/noise_cleaner_v0_0_6.h"
#include "noise_canceller/noise_cleaner_v1_0_0.h"
#include "noise_canceller/noise_db_cleaner_v0_0_1.h"
#include "noise_canceller/vad_cleaner_v0_0_1.h"
#include "support/captured_output.h"
#include "support/random.h"
#include "support/weight_writer.h"

namespace cleaner_test {

using MORVA::NOISE_CANCELLER::ModelEnvironment;
using MORVA::NOISE_CANCELLER::NoiseCleaner;

inline ModelEnvironment modelFrom(std::string const& bytes) {
    auto const model = MORVA::CONTAINERS::makeModelEnvironment();
    model->first = std::make_shared<MORVA::WEIGHTS::Weight>();
    model->first->read(bytes.data(), bytes.size());
    return model;
}

// A parameter as a control file sets it.
inline void setText(ModelEnvironment const& model, std::string const& key, char const* text) {
    model->second.insert<std::string>(key, text, MORVA::CONTAINERS::InsertMode::keep);
}

// The cleaner of a generation, 1 to 6, the noise-level model (0) or voice activity (7); of version
// NC_1.0.0 the sound (10), its voice score (11) and its noise level (12).
inline std::unique_ptr<NoiseCleaner> makeCleaner(int generation, ModelEnvironment const& model,
                                                 std::size_t frameMs) {
    using namespace MORVA::NOISE_CANCELLER;
    test_support::CapturedOutput const quiet(1);
    switch (generation) {
        case 0:
            return std::make_unique<NoiseDBCleaner_v0_0_1>(model, frameMs);
        case 1:
            return std::make_unique<NoiseCleaner_v0_0_1>(model, frameMs);
        case 2:
            return std::make_unique<NoiseCleaner_v0_0_2>(model, frameMs);
        case 3:
            return std::make_unique<NoiseCleaner_v0_0_3>(model, frameMs);
        case 4:
            return std::make_unique<NoiseCleaner_v0_0_4>(model, frameMs);
        case 5:
            return std::make_unique<NoiseCleaner_v0_0_5>(model, frameMs);
        case 6:
            return std::make_unique<NoiseCleaner_v0_0_6>(model, frameMs);
        case 10:
            return std::make_unique<NoiseCleaner_v1_0_0>(model, frameMs);
        case 11:
            return std::make_unique<VadCleaner_v1_0_0>(model, frameMs);
        case 12:
            return std::make_unique<NoiseDBCleaner_v1_0_0>(model, frameMs);
        default:
            return std::make_unique<VadCleaner_v0_0_1>(model, frameMs);
    }
}

// Coloured noise in steps of loudness over 70 dB, with digital silence between.
inline std::vector<std::vector<float>> randomFrames(test_support::Random& random, std::size_t count,
                                                    std::size_t size) {
    std::vector<std::vector<float>> frames;
    float gain = 0.0F;
    for (std::size_t left = 0; frames.size() < count; --left) {
        if (left == 0) {
            left = random.between(1, 12);
            gain = random.chance(0.2) ? 0.0F : std::pow(10.0F, random.uniform(0.5F, 4.0F));
        }
        auto& frame = frames.emplace_back(random.normal(size));
        for (std::size_t i = 1; i < size; ++i) frame[i] += 0.6F * frame[i - 1];
        for (float& v : frame) v = std::clamp(gain * v, -32768.0F, 32767.0F);
    }
    return frames;
}

}  // namespace cleaner_test
