// Codes, texts and streams of every function of the C interface.
#include <gtest/gtest.h>

#include <sstream>

#include "engine.h"

using namespace sdk_test;
using test_support::randomNcWeight;
using test_support::randomVadWeight;
using test_support::VadShape;

namespace {

std::string const kWrongSession = "The Session pointer is wrong insert existing session pointer\n";
std::string const kNoEngine = "TRY TO GET NULL INSTANCE,ISN'T INITIALIZED";
std::string const kNoClose =
    "Trying to close a non-existant session or session of incompatible type";
std::string const kInstance = "src/morva-sdk/instance Line [0-9]*";

// One model of every kind and one session of each, at 16 kHz and 10 ms.
class Interface : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_EQ(Engine::add("nc", randomNcWeight({})), 0);
        ASSERT_EQ(Engine::add("vad", randomVadWeight({})), 0);
        ASSERT_EQ(Engine::add("db", randomNcWeight({.version = "0.0.5"})), 0);
        nc = openNc(16000, 16000, 10, "nc");
        vadSession = Morva_VAD_CreateSession(rate(16000), duration(10), "vad");
        db = Morva_NoiseDB_CreateSession(rate(16000), duration(10), "db");
        ASSERT_TRUE(nc && vadSession && db);
    }

    Engine engine_;
    void* nc = nullptr;
    void* vadSession = nullptr;
    void* db = nullptr;
    std::vector<short> in16 = std::vector<short>(160);
    std::vector<short> out16 = std::vector<short>(160);
    std::vector<float> in32 = std::vector<float>(160);
    std::vector<float> out32 = std::vector<float>(160);
};

template <class Function, class... Arguments>
auto call(Function function, Arguments... arguments) {
    return observe([&] { return function(arguments...); });
}
auto tryNc(int in, int out, int ms, char const* model) {
    return call(Morva_NC_CreateSession, rate(in), rate(out), duration(ms), model);
}
auto tryVad(int hz, int ms, char const* model) {
    return call(Morva_VAD_CreateSession, rate(hz), duration(ms), model);
}
auto tryDb(int hz, int ms, char const* model) {
    return call(Morva_NoiseDB_CreateSession, rate(hz), duration(ms), model);
}

}  // namespace

TEST(LifeCycle, CreateTwiceAndDestroyTwice) {
    EXPECT_THAT(call(Morva_SDK_GlobalDestroy),
                fails(-3, "Instance", "DESTROYING WITHOUT INTIALIZATION", kInstance));
    for (unsigned threads : {0U, 1U, 8U, 9U}) {
        EXPECT_THAT(call(Morva_SDK_GlobalInit, nullptr, threads), gives(0));
        EXPECT_THAT(call(Morva_SDK_GlobalInit, L"/x", threads),
                    fails(-3, "Instance", "DOUBLE INITIALIZATION WITHOUT DESTROYING", kInstance));
        EXPECT_THAT(call(Morva_SDK_GlobalDestroy), gives(0));
    }
    EXPECT_THAT(call(Morva_SDK_GlobalDestroy),
                fails(-3, "Instance", "DESTROYING WITHOUT INTIALIZATION", kInstance));
}

TEST(LifeCycle, WithoutEngineEveryCallFailsAfterItsOwnChecks) {
    short s[160] = {};
    float f[160] = {};
    auto const code = fails(-3, "Instance", kNoEngine, kInstance);
    auto const value = fails(-3.0F, "Instance", kNoEngine, kInstance);
    auto const handle = fails<void*>(nullptr, "Instance", kNoEngine, kInstance);
    EXPECT_THAT(call(Morva_SDK_SetModel, L"x.mvw", "x"), code);
    EXPECT_THAT(call(Morva_SDK_SetModel_Blob, "x", 1U, "x"), code);
    EXPECT_THAT(tryNc(8000, 8000, 10, "x"), handle);
    EXPECT_THAT(tryVad(8000, 10, "x"), handle);
    EXPECT_THAT(tryDb(8000, 10, nullptr), handle);
    for (auto* close : {Morva_NC_CloseSession, Morva_VAD_CloseSession, Morva_NoiseDB_CloseSession,
                        Morva_NoiseDB_ResetSession, MorvaExt_SessionLatencySamples}) {
        EXPECT_THAT(call(close, nullptr), code);
    }
    EXPECT_THAT(call(Morva_NC_CleanAmbientNoiseInt16, nullptr, s, 160U, s, 160U), code);
    EXPECT_THAT(call(Morva_NC_CleanAmbientNoiseFloat, nullptr, f, 160U, f, 160U), code);
    EXPECT_THAT(call(Morva_VAD_FrameInt16, nullptr, s, 160U), value);
    EXPECT_THAT(call(Morva_VAD_FrameFloat, nullptr, f, 160U), value);
    EXPECT_THAT(call(Morva_NoiseDB_FrameInt16, nullptr, s, 160U), value);
    EXPECT_THAT(call(Morva_NoiseDB_FrameFloat, nullptr, f, 160U), value);
    EXPECT_THAT(call(MorvaExt_NoiseDB_FrameFloat, nullptr, f, 160U, f), code);
    EXPECT_THAT(call(MorvaExt_SessionFrameSizes, nullptr, nullptr, nullptr), code);

    // These are looked at first.
    EXPECT_THAT(call(Morva_SDK_SetModel, nullptr, "x"),
                gives(2, "", "WARRNING Morva_SetWeight FUNCTION CALL with nullptr\n"));
    EXPECT_THAT(call(Morva_SDK_SetModel_Blob, nullptr, 5U, "x"),
                gives(2, "", "WARRNING Morva_SDK_SetModel_Blob FUNCTION CALL with nullptr\n"));
    EXPECT_THAT(tryVad(1, 10, nullptr), gives<void*>(nullptr, "Unsupported Sampling rates!\n"));
}

