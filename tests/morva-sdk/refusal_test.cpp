// Weights and parameters that cannot run: registering them succeeds, opening a session on them is
// refused with the reason, and the engine goes on. The bad weights are generated: each value of a
// good one is taken away, made a little larger, smaller and empty.
#include <gtest/gtest.h>

#include "engine.h"
#include "support/reference_reader.h"
#include "weights/value_types.h"
#include "weights/weight.h"

using namespace sdk_test;
using test_support::randomNcWeight;
using test_support::randomVadWeight;
using test_support::WeightWriter;

namespace {

using Matrix = MORVA::CONTAINERS::Matrix;

void* openNc16(char const* model) {
    return openNc(16000, 16000, 10, model);
}
void* openVad16(char const* model) {
    return Morva_VAD_CreateSession(rate(16000), duration(10), model);
}

struct Model {
    std::string weight;
    void* (*open)(char const*);
};
Model const kKinds[] = {{randomNcWeight({}), openNc16},
                        {randomNcWeight({.version = "0.0.5"}), openNc16},
                        {randomVadWeight({}), openVad16}};

// The first value of a name counts: what is written in front of a weight replaces its own.
auto openChanged(Model const& kind, std::string const& change) {
    Engine engine;
    EXPECT_EQ(Engine::add("bad", change + kind.weight), 0);
    EXPECT_EQ(Engine::add("good", randomNcWeight({.timeStamp = "other"})), 0);
    auto const seen = observe([&] { return kind.open("bad"); });
    EXPECT_EQ(cleanAll(openNc16("good"), voice(16000, 0.05, 1)).size(), 800U);
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
std::vector<WeightWriter::Vector> wrong(WeightWriter::Vector const& value) {
    auto longer = value;
    longer.push_back(1.0F);
    return {{}, longer, {value.begin(), value.end() - 1}};
}
std::vector<Matrix> wrong(Matrix const& value) {
    std::vector<Matrix> all = {{}};
    for (auto const& [rows, cols] : {std::pair{value.rows + 1, value.cols},
                                     {value.rows - 1, value.cols},
                                     {value.rows, value.cols + 1},
                                     {value.rows, value.cols - 1}}) {
        all.push_back({WeightWriter::Vector(rows * cols), rows, cols});
    }
    return all;
}
template <class Element>
std::vector<std::vector<Element>> wrong(std::vector<Element> const& list) {
    std::vector<std::vector<Element>> all = {{}, {list.begin(), list.end() - 1}};
    for (std::size_t i = 0; i < list.size(); ++i) {
        for (auto const& element : wrong(list[i])) {
            all.push_back(list);
            all.back()[i] = element;
        }
    }
    return all;
}

// Texts are compared elsewhere; 3 gives other bands that fit as well.
bool isOptional(std::string const& name) {
    return name.starts_with("Test_") || name.starts_with("CONTROL_") || name == "ModelName" ||
           name == "TimeStamp" || name == "Version";
}

}  // namespace

TEST(RefusedWeights, WhatIsMissingOrDoesNotFit) {
    int count = 0;
    int unread = 0;
    for (auto const& kind : kKinds) {
        bool const isVad = kind.open == openVad16;
        MORVA::WEIGHTS::Weight weight;
        ASSERT_TRUE(weight.read(kind.weight.data(), kind.weight.size()));
        for (auto const& [name, record] : test_support::ReferenceReader(kind.weight).read()) {
            SCOPED_TRACE(name);
            if (isOptional(name)) continue;
            Model without = kind;
            without.weight[without.weight.find(record) + 4] = '#';
            if (!isVad || (name != "SampleRate" && name != "FrameLength")) {
                EXPECT_THAT(openChanged(without, ""),
                            fails<void*>(nullptr, "getReference",
                                         "ERROR DATA With Key: " + name + "doesn't exists",
                                         "src/weights/weight Line 90"));
            }
            // Statistics of noise cleaners are read modulo their length.
            if (!isVad && (name == "MU" || name == "SD")) continue;
            MORVA::WEIGHTS::visitValue(weight.values(), name, [&](auto const& typed) {
                for (auto const& bad : wrong(typed)) {
                    auto const seen = openChanged(kind, WeightWriter().add(name, bad).bytes());
                    // Voice activity leaves what stands behind its state's layer unread.
                    if (seen.result != nullptr && isVad && ++unread <= 9) continue;
                    EXPECT_THAT(seen, fails<void*>(nullptr, "[A-Za-z]*", ".+"));
                    ++count;
                }
            });
        }
    }
    EXPECT_GT(count, 200);
}

TEST(RefusedWeights, Reasons) {
    auto const refusal = [](Model const& kind, auto const& name, auto const& value) {
        return openChanged(kind, WeightWriter().add(name, value).bytes());
    };
    auto const because = [](std::string const& reason) {
        return fails<void*>(nullptr, "[A-Za-z]*", reason);
    };
    std::string const noInfo = "there are no needing Weight information in Weight ";
    auto const& nc = kKinds[0];
    auto const& vad = kKinds[2];
    WeightWriter::Vector const two = {1.0F, -0.0F};
    EXPECT_THAT(refusal(nc, "Step", 0), because("Step is 0.*"));
    EXPECT_THAT(refusal(nc, "Step", 160.0F), because("ERROR DATA With Key: Stepdoesn't exists"));
    EXPECT_THAT(refusal(nc, "FrameLength", 640), because("FrameLength is 640.*"));
    EXPECT_THAT(refusal(nc, "SampleRate", 48000), because(noInfo));
    EXPECT_THAT(refusal(nc, "FiltrEnd", 158), because(".*158 bins.*COMPRESS_RATE 2.*"));
    EXPECT_THAT(refusal(nc, "SD", two), because("SD holds a zero"));
    EXPECT_THAT(refusal(nc, "MU", WeightWriter::Vector{}), because("MU or SD is empty"));
    EXPECT_THAT(refusal(nc, "WeightGRU", Matrix{WeightWriter::Vector(496), 248, 2}),
                because("WeightGRU is 248 x 2, must be 248 x 8"));
    EXPECT_THAT(refusal(nc, "BaesGRU", two), because("BaesGRU has 2 .* 8"));
    EXPECT_THAT(refusal(vad, "FrameLength", 320), because("MU has 61 .* 81"));
    EXPECT_THAT(refusal(vad, "SD", WeightWriter::Vector(61, -1.0F)), because("SD .*"));
    EXPECT_THAT(refusal(vad, "WeightNonLinear", WeightWriter::Matrices{}), because(".*state.*"));
}

// The background-speaker stage is built whether it is on or not.
TEST(RefusedParameters, OfTheBackgroundSpeakerStage) {
    test_support::TempDir dir;
    Engine engine(dir.path().wstring().c_str());
    dir.write("a.mvw", randomNcWeight({}));
    auto const opens = [&](std::string const& key, std::string const& value) {
        auto const name = key + value;
        dir.write(name + ".cfg",
                  "WEIGHT a.mvw\nMORVA_BACKGROUND_SPEAKER_FIX_" + key + "_v0_0_6 " + value + "\n");
        EXPECT_EQ(Engine::addShipped(name + ".cfg", name.c_str()), 0);
        return observe([&] { return openNc16(name.c_str()); }).result != nullptr;
    };
    for (char const* count : {"0", "0.9", "-1", "100001", "nan", "inf", "1e30", "word"}) {
        EXPECT_FALSE(opens("RUN_FRAME_COUNT", count)) << count;
    }
    for (char const* count : {"1", "1.9", "100000"}) EXPECT_TRUE(opens("RUN_FRAME_COUNT", count));
    for (char const* seconds : {"0", "-1", "nan"}) EXPECT_FALSE(opens("UTTERANCE_LEN", seconds));
    EXPECT_FALSE(opens("CUT_START_DB", "15"));
    EXPECT_FALSE(opens("CUT_END_DB", "10"));
    EXPECT_TRUE(opens("CUT_END_DB", "9"));
}
