// Tunable parameters: where they come from, their ranges, warnings and defaults, for every
// generation's own keys.
#include <gtest/gtest.h>

#include <cmath>
#include <variant>
#include <vector>

#include "noise_canceller/noise_cleaner_generations.h"
#include "noise_canceller/noise_cleaner_v0_0_6.h"
#include "support/captured_output.h"
#include "support/weight_writer.h"

using namespace MORVA::NOISE_CANCELLER;
using test_support::NcShape;
using test_support::WeightWriter;

namespace {

using Params = NoiseCleaner_v0_0_6::Params;
using Stored = std::variant<std::monostate, int, float, std::string>;

std::string const kSmoothWarning =
    "WARNING OF SMOOTH COEF NUMBER VALUE. IT MUST BE iIN INTERVALK (0,1] \n DEFAULT VALUE 1.f\n";
std::string const kClipWarning =
    "WARNING OF CLIP_FIX_POINT NUMBER VALUE. IT MUST BE IN INTERVALK (1,32768) \n DEFAULT VALUE "
    "25000\n";
std::string const kCutWarning =
    "WARNING OF THRESH_CUT_REF VALUE. IT MUST BE iIN INTERVALK [1,1000] \n DEFAULT VALUE 100\n";
std::string const kRmWarning =
    "WARNING OF RM_THRESHOLD VALUE. IT MUST BE iIN INTERVALK [0.0,1.0] \n DEFAULT VALUE 0.5\n";
std::string const kVolumeWarning = "WARNING: Enabled Clip fix, because VolumeUp is Enabled\n";

ModelEnvironment modelWith(std::string const& key, char const* text, Stored const& stored,
                           NcShape shape = {}) {
    auto const model = MORVA::CONTAINERS::makeModelEnvironment();
    if (text != nullptr) {
        model->second.insert<std::string>(key, text, MORVA::CONTAINERS::InsertMode::keep);
    }
    WeightWriter writer;
    if (auto const* whole = std::get_if<int>(&stored)) writer.add("CONTROL_" + key, *whole);
    if (auto const* real = std::get_if<float>(&stored)) writer.add("CONTROL_" + key, *real);
    if (auto const* word = std::get_if<std::string>(&stored)) writer.add("CONTROL_" + key, *word);
    auto const bytes = writer.bytes() + randomNcWeight(shape);
    model->first = std::make_shared<MORVA::WEIGHTS::Weight>();
    model->first->read(bytes.data(), bytes.size());
    return model;
}

struct Reading {
    double value;
    std::string printed;
};

template <class Member>
Reading read(std::string const& name, char const* text, Stored const& stored, Member member) {
    auto const model = modelWith("MORVA_" + name + "_v0_0_6", text, stored);
    test_support::CapturedOutput out(1);
    Params const params(*model, 10);
    return {static_cast<double>(params.*member), out.text()};
}

// A number: its default, a good value as text, in the weight as float and as int (NaN: a type that
// is not its own), and values out of range with their warning.
struct Number {
    char const* name;
    std::variant<float Params::*, unsigned long Params::*> member;
    double byDefault;
    std::pair<char const*, double> text;
    double fromFloat;  // of 7 / 16, or of 64 for whole numbers
    double fromInt;    // of 64
    std::vector<char const*> bad;
    std::string warning;
};

}  // namespace

TEST(Parameters, Numbers) {
    double const no = std::nan("");
    using P = Params;
    std::vector<Number> const numbers = {
        {"SMOOT_COEF",
         &P::smootCoef,
         1,
         {"0.25x", 0.25},
         0.4375,
         no,
         {"0", "-1", "1.0001", "nan", "x"},
         kSmoothWarning},
        {"CLIP_FIX_POINT",
         &P::clipFixPoint,
         25000,
         {"32768", 32768},
         64,
         64,
         {"0", "32769", "-5", "0.9", "99999999999"},
         kClipWarning},
        {"THRESH_CUT_REF_EN",
         &P::threshCutRefEn,
         100,
         {"1000", 1000},
         64,
         64,
         {"0", "1001", "x"},
         kCutWarning},
        {"RM_THRESHOLD",
         &P::rmThreshold,
         0.5,
         {"1", 1},
         0.4375,
         no,
         {"0", "1.01", "-0.5", "inf"},
         kRmWarning},
        {"VOLUME_UP_PERCENT", &P::volumeUpPercent, 0, {"-12.5", -12.5}, 0.4375, no, {}, ""},
        {"RESCALE_REF_AMPL", &P::rescaleRefAmpl, 2000, {"1e3", 1000}, 0.4375, no, {}, ""},
        {"RESCALE_REF_EN", &P::rescaleRefEn, 100, {" 5.5", 5.5}, 0.4375, no, {}, ""},
        {"BACKGROUND_SPEAKER_FIX_CUT_START_DB",
         &P::cutStartDb,
         10,
         {"3.5", 3.5},
         0.4375,
         no,
         {},
         ""},
        {"BACKGROUND_SPEAKER_FIX_CUT_END_DB", &P::cutEndDb, 15, {"3.5", 3.5}, 0.4375, no, {}, ""},
        {"BACKGROUND_SPEAKER_FIX_RUN_FRAME_COUNT",
         &P::runFrameCount,
         40,
         {"7.9", 7},
         64,
         no,
         {},
         ""},
        {"BACKGROUND_SPEAKER_FIX_RUN_MIN_LEN", &P::runMinLen, 2, {"7.9", 7}, no, 64, {}, ""},
        {"BACKGROUND_SPEAKER_FIX_UTTERANCE_LEN",
         &P::utteranceLen,
         2,
         {"0.5", 0.5},
         0.4375,
         no,
         {},
         ""},
    };
    for (auto const& n : numbers) {
        SCOPED_TRACE(n.name);
        auto const seen = [&](char const* text, Stored const& stored) {
            return std::visit([&](auto member) { return read(n.name, text, stored, member); },
                              n.member);
        };
        bool const fraction = n.fromFloat == 0.4375;
        Stored const real = fraction ? 0.4375F : 64.0F;
        auto const orDefault = [&](double value) {
            return std::isnan(value) ? n.byDefault : value;
        };
        EXPECT_EQ(seen(nullptr, {}).value, n.byDefault);
        EXPECT_EQ(seen(n.text.first, {}).value, n.text.second);
        EXPECT_EQ(seen(n.text.first, real).value, n.text.second);  // the environment goes first
        EXPECT_EQ(seen(nullptr, real).value, orDefault(n.fromFloat));
        EXPECT_EQ(seen(nullptr, 64).value, orDefault(n.fromInt));
        EXPECT_EQ(seen(nullptr, std::string("0.25")).value, n.byDefault);
        EXPECT_EQ(seen(n.text.first, {}).printed, "");
        for (char const* bad : n.bad) {
            // The built-in default, not the weight's value.
            EXPECT_EQ(seen(bad, real).value, n.byDefault) << bad;
            EXPECT_EQ(seen(bad, real).printed, n.warning) << bad;
        }
        if (n.bad.empty()) continue;
        auto const stored = seen(nullptr, 1e6F);
        EXPECT_EQ(stored.value, n.byDefault);
        EXPECT_EQ(stored.printed, n.warning);
    }
}