TEST_F(Interface, OnlyNineRatesAreTaken) {
    auto const refused = gives<void*>(nullptr, "Unsupported Sampling rates!\n");
    for (int hz : {-1, 0, 7999, 11025, 22050, 96001, 192000}) {
        EXPECT_THAT(tryNc(hz, 16000, 10, "nc"), refused);
        EXPECT_THAT(tryNc(16000, hz, 10, "nc"), refused);
        EXPECT_THAT(tryVad(hz, 10, "vad"), refused);
        EXPECT_THAT(tryDb(hz, 10, "db"), refused);
    }
}

TEST_F(Interface, DurationsAreRefusedAfterTheModelIsLookedUp) {
    for (int ms : {-10, 0, 1, 15, 25, 32, 50, 1000000}) {
        EXPECT_THAT(
            tryNc(16000, 48000, ms, "nc"),
            fails<void*>(nullptr, "MorvaSessionT", "RESAMPLER WORKS WITH WRONG FRAMEDURATION ",
                         "src/morva-sdk/session Line [0-9]*"));
        EXPECT_THAT(tryNc(16000, 48000, ms, "none"),
                    fails<void*>(nullptr, "create", "Weight with this name isn't found",
                                 "src/noise_canceller/noise_cleaner Line 100"));
        bool const known = ms == 15 || ms == 32;
        EXPECT_EQ(tryVad(16000, ms, "vad").out, known ? "" : "ERROR FRAMEDURATIONS\n");
    }
}

TEST_F(Interface, ModelsServeTheSessionsOfTheirVersion) {
    auto const wrongKind = fails<void*>(nullptr, "create", "Unsupported weight version",
                                        "src/noise_canceller/noise_cleaner Line 127");
    EXPECT_THAT(tryNc(16000, 16000, 10, "vad"), wrongKind);
    EXPECT_THAT(tryVad(16000, 10, "nc"), wrongKind);
    EXPECT_THAT(tryVad(16000, 10, "db"), wrongKind);
    EXPECT_THAT(tryDb(16000, 10, "nc"), wrongKind);
    for (std::string const version : {"0.0.0", "0.0.7", "0.0.60", "", "VAD_0.0.2"}) {
        auto const name = "version " + version;
        auto const weight = test_support::WeightWriter().add("Version", version).bytes();
        ASSERT_EQ(Engine::add(name.c_str(), weight), 0);
        EXPECT_THAT(tryNc(16000, 16000, 10, name.c_str()), wrongKind);
    }
    EXPECT_NE(openNc(16000, 16000, 10, "db"), nullptr);
}

TEST_F(Interface, CloseAndResetWantTheirOwnKind) {
    using Close = int (*)(void*);
    struct Row {
        Close close;
        void* own;
    };
    Row const rows[] = {{Morva_NC_CloseSession, nc},
                        {Morva_VAD_CloseSession, vadSession},
                        {Morva_NoiseDB_CloseSession, db}};
    int stranger = 0;
    for (void* handle :
         {nc, vadSession, static_cast<void*>(nullptr), static_cast<void*>(&stranger)}) {
        EXPECT_THAT(
            call(Morva_NoiseDB_ResetSession, handle),
            fails(-3, "Morva_NoiseDB_ResetSession",
                  "Trying to reset a non-existant session or session of incompatible type"));
    }
    EXPECT_THAT(call(Morva_NoiseDB_ResetSession, db), gives(1));
    for (auto const& row : rows) {
        for (void* handle :
             {nc, vadSession, db, static_cast<void*>(nullptr), static_cast<void*>(&stranger)}) {
            if (handle == row.own) continue;
            EXPECT_THAT(call(row.close, handle), fails(-3, "closeSession", kNoClose));
        }
    }
    for (auto const& row : rows) {
        EXPECT_THAT(call(row.close, row.own), gives(0));
        EXPECT_THAT(call(row.close, row.own), fails(-3, "closeSession", kNoClose));
    }
}

