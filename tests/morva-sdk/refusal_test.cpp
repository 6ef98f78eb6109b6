// Weights and parameters that cannot run: registering them succeeds, opening a session on them is
// refused with the reason, and the engine goes on. The bad weights are generated: each value of a
// good one is made a little larger, smaller and empty. (Missing ones: see the cleaners'
// parameters.)
#include <gtest/gtest.h>

#include <sstream>

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
         {kNc, Model{Kind::noise, randomNcWeight({.version = "0.0.5"})}, kVad}) {
        bool const isVad = model.kind == Kind::voice;
        MORVA::WEIGHTS::Weight weight;
        ASSERT_TRUE(weight.read(model.weight.data(), model.weight.size()));
        for (auto const& [name, object] : weight.values()) {
            // Parameters have ranges, and statistics of noise cleaners are read modulo their
            // length.
            if (name.starts_with("Test_") || name.starts_with("CONTROL_")) continue;
            if (!isVad && (name == "MU" || name == "SD")) continue;
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
    auto const because = [](std::string const& reason, std::string const& place = ".*") {
        return fails<void*>(nullptr, "[A-Za-z]*", reason, place);
    };
    WeightWriter::Vector const two = {1.0F, -0.0F};
    EXPECT_THAT(openWith(kNc, "Step", 0), because("Step is 0.*"));
    EXPECT_THAT(openWith(kNc, "Step", 160.0F),
                because("ERROR DATA With Key: Stepdoesn't exists", "src/weights/weight Line 90"));
    EXPECT_THAT(openWith(kNc, "FrameLength", 640), because("FrameLength is 640.*"));
    EXPECT_THAT(openWith(kNc, "SampleRate", 48000),
                because("there are no needing Weight information in Weight ",
                        "src/weights/weight Line 339"));
    EXPECT_THAT(openWith(kNc, "FiltrEnd", 158), because(".*158 bins.*COMPRESS_RATE 2.*"));
    EXPECT_THAT(openWith(kNc, "SD", two), because("SD holds a zero"));
    EXPECT_THAT(openWith(kNc, "MU", WeightWriter::Vector{}), because("MU or SD is empty"));
    EXPECT_THAT(openWith(kNc, "WeightGRU", Matrix{WeightWriter::Vector(496), 248, 2}),
                because("WeightGRU is 248 x 2, must be 248 x 8"));
    EXPECT_THAT(openWith(kNc, "BaesGRU", two), because("BaesGRU has 2 .* 8"));
    EXPECT_THAT(openWith(kVad, "FrameLength", 320), because("MU has 61 .* 81"));
    EXPECT_THAT(openWith(kVad, "SD", WeightWriter::Vector(61, -1.0F)), because("SD .*"));
    EXPECT_THAT(openWith(kVad, "WeightNonLinear", WeightWriter::Matrices{}), because(".*state.*"));
}

// The background-speaker stage is built whether it is on or not.
TEST(RefusedParameters, OfTheBackgroundSpeakerStage) {
    test_support::TempDir dir;
    Engine engine(dir.path().wstring().c_str());
    dir.write("a.mvw", randomNcWeight({}));
    auto const expectOpen = [&](bool opens, std::string const& key, std::string const& values) {
        std::istringstream words(values);
        for (std::string value; words >> value;) {
            auto const name = key + value;
            dir.write(name + ".cfg", "WEIGHT a.mvw\nMORVA_BACKGROUND_SPEAKER_FIX_" + key +
                                         "_v0_0_6 " + value + "\n");
            EXPECT_EQ(Engine::addFile(name + ".cfg", name.c_str()).result, 0);
            auto const seen = observe([&] { return openNc(16000, 16000, 10, name.c_str()); });
            EXPECT_EQ(seen.result != nullptr, opens) << name;
        }
    };
    expectOpen(false, "RUN_FRAME_COUNT", "0 0.9 -1 100001 nan inf 1e30 word");
    expectOpen(true, "RUN_FRAME_COUNT", "1 1.9 100000");
    expectOpen(false, "UTTERANCE_LEN", "0 -1 nan");
    expectOpen(false, "CUT_START_DB", "15");
    expectOpen(false, "CUT_END_DB", "10");
    expectOpen(true, "CUT_END_DB", "9");
}
