// Tunable parameters: ranges with their warnings, and what counts as a value. (Names, defaults and
// both sources are seen where cleaners with random parameters are compared with the reference.)
#include <gmock/gmock.h>

#include <clocale>
#include <cstdlib>
#include <sstream>

#include "models.h"
#include "support/temp_dir.h"
#include "utils/exception.h"

using namespace cleaner_test;
using test_support::randomNcWeight;
using test_support::WeightWriter;
using Params = MORVA::NOISE_CANCELLER::NoiseCleaner_v0_0_6::Params;
// A value and what was printed.
using Reading = std::pair<double, std::string>;

namespace {

// A parameter of which the environment says `text` (null: nothing) and the weight `stored`.
template <class Member, class... Stored>
Reading read(std::string const& name, Member member, char const* text, Stored... stored) {
    auto const key = "MORVA_" + name + "_v0_0_6";
    WeightWriter writer;
    (writer.add("CONTROL_" + key, stored), ...);
    auto const model = modelFrom(writer.bytes() + randomNcWeight({}));
    if (text != nullptr) setText(model, key, text);
    test_support::CapturedOutput out(1);
    Params const params(*model, 10);
    return {static_cast<double>(params.*member), out.text()};
}

struct Number {
    char const* name;
    float Params::*member;
    float byDefault;
    Reading good;
    std::vector<char const*> bad;
    char const* warning;
};
Number const kNumbers[] = {
    {"SMOOT_COEF",
     &Params::smootCoef,
     1,
     {0.25, "0.25x"},
     {"0", "-1", "1.0001", "nan", "x"},
     "WARNING OF SMOOTH COEF NUMBER VALUE. IT MUST BE iIN INTERVALK (0,1] \n DEFAULT VALUE 1.f\n"},
    {"CLIP_FIX_POINT",
     &Params::clipFixPoint,
     25000,
     {32768, "32768"},
     {"0", "32769", "-5", "0.9", "99999999999"},
     "WARNING OF CLIP_FIX_POINT NUMBER VALUE. IT MUST BE IN INTERVALK (1,32768) \n "
     "DEFAULT VALUE 25000\n"},
    {"THRESH_CUT_REF_EN",
     &Params::threshCutRefEn,
     100,
     {1000, " 1000"},
     {"0", "1001", "x"},
     "WARNING OF THRESH_CUT_REF VALUE. IT MUST BE iIN INTERVALK [1,1000] \n DEFAULT VALUE 100\n"},
    {"RM_THRESHOLD",
     &Params::rmThreshold,
     0.5,
     {1, "1e0"},
     {"0", "1.01", "-0.5", "inf"},
     "WARNING OF RM_THRESHOLD VALUE. IT MUST BE iIN INTERVALK [0.0,1.0] \n DEFAULT VALUE 0.5\n"},
};

}  // namespace

// Out of range the built-in default counts, not the weight's value.
TEST(Parameters, RangesAndTheirWarnings) {
    for (auto const& n : kNumbers) {
        SCOPED_TRACE(n.name);
        Reading const refused{n.byDefault, n.warning};
        EXPECT_EQ(read(n.name, n.member, n.good.second.c_str(), 0.75F), Reading(n.good.first, ""));
        for (char const* bad : n.bad) EXPECT_EQ(read(n.name, n.member, bad, 0.75F), refused) << bad;
        EXPECT_EQ(read(n.name, n.member, nullptr, 1e6F), refused);
        // In the weight, text is no number; a whole number serves only those that are whole.
        EXPECT_EQ(read(n.name, n.member, nullptr, "0.25"), Reading(n.byDefault, ""));
        float const whole = n.byDefault > 1.0F ? 64.0F : n.byDefault;
        EXPECT_EQ(read(n.name, n.member, nullptr, 64), Reading(whole, ""));
    }
    auto const runFrames = "BACKGROUND_SPEAKER_FIX_RUN_FRAME_COUNT";
    EXPECT_EQ(read(runFrames, &Params::runFrameCount, "7.9").first, 7);
    EXPECT_EQ(read(runFrames, &Params::runFrameCount, nullptr, 64).first, 40);
    auto const runMinimum = "BACKGROUND_SPEAKER_FIX_RUN_MIN_LEN";
    EXPECT_EQ(read(runMinimum, &Params::runMinLen, "7.9").first, 7);
    EXPECT_EQ(read(runMinimum, &Params::runMinLen, nullptr, 64.0F).first, 2);
}