TEST_F(Interface, FramesWantALiveSessionOfTheirKind) {
    int stranger = 0;
    auto const wrong = gives(2, kWrongSession);
    auto const wrongValue = gives(-4.0F, kWrongSession);
    for (void* handle :
         {static_cast<void*>(nullptr), static_cast<void*>(&stranger), nc, vadSession, db}) {
        if (handle != nc) {
            EXPECT_THAT(call(Morva_NC_CleanAmbientNoiseInt16, handle, in16.data(), 160U,
                             out16.data(), 160U),
                        wrong);
            EXPECT_THAT(call(Morva_NC_CleanAmbientNoiseFloat, handle, nullptr, 0U, nullptr, 0U),
                        wrong);
        }
        if (handle != vadSession) {
            EXPECT_THAT(call(Morva_VAD_FrameInt16, handle, in16.data(), 160U), wrongValue);
            EXPECT_THAT(call(Morva_VAD_FrameFloat, handle, in32.data(), 160U), wrongValue);
        }
        if (handle != db) {
            EXPECT_THAT(call(Morva_NoiseDB_FrameInt16, handle, in16.data(), 160U), wrongValue);
            EXPECT_THAT(call(Morva_NoiseDB_FrameFloat, handle, in32.data(), 160U), wrongValue);
            EXPECT_THAT(call(MorvaExt_NoiseDB_FrameFloat, handle, in32.data(), 160U, out32.data()),
                        wrong);
        }
    }
}

TEST_F(Interface, WrongSizesAndPointersOfSound) {
    std::string const text16 =
        "ERROR input dataSize or output dataSize or pointers of inputData output Data is wrong\n "
        "input size must be 160\n output size must be 160\n";
    std::string const text32 =
        "ERROR input dataSize or output dataSize is wrong \n input size must be 160\n output size "
        "must be 160\n";
    for (auto const& [inSize, outSize] :
         {std::pair{159U, 160U}, {160U, 161U}, {0U, 0U}, {~0U, 160U}}) {
        EXPECT_THAT(
            call(Morva_NC_CleanAmbientNoiseInt16, nc, in16.data(), inSize, out16.data(), outSize),
            gives(1, text16));
        EXPECT_THAT(
            call(Morva_NC_CleanAmbientNoiseFloat, nc, in32.data(), inSize, out32.data(), outSize),
            gives(1, text32));
    }
    EXPECT_THAT(call(Morva_NC_CleanAmbientNoiseInt16, nc, nullptr, 160U, out16.data(), 160U),
                gives(1, text16));
    EXPECT_THAT(call(Morva_NC_CleanAmbientNoiseFloat, nc, in32.data(), 160U, nullptr, 160U),
                gives(1, text32));
    EXPECT_THAT(call(Morva_NC_CleanAmbientNoiseInt16, nc, in16.data(), 160U, out16.data(), 160U),
                gives(0));
}

TEST_F(Interface, WrongSizesAndPointersOfValues) {
    std::string const printed16 =
        "ERROR input dataSize or output dataSize or pointers of inputData output Data is wrong\n "
        "input size must be 160\n output size must be \n";
    std::string const printed32 =
        "ERROR input dataSize or output dataSize is wrong \n input size must be 160\n output size "
        "must be \nTHE CLEANING ERROR OUTPUT result -2\n" +
        kWrongSession;
    struct Row {
        float (*int16)(void*, short const*, unsigned);
        float (*float32)(void*, float const*, unsigned);
        void* session;
        char const* function;
    };
    for (auto const& row :
         {Row{Morva_VAD_FrameInt16, Morva_VAD_FrameFloat, vadSession, "frameVad"},
          Row{Morva_NoiseDB_FrameInt16, Morva_NoiseDB_FrameFloat, db, "frameNoiseDB"}}) {
        for (bool null : {false, true}) {
            unsigned const size = null ? 160 : 161;
            auto const seen = call(row.int16, row.session, null ? nullptr : in16.data(), size);
            EXPECT_EQ(seen.result, -3.0F);
            ASSERT_TRUE(seen.err.starts_with(printed16)) << seen.err;
            EXPECT_THAT((Outcome<float>{seen.result, "", seen.err.substr(printed16.size())}),
                        fails(-3.0F, row.function, "ERROR in input values",
                              "src/morva-sdk/session Line [0-9]*"));
            EXPECT_THAT(call(row.float32, row.session, null ? nullptr : in32.data(), size),
                        gives(-4.0F, printed32));
        }
    }
    EXPECT_EQ(MorvaExt_NoiseDB_FrameFloat(db, in32.data(), 161, out32.data()), 1);
    EXPECT_EQ(MorvaExt_NoiseDB_FrameFloat(db, nullptr, 160, out32.data()), 2);
    EXPECT_EQ(MorvaExt_NoiseDB_FrameFloat(db, in32.data(), 160, nullptr), 2);
}

