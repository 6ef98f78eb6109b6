// Tunable parameters: ranges and what counts as a value. (Names, defaults and both sources are
// seen where cleaners with random parameters are compared with the reference.)
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

namespace {

// A parameter of which the environment says `text` (null: nothing) and the weight `stored`.
template <class Member, class... Stored>
double read(std::string const& name, Member member, char const* text, Stored... stored) {
    auto const key = "MORVA_" + name + "_v0_0_6";
    WeightWriter writer;
    (writer.add("CONTROL_" + key, stored), ...);
    auto const model = modelFrom(writer.bytes() + randomNcWeight({}));
    if (text != nullptr) setText(model, key, text);
    test_support::CapturedOutput const quiet(1);
    Params const params(*model, 10);
    return static_cast<double>(params.*member);
}

struct Number {
    char const* name;
    float Params::*member;
    float byDefault;
    std::vector<char const*> bad;
};
Number const kNumbers[] = {
    {"SMOOT_COEF", &Params::smootCoef, 1, {"0", "-1", "1.0001", "nan", "x"}},
    {"CLIP_FIX_POINT", &Params::clipFixPoint, 25000, {"0", "32769", "-5", "0.9", "99999999999"}},
    {"THRESH_CUT_REF_EN", &Params::threshCutRefEn, 100, {"0", "1001", "x"}},
    {"RM_THRESHOLD", &Params::rmThreshold, 0.5, {"0", "1.01", "-0.5", "inf"}},
};

}  // namespace

// Out of range the built-in default counts, not the weight's value.
TEST(Parameters, RangesAndKinds) {
    for (auto const& n : kNumbers) {
        SCOPED_TRACE(n.name);
        for (char const* bad : n.bad)
            EXPECT_EQ(read(n.name, n.member, bad, 0.75F), n.byDefault) << bad;
        EXPECT_EQ(read(n.name, n.member, nullptr, 1e6F), n.byDefault);
        // In the weight, text is no number; a whole number serves only those that are whole.
        EXPECT_EQ(read(n.name, n.member, nullptr, "0.25"), n.byDefault);
        EXPECT_EQ(read(n.name, n.member, nullptr, 64), n.byDefault > 1.0F ? 64.0F : n.byDefault);
    }
    EXPECT_EQ(read("SMOOT_COEF", &Params::smootCoef, "0.25x", 0.75F), 0.25);
}

TEST(Parameters, OneWordSwitchesOnAndTheOthersOff) {
    auto const isOn = [](auto... source) {
        return read("SKIP_FRAME", &Params::skipFrame, source...) != 0.0;
    };
    EXPECT_TRUE(isOn("TRUE", "f"));
    for (char const* text : {"true", "t", "1", "TRUE ", "FALSE"}) EXPECT_FALSE(isOn(text, "t"));
    EXPECT_TRUE(isOn(nullptr, "t"));
    for (char const* word : {"TRUE", "T", "", "f"}) EXPECT_FALSE(isOn(nullptr, word));
}

// What a model needs is refused where it is missing; a value of the wrong type counts as missing.
TEST(Parameters, MissingValuesAreNamed) {
    std::string const names =
        "SampleRate Step FiltrBegin FiltrEnd FrameLength PreviewFrames CoefficientNumber MU SD "
        "WeightLinear WeightNonLinear BaesLinear BaesNonLinear WeightGRU BaesGRU WeightGRU_reset "
        "BiasGRU_reset GainLinearNorm BiasLinearNorm GainNonLinearNorm BiasNonLinearNorm";
    std::istringstream stream(names);
    for (std::string name; stream >> name;) {
        auto const front = WeightWriter().add(name, "text").bytes();
        EXPECT_THAT([&] { makeCleaner(6, modelFrom(front + randomNcWeight({})), 10); },
                    testing::ThrowsMessage<MORVA::UTILS::MORVA_Exception>(
                        testing::HasSubstr("Key: " + name + "doesn't")));
    }
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
    EXPECT_EQ(read("SMOOT_COEF", &Params::smootCoef, "0.25"), 0.25);
    EXPECT_EQ(read("CLIP_FIX_POINT", &Params::clipFixPoint, "+1000.9"), 1000);
    std::setlocale(LC_ALL, "C");
    unsetenv("LOCPATH");
}
