// Weights and parameters that cannot run: registering them succeeds, opening a session on them is
// refused with the reason, and the engine goes on.
#include <gtest/gtest.h>

#include "engine.h"

using namespace sdk_test;
using test_support::randomNcWeight;
using test_support::randomVadWeight;
using test_support::TempDir;
using test_support::WeightWriter;

namespace {

using Matrices = WeightWriter::Matrices;
using Vector = WeightWriter::Vector;
using Vectors = WeightWriter::Vectors;

// The first value of a name counts: what is written in front of a weight replaces its own.
template <class Value>
std::string set(char const* name, Value const& value) {
    return WeightWriter().add(name, value).bytes();
}

MORVA::CONTAINERS::Matrix zeros(std::size_t rows, std::size_t cols) {
    return {Vector(rows * cols), rows, cols};
}

struct Case {
    std::string change;
    std::string reason;  // regular expression for the exception's message
};

std::string const kNoInfo = "there are no needing Weight information in Weight ";

// H = 8, P = 3, K = 80: layer 0 reads 248 values.
std::vector<Case> ncCases() {
    char const* const rate = "CONTROL_MORVA_COMPRESS_RATE_v0_0_6";
    auto const in = zeros(248, 8);
    auto const mid = zeros(8, 8);
    Vector const h(8);
    return {
        {set("Step", 0), "Step is 0.*"},
        {set("Step", -160), "Step is -160.*"},
        {set("Step", 100), "FrameLength is 320.*100.*"},
        {set("Step", 160.0F), "ERROR DATA With Key: Stepdoesn't exists"},
        {set("FrameLength", 160), "FrameLength is 160.*"},
        {set("FrameLength", 640), "FrameLength is 640.*"},
        {set("FrameLength", 322), "FrameLength is 322.*"},
        {set("FrameLength", 2000000000), kNoInfo},
        {set("SampleRate", 48000), kNoInfo},
        {set("SampleRate", -16000), "SampleRate is -16000.*"},
        {set("CoefficientNumber", 160), "CoefficientNumber is 160.*161.*"},
        {set("FiltrBegin", -8), "the band -8..160 .*"},
        {set("FiltrBegin", 160), "the band 160..160 .*"},
        {set("FiltrEnd", 162), "the band 0..162 .*161.*"},
        {set("FiltrEnd", 158), ".*158 bins.*COMPRESS_RATE 2.*"},
        {set("PreviewFrames", 0), "PreviewFrames is 0.*"},
        {set("PreviewFrames", 2147483647), "Weight.* is .*"},
        {set(rate, -1), "COMPRESS_RATE is -1.*"},
        {set(rate, 17), "COMPRESS_RATE is 17.*16.*"},
        {set(rate, 1), "WeightGRU is 248 x 8, must be 368 x 8"},
        {set("MU", Vector{}), "MU or SD is empty"},
        {set("SD", Vector{}), "MU or SD is empty"},
        {set("SD", Vector{1.0F, 0.0F}), "SD holds a zero"},
        {set("SD", Vector{-0.0F}), "SD holds a zero"},
        {set("WeightGRU", zeros(247, 8)), "WeightGRU is 247 x 8, must be 248 x 8"},
        {set("WeightGRU", zeros(248, 2)), "WeightGRU is 248 x 2, must be 248 x 8"},
        {set("WeightGRU", Vector(248 * 8)), "ERROR DATA With Key: WeightGRUdoesn't exists"},
        {set("BaesGRU", Vector(7)), "BaesGRU has 7 .* 8"},
        {set("WeightGRU_reset", zeros(248, 7)), "WeightGRU_reset is 248 x 7, must be 248 x 8"},
        {set("BiasGRU_reset", Vector{}), "BiasGRU_reset has 0 .* 8"},
        {set("WeightNonLinear", Matrices{}), "WeightNonLinear has 0.*"},
        {set("WeightNonLinear", Matrices(3)), ".*"},
        {set("WeightNonLinear", Matrices{in, zeros(9, 8), zeros(8, 80)}),
         "WeightNonLinear is 9 x 8, must be 8 x 8"},
        {set("WeightNonLinear", Matrices{in, mid, zeros(8, 79)}),
         "WeightNonLinear is 8 x 79, must be 8 x 80"},
        {set("WeightNonLinear", Matrices{in, mid, zeros(9, 80)}), "Weight.* is .*"},
        {set("WeightLinear", Matrices{in}), "WeightLinear has 1 .*2"},
        {set("WeightLinear", Matrices{in, zeros(8, 9)}), "WeightLinear is 8 x 9, must be 8 x 8"},
        {set("BaesLinear", Vectors{h, Vector(9)}), "BaesLinear has 9 .* 8"},
        {set("BaesNonLinear", Vectors{h, h}), "BaesNonLinear has 2 .*3"},
        {set("BaesNonLinear", Vectors{h, h, Vector(80), Vector(80)}), "BaesNonLinear .*"},
        {set("BaesNonLinear", Vectors{h, h, Vector(79)}), "BaesNonLinear has 79 .* 80"},
        {set("GainLinearNorm", Vectors{h}), "GainLinearNorm has 1 .*2"},
        {set("BiasNonLinearNorm", Vectors{h, Vector(7)}), "BiasNonLinearNorm has 7 .* 8"},
    };
}

// H = 8, 61 features, five frames of them: layer 0 reads 313 values.
std::vector<Case> vadCases() {
    return {
        {set("MU", Vector(60)), "MU has 60 .* 61"},
        {set("SD", Vector(62, 1.0F)), "SD has 62 .* 61"},
        {set("SD", Vector(61, -1.0F)), "SD .*"},
        {set("FrameLength", 320), "MU has 61 .* 81"},
        {set("FrameLength", 200), kNoInfo},
        {set("WeightLinear", Matrices{}), "WeightLinear has 0.*"},
        {set("WeightNonLinear", Matrices{}), ".*state.*"},
        {set("WeightLinear", Matrices{zeros(313, 8), zeros(8, 2)}),
         "WeightLinear is 8 x 2, must be 8 x 1"},
        {set("BaesLinear", Vectors{Vector(8), {}}), "BaesLinear has 0 .* 1"},
        {set("WeightGRU", zeros(312, 8)), "WeightGRU is 312 x 8, must be 313 x 8"},
    };
}

void* openBadNc() {
    return openNc(16000, 16000, 10, "bad");
}
void* openBadVad() {
    return Morva_VAD_CreateSession(rate(16000), duration(10), "bad");
}

}  // namespace

