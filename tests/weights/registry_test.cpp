// The identifier by which a weight that is loaded already is recognised. (What registration says
// and does, control files included: see the tests of the C interface.)
#include <gtest/gtest.h>

#include <sstream>

#include "support/weight_writer.h"
#include "weights/model_registry.h"

namespace {

using namespace MORVA;
using test_support::WeightWriter;

std::string identify(WeightWriter const& writer, std::string const& expectedOutput) {
    auto const weight = std::make_shared<WEIGHTS::Weight>();
    weight->read(writer.bytes().data(), writer.bytes().size());
    testing::internal::CaptureStdout();
    auto identifier = WEIGHTS::ModelRegistry::mvwUniqueIdGenerator(weight);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), expectedOutput);
    return identifier;
}

TEST(Identifier, JoinsItsFiveParts) {
    std::istringstream rows(
        "16000 175 0.0.61016nc210301  44100 441 0.0.61044nc210301  1000 -5 0.0.6-51nc210301 "
        "8000 -7 0.0.608nc210301  1999 -2147483648 0.0.6-21474836481nc210301  999 160 none "
        "2147483647 2147483647 0.0.610002147483nc210301  -2147483648 -2147483648 none");
    std::string expected;
    for (int rate = 0, length = 0; rows >> rate >> length >> expected;) {
        WeightWriter writer;
        writer.add("Version", "0.0.6").add("SampleRate", rate).add("FrameLength", length);
        writer.add("ModelName", "nc").add("TimeStamp", "210301");
        bool const none = expected == "none";
        EXPECT_EQ(identify(writer, none ? "ERROR INVALID WEIGHT\n" : ""), none ? "" : expected);
    }
    WeightWriter writer;  // texts may be empty or hold any byte
    writer.add("Version", "").add("SampleRate", 8000).add("FrameLength", 80);
    writer.add("ModelName", std::string_view("a\0b", 3)).add("TimeStamp", "");
    EXPECT_EQ(identify(writer, ""), std::string("108a\0b", 6));
}

// One of the five missing, then one of another type.
TEST(Identifier, NeedsAllFiveValues) {
    for (int dropped = 0; dropped < 5; ++dropped) {
        for (bool const mistyped : {false, true}) {
            WeightWriter writer;
            auto add = [&, index = 0](char const* name, auto value, auto wrong) mutable {
                if (index != dropped) writer.add(name, value);
                if (index++ == dropped && mistyped) writer.add(name, wrong);
            };
            for (auto const* name : {"Version", "ModelName", "TimeStamp"}) add(name, "text", 1);
            for (auto const* name : {"SampleRate", "FrameLength"}) add(name, 16000, 16000.0F);
            EXPECT_EQ(identify(writer, "ERROR INVALID WEIGHT\n"), "") << dropped << mistyped;
        }
    }
}

}  // namespace
