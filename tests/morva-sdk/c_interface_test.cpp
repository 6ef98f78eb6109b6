// Codes, texts and streams of every function of the C interface.
#include <gtest/gtest.h>

#include <functional>

#include "engine.h"

using namespace sdk_test;
using test_support::randomNcWeight;
using test_support::randomVadWeight;

namespace {

std::string const kWrongSession = "The Session pointer is wrong insert existing session pointer\n";
std::string const kInstance = "src/morva-sdk/instance Line [0-9]*";
std::string const kFactory = "src/noise_canceller/noise_cleaner Line ";
std::string const kBadValues =
    "ERROR input dataSize or output dataSize or pointers of inputData output Data is wrong\n input "
    "size must be 160\n output size must be ";
std::string const kBadFloats =
    "ERROR input dataSize or output dataSize is wrong \n input size must be 160\n output size must "
    "be ";

short in16[160] = {};
short out16[160] = {};
float in32[160] = {};
float out32[160] = {};
double exact = 0;

template <class Function, class... Arguments>
auto call(Function function, Arguments... arguments) {
    return observe([&] { return function(arguments...); });
}
auto tryNc(int in, int out, int ms, char const* model) {
    return call(openNc, in, out, ms, model);
}
auto tryVad(int hz, int ms, char const* model) {
    return call(Morva_VAD_CreateSession, rate(hz), duration(ms), model);
}
auto tryDb(int hz, int ms, char const* model) {
    return call(Morva_NoiseDB_CreateSession, rate(hz), duration(ms), model);
}

// One model of every kind and one session of each, at 16 kHz and 10 ms.
class Interface : public ::testing::Test {
protected:
    void SetUp() override {
        Engine::add("nc", randomNcWeight({}));
        Engine::add("vad", randomVadWeight({}));
        Engine::add("db", randomNcWeight({.version = "0.0.5"}));
        nc = tryNc(16000, 16000, 10, "nc").result;
        vadSession = tryVad(16000, 10, "vad").result;
        db = tryDb(16000, 10, "db").result;
        ASSERT_TRUE(nc && vadSession && db);
    }

    Engine engine_;
    void* nc = nullptr;
    void* vadSession = nullptr;
    void* db = nullptr;
};

// Every function that takes a handle, the kind that it wants (0: any), and what it answers to any
// other handle: with an exception where it names one's function.
struct HandleCall {
    std::function<float(void*)> run;
    int kind;
    float wrong;
    char const* thrower = nullptr;
};
HandleCall const kHandleCalls[] = {
    {Morva_NC_CloseSession, 1, -3, "closeSession"},
    {Morva_VAD_CloseSession, 2, -3, "closeSession"},
    {Morva_NoiseDB_CloseSession, 3, -3, "closeSession"},
    {Morva_NoiseDB_ResetSession, 3, -3, "Morva_NoiseDB_ResetSession"},
    {[](void* h) { return Morva_NC_CleanAmbientNoiseInt16(h, in16, 160, out16, 160); }, 1, 2},
    {[](void* h) { return Morva_NC_CleanAmbientNoiseFloat(h, nullptr, 0, nullptr, 0); }, 1, 2},
    {[](void* h) { return Morva_VAD_FrameInt16(h, in16, 160); }, 2, -4},
    {[](void* h) { return Morva_VAD_FrameFloat(h, in32, 160); }, 2, -4},
    {[](void* h) { return Morva_NoiseDB_FrameInt16(h, in16, 160); }, 3, -4},
    {[](void* h) { return Morva_NoiseDB_FrameFloat(h, in32, 160); }, 3, -4},
    {[](void* h) { return MorvaExt_NoiseDB_FrameFloat(h, in32, 160, out32); }, 3, 2},
    {MorvaExt_SessionLatencySamples, 1, -2},
    {[](void* h) { return MorvaExt_SessionExactLatency(h, &exact); }, 1, 2},
    {[](void* h) { return MorvaExt_SessionFrameSizes(h, nullptr, nullptr); }, 0, 2},
    {[](void* h) { return MorvaExt_NC_SetAttenuationLimit(h, 0.0F); }, 1, 2},
    {[](void* h) { return MorvaExt_NC_SetBypass(h, 1); }, 1, 2},
    {[](void* h) { return MorvaExt_NC_SetBackgroundSpeaker(h, 1); }, 1, 2},
    {[](void* h) { return MorvaExt_NC_EnableVoice(h, "vad"); }, 1, 2},
    {[](void* h) { return MorvaExt_NC_FrameMeters(h, out32, out32); }, 1, 2},
};

}  // namespace