TEST_F(Interface, FloatValuesOutsideTheUnitRangeAreRefused) {
    EXPECT_THAT(call(Morva_NoiseDB_FrameFloat, db, in32.data(), 160U),
                gives(-4.0F, "THE CLEANING ERROR OUTPUT result -60\n" + kWrongSession));
    EXPECT_THAT(call(Morva_NoiseDB_FrameInt16, db, in16.data(), 160U), gives(-60.0F));
    EXPECT_THAT(call(MorvaExt_NoiseDB_FrameFloat, db, in32.data(), 160U, out32.data()), gives(0));
    EXPECT_EQ(out32[0], -60.0F);

    // An uncalibrated model answers with a logit.
    for (unsigned seed = 1; seed < 9; ++seed) {
        auto const name = "raw" + std::to_string(seed);
        VadShape const shape{.calibration = {}, .seed = seed, .timeStamp = name};
        ASSERT_EQ(Engine::add(name.c_str(), randomVadWeight(shape)), 0);
        auto const whole =
            call(Morva_VAD_FrameInt16, tryVad(8000, 10, name.c_str()).result, in16.data(), 80U);
        auto const unit =
            call(Morva_VAD_FrameFloat, tryVad(8000, 10, name.c_str()).result, in32.data(), 80U);
        EXPECT_EQ(whole.err, "");
        std::ostringstream text;
        text << "THE CLEANING ERROR OUTPUT result " << whole.result << "\n" << kWrongSession;
        bool const inUnit = whole.result >= 0.0F && whole.result <= 1.0F;
        EXPECT_THAT(unit, inUnit ? gives(whole.result) : gives(-4.0F, text.str()));
    }
}

TEST_F(Interface, SizesOfAllRatesAndDurations) {
    auto const sizes = [](void* session) {
        std::pair<unsigned, unsigned> found;
        EXPECT_EQ(MorvaExt_SessionFrameSizes(session, &found.first, &found.second), 0);
        EXPECT_EQ(MorvaExt_SessionFrameSizes(session, nullptr, nullptr), 0);
        return found;
    };
    for (int ms : kDurations) {
        for (int hz : kRates) {
            unsigned const in = samples(hz, ms);
            for (int out : {8000, 44100, 96000}) {
                auto* const session = openNc(hz, out, ms, "db");
                EXPECT_EQ(sizes(session), std::pair(in, samples(out, ms)));
                EXPECT_EQ(Morva_NC_CloseSession(session), 0);
            }
            auto* const voiceSession = Morva_VAD_CreateSession(rate(hz), duration(ms), "vad");
            EXPECT_EQ(sizes(voiceSession), std::pair(in, 0U));
            auto* const levelSession = Morva_NoiseDB_CreateSession(rate(hz), duration(ms), "db");
            EXPECT_EQ(sizes(levelSession), std::pair(in, samples(16000, ms)));  // at any rate
            std::vector<short> const silence(in);
            EXPECT_EQ(level(levelSession, silence), -60.0F);
            EXPECT_THAT(vad(voiceSession, silence),
                        ::testing::AllOf(::testing::Ge(1e-5F), ::testing::Le(0.99999F)));
        }
    }
}

TEST(LifeCycle, DestroyingTheEngineEndsItsSessions) {
    std::vector<void*> handles;
    {
        Engine engine;
        Engine::addIdentity("id", 16000, 20);
        for (int i = 0; i < 200; ++i) handles.push_back(openNc(16000, 16000, 10, "id"));
        // Handles stay apart, and closing one leaves the others alone.
        for (std::size_t i = 0; i < handles.size(); i += 3) {
            EXPECT_EQ(Morva_NC_CloseSession(handles[i]), 0);
            handles[i] = nullptr;
        }
        for (void* handle : handles) {
            if (handle == nullptr) continue;
            EXPECT_EQ(MorvaExt_SessionLatencySamples(handle), 160);
        }
    }
    Engine again;
    for (void* handle : handles) {
        EXPECT_EQ(observe([&] { return Morva_NC_CloseSession(handle); }).result, -3);
    }
    EXPECT_EQ(observe([&] { return openNc(16000, 16000, 10, "id"); }).result, nullptr);
}
