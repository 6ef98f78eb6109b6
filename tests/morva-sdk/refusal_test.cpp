// Weights and parameters that cannot run: registering them succeeds, opening a session on them is
// refused with the reason, and the engine goes on. The bad weights are generated: each value of a
// good one is made a little larger, smaller and empty. (Missing ones: see the cleaners'
// parameters.)
#include <gtest/gtest.h>

#include "engine.h"
#include "weights/value_types.h"
#include "weights/weight.h"

using namespace sdk_test;
using test_support::randomNcWeight;
using test_support::WeightWriter;

namespace {

using Matrix = MORVA::CONTAINERS::Matrix;

struct Model {
    Kind kind;
    std::string weight;
};
Model const kNc = {Kind::noise, randomNcWeight({})};
Model const kBand = {Kind::noise, randomNcWeight({.version = "NC_1.0.0"})};
Model const kVad = {Kind::voice, test_support::randomVadWeight({})};

// The first value of a name counts: what is written in front of a weight replaces its own.
template <class Value>
auto openWith(Model const& model, std::string const& name, Value const& value) {
    Engine engine;
    Engine::add("bad", WeightWriter().add(name, value).bytes() + model.weight);
    Engine::add("good", randomNcWeight({.timeStamp = "other"}));
    auto const seen = observe([&] {
        return model.kind == Kind::noise
                   ? openNc(16000, 16000, 10, "bad")
                   : Morva_VAD_CreateSession(rate(16000), duration(10), "bad");
    });
    EXPECT_EQ(cleanAll(openNc(16000, 16000, 10, "good"), voice(16000, 0.05, 1)).size(), 800U);
    return seen;
}

// Wrong sizes of a value; of a list, also those of its elements.
template <class T>
std::vector<T> wrong(T const&) {
    return {};
}
std::vector<int> wrong(int const& value) {
    return {-1 - value, value + 1, value - 1, 2000000000};
}
std::vector<Matrix> wrong(Matrix const& value) {
    std::vector<Matrix> all = {{}};
    for (std::size_t const more : {std::size_t{1}, ~std::size_t{0}}) {
        auto const rows = value.rows + more;
        auto const cols = value.cols + more;
        all.push_back({std::vector<float>(rows * value.cols), rows, value.cols});
        all.push_back({std::vector<float>(value.rows * cols), value.rows, cols});
    }
    return all;
}
template <class Element>
std::vector<std::vector<Element>> wrong(std::vector<Element> const& list) {
    std::vector<std::vector<Element>> all = {{}, {list.begin(), list.end() - 1}};
    if constexpr (std::is_same_v<Element, float>) {
        all.push_back(list);
        all.back().push_back(1.0F);
    }
    for (std::size_t i = 0; i < list.size(); ++i) {
        for (auto const& element : wrong(list[i])) {
            all.push_back(list);
            all.back()[i] = element;
        }
    }
    return all;
}

}  // namespace

TEST(RefusedWeights, WhatDoesNotFit) {
    int count = 0;
    int unread = 0;
    for (auto const& model :
         {kNc, Model{Kind::noise, randomNcWeight({.version = "0.0.5"})}, kBand, kVad}) {
        bool const isVad = model.kind == Kind::voice;
        bool const readsModulo = !isVad && model.weight != kBand.weight;
        MORVA::WEIGHTS::Weight weight;
        ASSERT_TRUE(weight.read(model.weight.data(), model.weight.size()));
        for (auto const& entry : weight.values()) {
            auto const& name = entry.first;
            // Parameters have ranges, and statistics of most noise cleaners are read modulo their
            // length.
            if (name.starts_with("Test_") || name.starts_with("CONTROL_")) continue;
            if (readsModulo && (name == "MU" || name == "SD")) continue;
            MORVA::WEIGHTS::visitValue(weight.values(), name, [&](auto const& typed) {
                for (auto const& bad : wrong(typed)) {
                    auto const seen = openWith(model, name, bad);
                    // Voice activity leaves what stands behind its state's layer unread.
                    if (seen.result != nullptr && isVad && ++unread <= 9) continue;
                    EXPECT_THAT(seen, fails<void*>(nullptr, "[A-Za-z]*", ".+")) << name;
                    ++count;
                }
            });
        }
    }
    EXPECT_GT(count, 200);
}

TEST(RefusedWeights, Reasons) {
    auto const because = [](std::string const& reason) {
        return fails<void*>(nullptr, "[A-Za-z]*", reason, ".*");
    };
    EXPECT_THAT(openWith(kNc, "Step", 0), because("Step is 0.*"));
    EXPECT_THAT(openWith(kNc, "Step", 160.0F), because("ERROR DATA With Key: Stepdoesn't exists"));
    EXPECT_THAT(openWith(kNc, "SampleRate", 48000),
                because("there are no needing Weight information in Weight "));
    EXPECT_THAT(openWith(kNc, "FiltrEnd", 158), because(".*158 bins.*COMPRESS_RATE 2.*"));
    WeightWriter::Vector const two = {1.0F, -0.0F};
    EXPECT_THAT(openWith(kNc, "SD", two), because("SD holds a zero"));
    EXPECT_THAT(openWith(kVad, "SD", WeightWriter::Vector(61, -1.0F)), because("SD .*"));
    // Bands: 40 bins, 20 twice and 20 four times as wide, two bins too many, half a bin.
    WeightWriter::Vector widths(80, 1.0F);
    std::fill(widths.begin() + 40, widths.end(), 2.0F);
    EXPECT_THAT(openWith(kBand, "BandWidths", widths), because("BandWidths .* add up to 160"));
    for (float const bad : {NAN, 0.5F, 0.0F, -1.0F, 1e10F, HUGE_VALF}) {
        widths[3] = bad;
        EXPECT_THAT(openWith(kBand, "BandWidths", widths), because("BandWidths holds .*"));
        widths[3] = 1.0F;
    }
    for (float const bad : {NAN, 0.0F, -1.0F, 1e-42F}) {
        EXPECT_THAT(openWith(kBand, "SD", WeightWriter::Vector(240, bad)), because("SD holds .*"));
    }
    EXPECT_THAT(openWith(kBand, "SampleRate", 8000), because("SampleRate is 8000.*"));
    EXPECT_THAT(openWith(kBand, "GroupBands", 3), because("GroupBands is 3, must divide.*"));
}

// The background-speaker stage is built whether it is on or not.
TEST(RefusedWeights, ParametersOfTheBackgroundSpeakerStage) {
    for (auto const& [key, value] : {std::pair{"RUN_FRAME_COUNT", 0.9F},
                                     {"RUN_FRAME_COUNT", 100001.0F},
                                     {"RUN_FRAME_COUNT", NAN},
                                     {"UTTERANCE_LEN", 0.0F},
                                     {"UTTERANCE_LEN", NAN},
                                     {"CUT_END_DB", 10.0F}}) {
        auto const name = std::string("CONTROL_MORVA_BACKGROUND_SPEAKER_FIX_") + key + "_v0_0_6";
        EXPECT_EQ(openWith(kNc, name, value).result, nullptr) << key << " " << value;
    }
}