TEST(LifeCycle, CreateTwiceAndDestroyTwice) {
    auto const noEngine = fails(-3, "Instance", "DESTROYING WITHOUT INTIALIZATION", kInstance);
    EXPECT_THAT(call(Morva_SDK_GlobalDestroy), noEngine);
    for (unsigned threads : {0U, 1U, 8U, 9U}) {
        EXPECT_THAT(call(Morva_SDK_GlobalInit, nullptr, threads), gives(0));
        EXPECT_THAT(call(Morva_SDK_GlobalInit, L"/x", threads),
                    fails(-3, "Instance", "DOUBLE INITIALIZATION WITHOUT DESTROYING", kInstance));
        EXPECT_THAT(call(Morva_SDK_GlobalDestroy), gives(0));
    }
    EXPECT_THAT(call(Morva_SDK_GlobalDestroy), noEngine);
}

TEST(LifeCycle, WithoutEngineEveryCallFails) {
    std::string const text = "TRY TO GET NULL INSTANCE,ISN'T INITIALIZED";
    auto const code = fails(-3, "Instance", text, kInstance);
    auto const handle = fails<void*>(nullptr, "Instance", text, kInstance);
    EXPECT_THAT(call(Morva_SDK_SetModel, L"x.mvw", "x"), code);
    EXPECT_THAT(call(Morva_SDK_SetModel_Blob, "x", 1U, "x"), code);
    EXPECT_THAT(tryNc(8000, 8000, 10, "x"), handle);
    EXPECT_THAT(tryVad(8000, 10, "x"), handle);
    EXPECT_THAT(tryDb(8000, 10, nullptr), handle);
    for (auto const& row : kHandleCalls) {
        EXPECT_THAT(call(row.run, nullptr), fails(-3.0F, "Instance", text, kInstance));
    }
}

TEST_F(Interface, WrongRatesAreRefusedAtOnceAndDurationsAfterTheModelIsLookedUp) {
    auto const refused = gives<void*>(nullptr, "Unsupported Sampling rates!\n");
    for (int hz : {-1, 0, 7999, 11025, 22050, 96001, 192000}) {
        EXPECT_THAT(tryNc(hz, 16000, 10, "nc"), refused);
        EXPECT_THAT(tryNc(16000, hz, 10, "nc"), refused);
        EXPECT_THAT(tryVad(hz, 10, "vad"), refused);
    }
    for (int ms : {-10, 0, 1, 15, 25, 32, 50, 1000000}) {
        EXPECT_THAT(
            tryNc(16000, 48000, ms, "nc"),
            fails<void*>(nullptr, "MorvaSessionT", "RESAMPLER WORKS WITH WRONG FRAMEDURATION ",
                         "src/morva-sdk/session Line [0-9]*"));
        EXPECT_THAT(
            tryNc(16000, 48000, ms, "none"),
            fails<void*>(nullptr, "create", "Weight with this name isn't found", kFactory + "100"));
        EXPECT_EQ(tryVad(16000, ms, "vad").result, nullptr);
    }
}

TEST_F(Interface, ModelsServeTheSessionsOfTheirVersion) {
    auto const wrongKind =
        fails<void*>(nullptr, "create", "Unsupported weight version", kFactory + "127");
    EXPECT_THAT(tryNc(16000, 16000, 10, "vad"), wrongKind);
    EXPECT_THAT(tryVad(16000, 10, "nc"), wrongKind);
    EXPECT_THAT(tryVad(16000, 10, "db"), wrongKind);
    EXPECT_THAT(tryDb(16000, 10, "nc"), wrongKind);
    Engine::add("later", test_support::WeightWriter().add("Version", "0.0.7").bytes());
    EXPECT_THAT(tryNc(16000, 16000, 10, "later"), wrongKind);
    EXPECT_NE(openNc(16000, 16000, 10, "db"), nullptr);
}

TEST_F(Interface, EveryCallWantsALiveSessionOfItsKind) {
    int stranger = 0;
    auto* const closed = openNc(16000, 16000, 10, "nc");
    EXPECT_EQ(Morva_NC_CloseSession(closed), 0);
    std::pair<void*, int> const handles[] = {{nullptr, -1}, {&stranger, -1}, {closed, -1},
                                             {nc, 1},       {vadSession, 2}, {db, 3}};
    for (auto const& row : kHandleCalls) {
        std::string const verb =
            row.thrower != nullptr && row.thrower[0] == 'c' ? "close" : "reset";
        auto const thrown =
            "Trying to " + verb + " a non-existant session or session of incompatible type";
        for (auto const& [handle, kind] : handles) {
            if (kind == row.kind || (kind > 0 && row.kind == 0)) continue;
            EXPECT_THAT(call(row.run, handle), row.thrower != nullptr
                                                   ? fails(row.wrong, row.thrower, thrown)
                                                   : gives(row.wrong, kWrongSession));
        }
    }
    EXPECT_THAT(call(Morva_NoiseDB_ResetSession, db), gives(1));
    EXPECT_THAT(call(Morva_NC_CloseSession, nc), gives(0));
    EXPECT_THAT(call(Morva_VAD_CloseSession, vadSession), gives(0));
    EXPECT_THAT(call(Morva_NoiseDB_CloseSession, db), gives(0));
}

