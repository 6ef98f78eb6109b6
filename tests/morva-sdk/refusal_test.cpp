// Weights and parameters that cannot run: registering them succeeds, opening a session on them is
// refused with the reason, and the engine goes on.
#include <gtest/gtest.h>

#include <functional>

#include "engine.h"

using namespace sdk_test;
using test_support::NcShape;
using test_support::randomNcWeight;
using test_support::randomVadWeight;
using test_support::TempDir;
using test_support::VadShape;
using test_support::WeightWriter;

namespace {

using Matrices = WeightWriter::Matrices;
using Vector = WeightWriter::Vector;
using Vectors = WeightWriter::Vectors;

// The first value of a name counts: what is written in front of a weight replaces its own.
using Override = std::function<void(WeightWriter&)>;

MORVA::CONTAINERS::Matrix zeros(std::size_t rows, std::size_t cols) {
    return {Vector(rows * cols), rows, cols};
}

struct Case {
    std::string name;
    Override change;
    std::string reason;  // regular expression for the exception's message
};

// H = 8, P = 3, K = 80: layer 0 reads 248 values.
std::vector<Case> const kNcCases = {
    {"Step0", [](auto& w) { w.add("Step", 0); }, "Step is 0.*"},
    {"StepNegative", [](auto& w) { w.add("Step", -160); }, "Step is -160.*"},
    {"FrameNotTwoSteps", [](auto& w) { w.add("Step", 100); }, "FrameLength is 320.*100.*"},
    {"Frame10ms", [](auto& w) { w.add("FrameLength", 160).add("Step", 80); },
     "FrameLength is 160.*"},
    {"Frame40ms", [](auto& w) { w.add("FrameLength", 640).add("Step", 320); },
     "FrameLength is 640.*"},
    {"FrameNearly20ms", [](auto& w) { w.add("FrameLength", 322).add("Step", 161); },
     "FrameLength is 322.*"},
    {"FrameHuge", [](auto& w) { w.add("FrameLength", 2000000000); },
     "there are no needing Weight information in Weight "},
    {"RateUnknown", [](auto& w) { w.add("SampleRate", 48000); },
     "there are no needing Weight information in Weight "},
    {"RateNegative", [](auto& w) { w.add("SampleRate", -16000); }, "SampleRate is -16000.*"},
    {"Coefficients", [](auto& w) { w.add("CoefficientNumber", 160); },
     "CoefficientNumber is 160.*161.*"},
    {"BandNegative", [](auto& w) { w.add("FiltrBegin", -8); }, "the band -8..160 .*"},
    {"BandEmpty", [](auto& w) { w.add("FiltrBegin", 160); }, "the band 160..160 .*"},
    {"BandTooLong", [](auto& w) { w.add("FiltrEnd", 162); }, "the band 0..162 .*161.*"},
    {"BandUneven", [](auto& w) { w.add("FiltrEnd", 158); }, ".*158 bins.*COMPRESS_RATE 2.*"},
    {"Context0", [](auto& w) { w.add("PreviewFrames", 0); }, "PreviewFrames is 0.*"},
    {"ContextHuge", [](auto& w) { w.add("PreviewFrames", 2147483647); }, "Weight.* is .*"},
    {"CompressNegative", [](auto& w) { w.add("CONTROL_MORVA_COMPRESS_RATE_v0_0_6", -1); },
     "COMPRESS_RATE is -1.*"},
    {"CompressHuge", [](auto& w) { w.add("CONTROL_MORVA_COMPRESS_RATE_v0_0_6", 17); },
     "COMPRESS_RATE is 17.*16.*"},
    {"CompressMismatch", [](auto& w) { w.add("CONTROL_MORVA_COMPRESS_RATE_v0_0_6", 1); },
     "WeightGRU is 248 x 8, must be 368 x 8"},
    {"MeanEmpty", [](auto& w) { w.add("MU", Vector{}); }, "MU or SD is empty"},
    {"DeviationEmpty", [](auto& w) { w.add("SD", Vector{}); }, "MU or SD is empty"},
    {"DeviationZero",
     [](auto& w) {
         w.add("SD", Vector{1.0F, 0.0F});
     },
     "SD holds a zero"},
    {"DeviationMinusZero", [](auto& w) { w.add("SD", Vector{-0.0F}); }, "SD holds a zero"},
    {"GateRows", [](auto& w) { w.add("WeightGRU", zeros(247, 8)); },
     "WeightGRU is 247 x 8, must be 248 x 8"},
    {"GateColumns", [](auto& w) { w.add("WeightGRU", zeros(248, 2)); },
     "WeightGRU is 248 x 2, must be 248 x 8"},
    {"GateBias", [](auto& w) { w.add("BaesGRU", Vector(7)); }, "BaesGRU has 7 .* 8"},
    {"ResetColumns", [](auto& w) { w.add("WeightGRU_reset", zeros(248, 7)); },
     "WeightGRU_reset is 248 x 7, must be 248 x 8"},
    {"ResetBias", [](auto& w) { w.add("BiasGRU_reset", Vector{}); }, "BiasGRU_reset has 0 .* 8"},
    {"NoLayers", [](auto& w) { w.add("WeightNonLinear", Matrices{}); }, "WeightNonLinear has 0.*"},
    {"LayerEmpty",
     [](auto& w) {
         w.add("WeightNonLinear", Matrices{{}, {}, {}});
     },
     ".*"},
    {"LayerShape",
     [](auto& w) {
         w.add("WeightNonLinear", Matrices{zeros(248, 8), zeros(9, 8), zeros(8, 80)});
     },
     "WeightNonLinear is 9 x 8, must be 8 x 8"},
    {"OutputShape",
     [](auto& w) {
         w.add("WeightNonLinear", Matrices{zeros(248, 8), zeros(8, 8), zeros(8, 79)});
     },
     "WeightNonLinear is 8 x 79, must be 8 x 80"},
    {"StateWidth",
     [](auto& w) {
         w.add("WeightNonLinear", Matrices{zeros(248, 8), zeros(8, 8), zeros(9, 80)});
     },
     "Weight.* is .*"},
    {"LinearMissing", [](auto& w) { w.add("WeightLinear", Matrices{zeros(248, 8)}); },
     "WeightLinear has 1 .*2"},
    {"LinearShape",
     [](auto& w) {
         w.add("WeightLinear", Matrices{zeros(248, 8), zeros(8, 9)});
     },
     "WeightLinear is 8 x 9, must be 8 x 8"},
    {"LinearBias",
     [](auto& w) {
         w.add("BaesLinear", Vectors{Vector(8), Vector(9)});
     },
     "BaesLinear has 9 .* 8"},
    {"BiasMissing",
     [](auto& w) {
         w.add("BaesNonLinear", Vectors{Vector(8), Vector(8)});
     },
     "BaesNonLinear has 2 .*3"},
    {"BiasTooMany",
     [](auto& w) {
         w.add("BaesNonLinear", Vectors{Vector(8), Vector(8), Vector(80), Vector(80)});
     },
     "BaesNonLinear .*"},
    {"OutputBias",
     [](auto& w) {
         w.add("BaesNonLinear", Vectors{Vector(8), Vector(8), Vector(79)});
     },
     "BaesNonLinear has 79 .* 80"},
    {"NormMissing", [](auto& w) { w.add("GainLinearNorm", Vectors{Vector(8)}); },
     "GainLinearNorm has 1 .*2"},
    {"NormLength",
     [](auto& w) {
         w.add("BiasNonLinearNorm", Vectors{Vector(8), Vector(7)});
     },
     "BiasNonLinearNorm has 7 .* 8"},
    {"TypeOfStep", [](auto& w) { w.add("Step", 160.0F); },
     "ERROR DATA With Key: Stepdoesn't exists"},
    {"TypeOfGate", [](auto& w) { w.add("WeightGRU", Vector(248 * 8)); },
     "ERROR DATA With Key: WeightGRUdoesn't exists"},
};

// H = 8, 61 features, five frames of them: layer 0 reads 313 values.
std::vector<Case> const kVadCases = {
    {"MeanLength", [](auto& w) { w.add("MU", Vector(60)); }, "MU has 60 .* 61"},
    {"VarianceLength", [](auto& w) { w.add("SD", Vector(62, 1.0F)); }, "SD has 62 .* 61"},
    {"VarianceNegative", [](auto& w) { w.add("SD", Vector(61, -1.0F)); }, "SD .*"},
    {"FrameLength", [](auto& w) { w.add("FrameLength", 320); }, "MU has 61 .* 81"},
    {"FrameUnknown", [](auto& w) { w.add("FrameLength", 200); },
     "there are no needing Weight information in Weight "},
    {"NoLayers", [](auto& w) { w.add("WeightLinear", Matrices{}); }, "WeightLinear has 0.*"},
    {"NoState", [](auto& w) { w.add("WeightNonLinear", Matrices{}); }, ".*state.*"},
    {"OutputWidth",
     [](auto& w) {
         w.add("WeightLinear", Matrices{zeros(313, 8), zeros(8, 2)});
     },
     "WeightLinear is 8 x 2, must be 8 x 1"},
    {"OutputBias",
     [](auto& w) {
         w.add("BaesLinear", Vectors{Vector(8), {}});
     },
     "BaesLinear has 0 .* 1"},
    {"Gate", [](auto& w) { w.add("WeightGRU", zeros(312, 8)); },
     "WeightGRU is 312 x 8, must be 313 x 8"},
};

class Refused : public ::testing::TestWithParam<Case> {
protected:
    static std::string with(Override const& change, std::string const& weight) {
        WeightWriter writer;
        change(writer);
        return writer.bytes() + weight;
    }
    Engine engine_;
};
class RefusedNc : public Refused {};
class RefusedVad : public Refused {};
auto const kCaseName = [](auto const& info) { return info.param.name; };

}  // namespace