TEST(RefusedWeights, OnOpeningAndNothingElse) {
    auto const check = [](Case const& row, std::string const& weight, void* (*open)()) {
        SCOPED_TRACE(row.reason);
        Engine engine;
        ASSERT_EQ(Engine::add("bad", row.change + weight), 0);
        ASSERT_EQ(Engine::add("good", randomNcWeight({.timeStamp = "other"})), 0);
        EXPECT_THAT(observe(open), fails<void*>(nullptr, "[A-Za-z]*", row.reason));
        EXPECT_EQ(cleanAll(openNc(16000, 16000, 10, "good"), voice(16000, 0.05, 1)).size(), 800U);
    };
    for (auto const& row : ncCases()) check(row, randomNcWeight({}), openBadNc);
    for (auto const& row : vadCases()) check(row, randomVadWeight({}), openBadVad);
}

// Every value that a model reads is missed by name.
TEST(RefusedWeights, MissingValues) {
    struct Row {
        std::string weight;
        std::vector<std::string> names;
        void* (*open)();
    };
    std::vector<std::string> const common = {
        "MU",        "SD",     "WeightLinear", "WeightNonLinear", "BaesLinear", "BaesNonLinear",
        "WeightGRU", "BaesGRU"};
    auto six = common;
    six.insert(six.end(),
               {"Step", "FiltrBegin", "FiltrEnd", "PreviewFrames", "CoefficientNumber",
                "SampleRate", "FrameLength", "WeightGRU_reset", "BiasGRU_reset", "GainLinearNorm",
                "BiasLinearNorm", "GainNonLinearNorm", "BiasNonLinearNorm"});
    for (auto const& row :
         {Row{randomNcWeight({}), six, openBadNc}, Row{randomVadWeight({}), common, openBadVad},
          Row{randomNcWeight({.version = "0.0.5"}), common, openBadNc}}) {
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
        EXPECT_THAT(observe(version == "0.0.5" ? openBadNc : openBadVad),
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
