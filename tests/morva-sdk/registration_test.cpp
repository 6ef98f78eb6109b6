// Registering models through the C interface: files, control files, memory; which weights are
// shared; which model a session gets.
#include <gtest/gtest.h>

#include "engine.h"

using namespace sdk_test;
using test_support::identityNcWeight;
using test_support::NcShape;
using test_support::randomNcWeight;
using test_support::randomVadWeight;
using test_support::TempDir;

namespace {

std::string const kNameTaken = "WARNING model name exists or empty, please insert different name";
std::string const kNoWeight =
    "Warning Weight name isn't included or weight has beeen included before \n";

class Registration : public ::testing::Test {
protected:
    static auto add(std::string const& file, char const* name) {
        return Engine::addFile(file, name);
    }
    std::string at(std::string const& name) const { return (dir_.path() / name).string(); }

    TempDir dir_;
    Engine engine_{dir_.path().wstring().c_str()};
};

auto openNamed(char const* name, int hz = 16000) {
    return observe([&] { return openNc(hz, hz, 10, name); });
}

}  // namespace

TEST_F(Registration, WeightFiles) {
    dir_.write("a.mvw", randomNcWeight({}));
    auto const added = gives(0, "", "WEIGHT " + at("a.mvw") + "\n");
    EXPECT_THAT(add("./x/..//a.mvw", "a"), added);
    EXPECT_THAT(add(at("a.mvw"), "b"), added);
    for (char const* name : {"a", "", static_cast<char const*>(nullptr)}) {
        EXPECT_THAT(add("a.mvw", name), gives(2, "", kNameTaken));
    }
    EXPECT_THAT(add("none.mvw", "c"), gives(2, "",
                                            "WEIGHT " + at("none.mvw") +
                                                "\nWARNING weight isn't loaded \n weigth file: " +
                                                at("none.mvw") + "\n" + kNoWeight));
    for (std::string const file : {"a.MVW", "a.CFG", "a", "a.mvw.bak", "a.", "none.cfg"}) {
        if (file != "none.cfg") dir_.write(file, randomNcWeight({}));
        EXPECT_THAT(add(file, "c"), gives(2, "", kNoWeight)) << file;
    }
    for (char const* name : {"a", "b"}) EXPECT_NE(openNamed(name).result, nullptr);
    EXPECT_EQ(openNamed("c").result, nullptr);
}

TEST_F(Registration, NamesOutsideAscii) {
    std::string const name = "m\u00f6d\u00e9l \u6a21\u578b \U0001F3A4.mvw";
    dir_.write(name, randomNcWeight({}));
    EXPECT_THAT(observe([] {
                    return Morva_SDK_SetModel(L"m\u00f6d\u00e9l \u6a21\u578b \U0001F3A4.mvw", "w");
                }),
                gives(0, "", "WEIGHT " + at(name) + "\n"));
}

TEST_F(Registration, ControlFiles) {
    dir_.write("a.mvw", randomNcWeight({}));
    struct Row {
        std::string text;
        int code;
        std::string out;
    };
    std::string const weight = "WEIGHT a.mvw\n";
    Row const rows[] = {
        {"WEIGHT \t a.mvw \r\n", 0, weight},
        {"# a comment\n\n \t\r\n#\n  K  \f\v two  words \r\nWEIGHT a.mvw", 0,
         "ENVIRONMENT KEY-\"K\" VALUE-\"two  words\"\n" + weight},
        {"WEIGHT a.mvw\nWEIGHT b.mvw\n", 0,
         weight + "WARNING multiple weight including, weight exists.\n"},
        {"WEIGHT a.mvw\nA 1\nA 1\nC 3\n", 2,
         weight + "ENVIRONMENT KEY-\"A\" VALUE-\"1\"\nENVIRONMENT KEY-\"A\" VALUE-\"1\"\n"},
        {"WEIGHT a.mvw\nword\n", 2, kNoWeight},
        {"", 2, kNoWeight},
    };
    for (auto const& row : rows) {
        auto const name = "m" + std::to_string(&row - rows);
        dir_.write(name + ".cfg", row.text);
        EXPECT_THAT(add(name + ".cfg", name.c_str()), gives(row.code, "", row.out)) << row.text;
        EXPECT_EQ(openNamed(name.c_str()).result != nullptr, row.code == 0) << row.text;
    }
    // What a control file says reaches the model.
    dir_.write("six.cfg", "WEIGHT a.mvw\nMORVA_SMOOT_COEF_v0_0_6 2\n");
    EXPECT_EQ(add("six.cfg", "six").result, 0);
    EXPECT_THAT(openNamed("six").out, ::testing::StartsWith("WARNING OF SMOOTH COEF"));
}

