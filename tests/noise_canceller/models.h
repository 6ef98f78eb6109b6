// Cleaners from weight bytes, without the C interface around them.
#pragma once

#include <memory>
#include <string>

#include "noise_canceller/noise_cleaner_generations.h"
#include "noise_canceller/noise_cleaner_v0_0_6.h"
#include "noise_canceller/noise_db_cleaner_v0_0_1.h"
#include "noise_canceller/vad_cleaner_v0_0_1.h"
#include "support/captured_output.h"
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

// The cleaner of a generation, 1 to 6, the noise-level model (0) or voice activity (7).
inline std::unique_ptr<NoiseCleaner> makeCleaner(int generation, ModelEnvironment const& model,
                                                 std::size_t frameMs) {
    using namespace MORVA::NOISE_CANCELLER;
    using Maker = std::unique_ptr<NoiseCleaner> (*)(ModelEnvironment const&, std::size_t);
    auto const of = []<class Cleaner>() -> Maker {
        return [](ModelEnvironment const& m, std::size_t ms) -> std::unique_ptr<NoiseCleaner> {
            return std::make_unique<Cleaner>(m, ms);
        };
    };
    static Maker const makers[] = {of.template operator()<NoiseDBCleaner_v0_0_1>(),
                                   of.template operator()<NoiseCleaner_v0_0_1>(),
                                   of.template operator()<NoiseCleaner_v0_0_2>(),
                                   of.template operator()<NoiseCleaner_v0_0_3>(),
                                   of.template operator()<NoiseCleaner_v0_0_4>(),
                                   of.template operator()<NoiseCleaner_v0_0_5>(),
                                   of.template operator()<NoiseCleaner_v0_0_6>(),
                                   of.template operator()<VadCleaner_v0_0_1>()};
    test_support::CapturedOutput const quiet(1);
    return makers[generation](model, frameMs);
}

}  // namespace cleaner_test