TEST_P(RefusedNc, OnOpening) {
    ASSERT_EQ(Engine::add("bad", with(GetParam().change, randomNcWeight({}))), 0);
    ASSERT_EQ(Engine::add("good", randomNcWeight({.timeStamp = "other"})), 0);
    EXPECT_THAT(observe([] { return openNc(16000, 16000, 10, "bad"); }),
                fails<void*>(nullptr, "[A-Za-z]*", GetParam().reason));
    auto* const session = openNc(16000, 16000, 10, "good");
    ASSERT_NE(session, nullptr);
    EXPECT_EQ(cleanAll(session, voice(16000, 0.05, 1)).size(), 800U);
}
INSTANTIATE_TEST_SUITE_P(Weights, RefusedNc, ::testing::ValuesIn(kNcCases), kCaseName);

TEST_P(RefusedVad, OnOpening) {
    ASSERT_EQ(Engine::add("bad", with(GetParam().change, randomVadWeight({}))), 0);
    EXPECT_THAT(observe([] { return Morva_VAD_CreateSession(rate(8000), duration(10), "bad"); }),
                fails<void*>(nullptr, "[A-Za-z]*", GetParam().reason));
}
INSTANTIATE_TEST_SUITE_P(Weights, RefusedVad, ::testing::ValuesIn(kVadCases), kCaseName);