// The identifier is version, milliseconds, kilohertz, model name and time stamp. The weights differ
// in their masks, so that a session tells which one it runs.
TEST_F(Registration, EqualIdentifiersShareOneWeight) {
    NcShape shape;
    shape.filtrEnd = 80;
    EXPECT_THAT(Engine::addBlob(identityNcWeight(shape), "first"), gives(0));
    EXPECT_THAT(Engine::addBlob(randomNcWeight(shape), "first"), gives(2, "", kNameTaken));
    EXPECT_THAT(Engine::addBlob(randomNcWeight(shape), "second"), gives(0));
    shape.timeStamp = "210302";
    EXPECT_THAT(Engine::addBlob(randomNcWeight(shape), "third"), gives(0));
    auto const sound = voice(16000, 0.3, 1);
    auto const first = cleanAll(openNc(16000, 16000, 10, "first"), sound);
    EXPECT_EQ(cleanAll(openNc(16000, 16000, 10, "second"), sound), first);
    EXPECT_NE(cleanAll(openNc(16000, 16000, 10, "third"), sound), first);
}

TEST_F(Registration, AutomaticChoiceTakesTheHighestRateThatFits) {
    auto const none = fails<void*>(nullptr, "create", "Weight not found ",
                                   "src/noise_canceller/noise_cleaner Line 105");
    EXPECT_THAT(openNamed(nullptr), none);
    // Told apart by their latency.
    Engine::addIdentity("16k", 16000, 20);
    EXPECT_THAT(openNamed(nullptr, 12000), none);
    Engine::addIdentity("16k later", 16000, 30);
    Engine::addIdentity("8k", 8000, 30);
    Engine::addIdentity("32k", 32000, 32);
    // Voice activity looks at its own kind, and where there is none at models that know voice, too.
    auto const voiceAt = [](int hz) {
        return observe([&] { return Morva_VAD_CreateSession(rate(hz), duration(10), nullptr); });
    };
    auto const scoreOf = [](void* session) {
        return valueOf(Kind::voice, session, std::vector<short>(160, 5000));
    };
    auto const named = [](char const* model) { return Stream(Kind::voice, 16000, 0, 10, model); };
    EXPECT_THAT(voiceAt(16000), none);
    Engine::add("band", randomNcWeight({.version = "NC_1.0.0"}));
    EXPECT_EQ(scoreOf(voiceAt(16000).result), scoreOf(named("band").handle));
    EXPECT_THAT(voiceAt(12000), none);
    Engine::add("vad", randomVadWeight({.sampleRate = 16000, .frameLength = 480}));
    EXPECT_EQ(scoreOf(voiceAt(16000).result), scoreOf(named("vad").handle));
    EXPECT_NE(scoreOf(named("vad").handle), scoreOf(named("band").handle));
    EXPECT_THAT(voiceAt(8000), none);
    char const* const expected[] = {"8k", "8k", "16k", "16k", "32k", "32k", "32k", "32k", "32k"};
    for (std::size_t i = 0; i < std::size(kRates); ++i) {
        EXPECT_EQ(MorvaExt_SessionLatencySamples(openNc(kRates[i], 48000, 10, nullptr)),
                  MorvaExt_SessionLatencySamples(openNc(kRates[i], 48000, 10, expected[i])))
            << kRates[i];
    }
}