TEST(Parameters, OneWordSwitchesOnAndTheOthersOff) {
    auto const isOn = [](auto... source) {
        return read("SKIP_FRAME", &Params::skipFrame, source...).first != 0.0;
    };
    EXPECT_TRUE(isOn("TRUE", "f"));
    for (char const* text : {"true", "t", "1", "TRUE ", "FALSE"}) EXPECT_FALSE(isOn(text, "t"));
    EXPECT_TRUE(isOn(nullptr, "t"));
    for (char const* word : {"TRUE", "T", "", "f"}) EXPECT_FALSE(isOn(nullptr, word));
    EXPECT_EQ(read("ENABLE_RESCALE", &Params::enableRescale, nullptr, 0).first, 1.0);  // no word
    // Volume brings the limiter with it, and says so every time.
    EXPECT_EQ(read("VOLUME_UP", &Params::enableClipFix, "TRUE"),
              Reading(1.0, "WARNING: Enabled Clip fix, because VolumeUp is Enabled\n"));
}

// Each missing value is the first that its model names. A value of the wrong type counts as
// missing.
TEST(Parameters, MissingValuesAreNamedInTheOrderOfReading) {
    std::string const structure =
        "SampleRate Step FiltrBegin FiltrEnd FrameLength PreviewFrames CoefficientNumber ";
    std::string const learned =
        "MU SD WeightLinear WeightNonLinear BaesLinear BaesNonLinear WeightGRU BaesGRU ";
    std::string const normed =
        "WeightGRU_reset BiasGRU_reset GainLinearNorm BiasLinearNorm GainNonLinearNorm "
        "BiasNonLinearNorm ";
    auto const expectOrder = [](int model, std::string const& weight, std::string order) {
        while (!order.empty()) {
            auto const next = order.substr(0, order.find(' '));
            WeightWriter front;
            std::istringstream names(order);
            for (std::string name; names >> name;) front.add(name, "text");
            EXPECT_THAT([&] { makeCleaner(model, modelFrom(front.bytes() + weight), 10); },
                        testing::ThrowsMessage<MORVA::UTILS::MORVA_Exception>(
                            testing::HasSubstr("Key: " + next + "doesn't")))
                << "model " << model;
            order.erase(0, next.size() + 1);
        }
    };
    auto const older = randomNcWeight({.version = "0.0.5"});
    expectOrder(6, randomNcWeight({}), structure + learned + normed);
    for (int const model : {0, 5}) expectOrder(model, older, learned + structure);
    expectOrder(10, randomNcWeight({.version = "NC_1.0.0"}),
                "SampleRate Step FrameLength BandWidths GroupBands GroupReach MU WeightGather "
                "WeightTimeIn WeightGroupsState WeightSpread WeightScore BiasSpread SD BiasGather "
                "WeightPlace BiasGroupsIn GainGroupsNorm BiasGroupsNorm WeightGroupsIn "
                "BiasGroupsState WeightGroupsOut BiasGroupsOut GainTimeNorm BiasTimeNorm "
                "BiasTimeIn WeightTimeState BiasTimeState GainNorm BiasNorm WeightOutput "
                "BiasOutput BiasScore ");
    expectOrder(7, test_support::randomVadWeight({}), learned + "SampleRate FrameLength ");
}

// In a host whose numbers have a decimal comma.
TEST(Parameters, TheHostsLocaleDoesNotMatter) {
    test_support::TempDir const folder;
    std::string const command =
        "localedef -i de_DE -f UTF-8 " + (folder.path() / "comma").string() + " >/dev/null 2>&1";
    [[maybe_unused]] int const warned = std::system(command.c_str());
    setenv("LOCPATH", folder.path().c_str(), 1);
    if (std::setlocale(LC_ALL, "comma") == nullptr) GTEST_SKIP() << "no locale to be had";
    EXPECT_EQ(std::strtod("0,25", nullptr), 0.25);
    EXPECT_EQ(read("SMOOT_COEF", &Params::smootCoef, "0.25").first, 0.25);
    EXPECT_EQ(read("CLIP_FIX_POINT", &Params::clipFixPoint, "+1000.9").first, 1000);
    std::setlocale(LC_ALL, "C");
    unsetenv("LOCPATH");
}
