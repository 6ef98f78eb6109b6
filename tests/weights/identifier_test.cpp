#include "weights/identifier.h"

#include <gtest/gtest.h>

#include <climits>

#include "support/record_writer.h"

namespace {

using namespace MORVA;
using test_support::WeightWriter;

std::string identify(WeightWriter const& writer, std::string const& expectedOutput) {
    WEIGHTS::Weight weight;
    weight.read(writer.bytes().data(), writer.bytes().size());
    testing::internal::CaptureStdout();
    auto identifier = WEIGHTS::weightIdentifier(weight);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), expectedOutput);
    return identifier;
}

struct Case {
    int rate;
    int length;
    char const* expected;
};

class Identifier : public testing::TestWithParam<Case> {};

TEST_P(Identifier, JoinsItsFiveParts) {
    auto const [rate, length, expected] = GetParam();
    WeightWriter writer;
    writer.add("Version", "0.0.6").add("SampleRate", rate).add("FrameLength", length);
    writer.add("ModelName", "nc").add("TimeStamp", "210301");
    auto const text = std::string(expected);
    EXPECT_EQ(identify(writer, text.empty() ? "ERROR INVALID WEIGHT\n" : ""), text);
}

constexpr Case cases[] = {
    {16000, 160, "0.0.61016nc210301"},
    {16000, 175, "0.0.61016nc210301"},
    {44100, 441, "0.0.61044nc210301"},
    {1000, -5, "0.0.6-51nc210301"},
    {1999, 7, "0.0.671nc210301"},
    {8000, -7, "0.0.608nc210301"},
    {1000, INT_MIN, "0.0.6-21474836481nc210301"},
    {INT_MAX, INT_MAX, "0.0.610002147483nc210301"},
    {999, 160, ""},
    {0, 160, ""},
    {-16000, 160, ""},
    {INT_MIN, INT_MIN, ""},
};
INSTANTIATE_TEST_SUITE_P(Table, Identifier, testing::ValuesIn(cases));

TEST(IdentifierTexts, MayBeEmptyOrHoldAnyByte) {
    WeightWriter writer;
    writer.add("Version", "").add("SampleRate", 8000).add("FrameLength", 80);
    writer.add("ModelName", std::string_view("a\0b", 3)).add("TimeStamp", "");
    EXPECT_EQ(identify(writer, ""), std::string("108a\0b", 6));
}

// One of the five missing, then one of another type.
TEST(IdentifierTexts, NeedsAllFiveValues) {
    for (int dropped = 0; dropped < 5; ++dropped) {
        for (bool const mistyped : {false, true}) {
            WeightWriter writer;
            int index = 0;
            for (auto const* name : {"Version", "ModelName", "TimeStamp"}) {
                if (index != dropped)
                    writer.add(name, "text");
                else if (mistyped)
                    writer.add(name, 1);
                ++index;
            }
            for (auto const* name : {"SampleRate", "FrameLength"}) {
                if (index != dropped)
                    writer.add(name, 16000);
                else if (mistyped)
                    writer.add(name, 16000.0F);
                ++index;
            }
            EXPECT_EQ(identify(writer, "ERROR INVALID WEIGHT\n"), "") << dropped << mistyped;
        }
    }
}

}  // namespace