// Every value that a model reads is missed by name.
TEST(RefusedWeights, MissingValues) {
    struct Row {
        std::string weight;
        std::vector<std::string> names;
        void* (*open)();
    };
    auto const nc = +[] { return openNc(16000, 16000, 10, "bad"); };
    auto const vad = +[] { return Morva_VAD_CreateSession(rate(16000), duration(10), "bad"); };
    std::vector<std::string> const common = {
        "MU",        "SD",     "WeightLinear", "WeightNonLinear", "BaesLinear", "BaesNonLinear",
        "WeightGRU", "BaesGRU"};
    auto six = common;
    six.insert(six.end(),
               {"Step", "FiltrBegin", "FiltrEnd", "PreviewFrames", "CoefficientNumber",
                "SampleRate", "FrameLength", "WeightGRU_reset", "BiasGRU_reset", "GainLinearNorm",
                "BiasLinearNorm", "GainNonLinearNorm", "BiasNonLinearNorm"});
    for (auto const& row : {Row{randomNcWeight({}), six, nc}, Row{randomVadWeight({}), common, vad},
                            Row{randomNcWeight({.version = "0.0.5"}), common, nc}}) {
        for (auto const& name : row.names) {
            Engine engine;
            auto bytes = row.weight;
            auto const record =
                WeightWriter().number(static_cast<unsigned>(name.size())).raw(name).bytes();
            auto const at = bytes.find(record);
            ASSERT_NE(at, std::string::npos) << name;
            bytes[at + 4] = '#';
            ASSERT_EQ(Engine::add("bad", bytes), 0);
            EXPECT_THAT(observe(row.open),
                        fails<void*>(nullptr, "getReference",
                                     "ERROR DATA With Key: " + name + "doesn't exists",
                                     "src/weights/weight Line 90"));
        }
    }
    // Nothing but a version: the feature statistics are what is missed first.
    for (std::string const version : {"0.0.5", "VAD_0.0.1"}) {
        Engine engine;
        ASSERT_EQ(Engine::add("bad", WeightWriter().add("Version", version).bytes()), 0);
        EXPECT_THAT(observe(version == "0.0.5" ? nc : vad),
                    fails<void*>(nullptr, "getReference", "ERROR DATA With Key: MUdoesn't exists"));
    }
}