TEST_F(Interface, WrongSizesAndPointersOfSound) {
    auto const check = [&](bool in, unsigned inSize, bool out, unsigned outSize) {
        EXPECT_THAT(call(Morva_NC_CleanAmbientNoiseInt16, nc, in ? in16 : nullptr, inSize,
                         out ? out16 : nullptr, outSize),
                    gives(1, kBadValues + "160\n"));
        EXPECT_THAT(call(Morva_NC_CleanAmbientNoiseFloat, nc, in ? in32 : nullptr, inSize,
                         out ? out32 : nullptr, outSize),
                    gives(1, kBadFloats + "160\n"));
    };
    for (unsigned const size : {0U, 159U, 161U, ~0U}) {
        check(true, size, true, 160);
        check(true, 160, true, size);
    }
    check(false, 160, true, 160);
    check(true, 160, false, 160);
    EXPECT_THAT(call(Morva_NC_CleanAmbientNoiseInt16, nc, in16, 160U, out16, 160U), gives(0));
}

TEST_F(Interface, WrongSizesAndPointersOfValues) {
    auto const check = [&](auto int16, auto float32, void* session, char const* function) {
        for (bool null : {false, true}) {
            unsigned const size = null ? 160 : 161;
            auto seen = call(int16, session, null ? nullptr : in16, size);
            ASSERT_TRUE(seen.err.starts_with(kBadValues + "\n")) << seen.err;
            seen.err.erase(0, kBadValues.size() + 1);
            EXPECT_THAT(seen, fails(-3.0F, function, "ERROR in input values",
                                    "src/morva-sdk/session Line [0-9]*"));
            EXPECT_THAT(call(float32, session, null ? nullptr : in32, size),
                        gives(-4.0F, kBadFloats + "\nTHE CLEANING ERROR OUTPUT result -2\n" +
                                         kWrongSession));
        }
    };
    check(Morva_VAD_FrameInt16, Morva_VAD_FrameFloat, vadSession, "frameVad");
    check(Morva_NoiseDB_FrameInt16, Morva_NoiseDB_FrameFloat, db, "frameNoiseDB");
    EXPECT_EQ(MorvaExt_NoiseDB_FrameFloat(db, in32, 161, out32), 1);
    EXPECT_EQ(MorvaExt_NoiseDB_FrameFloat(db, nullptr, 160, out32), 2);
    EXPECT_EQ(MorvaExt_NoiseDB_FrameFloat(db, in32, 160, nullptr), 2);
    // Floats outside the unit range are refused as well.
    EXPECT_THAT(call(Morva_NoiseDB_FrameFloat, db, in32, 160U),
                gives(-4.0F, "THE CLEANING ERROR OUTPUT result -60\n" + kWrongSession));
    EXPECT_THAT(call(Morva_NoiseDB_FrameInt16, db, in16, 160U), gives(-60.0F));
}

TEST_F(Interface, SizesOfEveryKindOfSession) {
    auto const check = [](void* session, unsigned in, unsigned out) {
        unsigned sizes[2] = {};
        EXPECT_EQ(MorvaExt_SessionFrameSizes(session, &sizes[0], &sizes[1]), 0);
        EXPECT_THAT(sizes, ::testing::ElementsAre(in, out));
    };
    for (int hz : kRates) check(openNc(hz, 88200, 30, "db"), samples(hz, 30), 2646);
    check(vadSession, 160, 0);
    check(tryDb(8000, 40, "db").result, 320, 640);
}

TEST(LifeCycle, DestroyingTheEngineEndsItsSessions) {
    std::vector<void*> handles;
    {
        Engine engine;
        Engine::addIdentity("id", 16000, 20);
        for (int i = 0; i < 200; ++i) handles.push_back(openNc(16000, 16000, 10, "id"));
        EXPECT_EQ(Morva_NC_CloseSession(handles[7]), 0);
        EXPECT_EQ(MorvaExt_SessionLatencySamples(handles[8]), 160);
    }
    Engine again;
    for (void* handle : handles) EXPECT_EQ(call(Morva_NC_CloseSession, handle).result, -3);
    EXPECT_EQ(tryNc(16000, 16000, 10, "id").result, nullptr);
}