TEST(Parameters, Switches) {
    struct Switch {
        char const* name;
        bool Params::*member;
        bool byDefault;
    };
    using P = Params;
    for (auto const& s : {Switch{"SMOOT_RM_MODIFY", &P::smootRmModify, false},
                          {"HIGH_FREQ_SMOOT", &P::highFreqSmoot, false},
                          {"ENABLE_CLIP_FIX", &P::enableClipFix, false},
                          {"SKIP_FRAME", &P::skipFrame, false},
                          {"VOLUME_UP", &P::volumeUp, false},
                          {"ENABLE_THRESH_CUT", &P::enableThreshCut, false},
                          {"ENABLE_RM_THRESHOLD", &P::enableRmThreshold, false},
                          {"ENABLE_RESCALE", &P::enableRescale, true},
                          {"ENABLE_BACKGROUND_SPEAKER_FIX", &P::enableBackgroundSpeakerFix, false},
                          {"BACKGROUND_SPEAKER_FIX_VAR_WIND_MODE", &P::varWindMode, true}}) {
        SCOPED_TRACE(s.name);
        auto const seen = [&](char const* text, Stored const& stored) {
            return read(s.name, text, stored, s.member).value != 0.0;
        };
        EXPECT_EQ(seen(nullptr, {}), s.byDefault);
        EXPECT_TRUE(seen("TRUE", std::string("f")));
        for (char const* text : {"true", "t", "1", "TRUE ", "FALSE"})
            EXPECT_FALSE(seen(text, std::string("t")));
        EXPECT_TRUE(seen(nullptr, std::string("t")));
        for (char const* word : {"TRUE", "T", "", "f", "true"})
            EXPECT_FALSE(seen(nullptr, std::string(word)));
        EXPECT_EQ(seen(nullptr, 1), s.byDefault);
        EXPECT_EQ(seen(nullptr, 1.0F), s.byDefault);
    }
    // Volume brings the limiter with it, and says so every time.
    auto const volume = read("VOLUME_UP", "TRUE", {}, &Params::enableClipFix);
    EXPECT_EQ(volume.value, 1.0);
    EXPECT_EQ(volume.printed, kVolumeWarning);
}

TEST(Parameters, CompressRateSetsTheBands) {
    for (auto const& [text, bands] : {std::pair{"0", 160U}, {"1", 120U}, {"2", 80U}, {"3", 50U}}) {
        NcShape shape;
        shape.compressRate = text[0] - '0';
        auto const model = modelWith("MORVA_COMPRESS_RATE_v0_0_6", text, 1, shape);
        EXPECT_EQ(Params(*model, 10).bands.bands(), bands);
    }
    NcShape shape;
    shape.compressRate = 3;
    EXPECT_EQ(Params(*modelWith("MORVA_COMPRESS_RATE_v0_0_6", nullptr, 3, shape), 10).bands.bands(),
              50U);
}

namespace {

template <int number>
void expectOwnKeys() {
    NcShape shape;
    shape.version = "0.0." + std::to_string(number);
    for (int suffix = 1; suffix <= 6; ++suffix) {
        auto const key = "MORVA_SMOOT_COEF_v0_0_" + std::to_string(suffix);
        float const wanted = suffix == number ? 0.5F : 1.0F;
        using Own = typename NoiseCleanerGeneration<number>::Params;
        EXPECT_EQ(Own(*modelWith(key, "0.5", {}, shape), 10, generation(number)).smootCoef, wanted);
        EXPECT_EQ(Own(*modelWith(key, nullptr, 0.5F, shape), 10, generation(number)).smootCoef,
                  wanted);
    }
}

}  // namespace

TEST(Parameters, EveryGenerationReadsItsOwnKeys) {
    expectOwnKeys<1>();
    expectOwnKeys<2>();
    expectOwnKeys<3>();
    expectOwnKeys<4>();
    expectOwnKeys<5>();
    EXPECT_EQ(Params(*modelWith("MORVA_SMOOT_COEF_v0_0_5", "0.5", {}), 10).smootCoef, 1.0F);
    EXPECT_EQ(Params(*modelWith("CONTROL_MORVA_SMOOT_COEF_v0_0_6", "0.5", {}), 10).smootCoef, 1.0F);
}