// The background-speaker stage is built whether it is on or not.
TEST(RefusedParameters, OfTheBackgroundSpeakerStage) {
    TempDir dir;
    Engine engine(dir.path().wstring().c_str());
    dir.write("a.mvw", randomNcWeight({}));
    auto const open = [&](std::string const& lines) {
        static int n = 0;
        auto const name = "p" + std::to_string(n++);
        dir.write(name + ".cfg", "WEIGHT a.mvw\n" + lines);
        EXPECT_EQ(Engine::addShipped(name + ".cfg", name.c_str()), 0);
        return observe([&] { return openNc(16000, 16000, 10, name.c_str()); });
    };
    auto const line = [](char const* key, char const* value) {
        return std::string("MORVA_BACKGROUND_SPEAKER_FIX_") + key + "_v0_0_6 " + value + "\n";
    };
    for (char const* count : {"0", "0.9", "-1", "100001", "nan", "inf", "1e30", "word"}) {
        EXPECT_EQ(open(line("RUN_FRAME_COUNT", count)).result, nullptr) << count;
    }
    for (char const* count : {"1", "1.9", "100000"}) {
        EXPECT_NE(open(line("RUN_FRAME_COUNT", count)).result, nullptr) << count;
    }
    for (char const* seconds : {"0", "-1", "nan"}) {
        EXPECT_EQ(open(line("UTTERANCE_LEN", seconds)).result, nullptr) << seconds;
    }
    EXPECT_EQ(open(line("CUT_START_DB", "15")).result, nullptr);
    EXPECT_EQ(open(line("CUT_END_DB", "10")).result, nullptr);
    EXPECT_NE(open(line("CUT_END_DB", "9")).result, nullptr);
    EXPECT_NE(open("MORVA_SMOOT_COEF_v0_0_6 nan\nMORVA_RESCALE_REF_AMPL_v0_0_6 1e38\n").result,
              nullptr);
}
