// Memory: what sessions hold, and what happens when an allocation fails. (That frames take none:
// see reliability.)
#include <gtest/gtest.h>

#include <cstdio>
#include <functional>

#include "engine.h"
#include "support/allocation_counter.h"

using namespace sdk_test;
using test_support::failingAllocation;
using test_support::randomNcWeight;

// What a session holds beside the weights and tables that it shares with the first one.
TEST(SessionMemory, IsSmallBesideTheModel) {
    Engine engine;
    ASSERT_EQ(Engine::addFile(MORVA_TEST_MODELS "c6.xs.f.ca03f4.mvw", "c6").result, 0);
    auto* const first = openNc(48000, 48000, 10, "c6");
    std::size_t const before = test_support::heldBytes;
    openNc(48000, 48000, 10, "c6");
    std::size_t const held = test_support::heldBytes - before;
    std::printf("[   memory ] one session of the full model at 48 kHz: %zu bytes\n", held);
    EXPECT_LE(held, std::size_t{256} << 10);
    EXPECT_GT(held, std::size_t{16} << 10);
    for (int i = 0; i < 1000; ++i) openNc(48000, 48000, 10, "c6");
    auto const sound = voice(48000, 0.05, 1);
    EXPECT_EQ(cleanAll(openNc(48000, 48000, 10, "c6"), sound), cleanAll(first, sound));
}

namespace {

// Calls `call` with its first, second, ... allocation failing until one call meets no failure any
// more. A failed call must leave no memory behind; a successful one is followed by `undo`.
void failEachAllocation(char const* what, std::function<int()> const& call,
                        std::function<void()> const& undo) {
    std::size_t n = 0;
    for (bool fired = true; fired;) {
        std::size_t kept = 0;
        int const result = observe([&] {
                               auto const live = test_support::allocations - test_support::releases;
                               failingAllocation = ++n;
                               int const code = call();
                               fired = failingAllocation == 0;
                               failingAllocation = 0;
                               kept = test_support::allocations - test_support::releases - live;
                               return code;
                           }).result;
        if (result == 0) {
            observe([&] { return undo(), 0; });
            continue;
        }
        // A stream may take a failure for bad data.
        EXPECT_TRUE(result == -2 || result == 2) << what << " " << n << ": " << result;
        EXPECT_TRUE(fired) << what << " fails although allocation " << n << " is not reached";
        EXPECT_EQ(kept, 0U) << what << " keeps memory when allocation " << n << " fails";
    }
    EXPECT_GT(n, 2U) << what;
}

}  // namespace

TEST(AllocationFailure, IsReportedLeaksNothingAndTheEngineGoesOn) {
    test_support::TempDir dir;
    dir.write("a.mvw", randomNcWeight({}));
    dir.write("a.cfg", "WEIGHT a.mvw\nMORVA_SMOOT_COEF_v0_0_6 0.5\n");
    auto const folder = dir.path().wstring();
    failEachAllocation(
        "init", [&] { return Morva_SDK_GlobalInit(folder.c_str(), 0); }, Morva_SDK_GlobalDestroy);

    Engine engine(folder.c_str());
    auto const blob = randomNcWeight({.timeStamp = "x"});
    auto const sound = voice(16000, 0.1, 1);
    Engine::add("nc", blob);
    Engine::add("vad", test_support::randomVadWeight({}));
    Engine::add("db", randomNcWeight({.version = "0.0.5"}));
    ASSERT_EQ(Engine::addFile("a.cfg", "file").result, 0);
    auto const cleaned = [&](std::string const& model) {
        return cleanAll(openNc(16000, 16000, 10, model.c_str()), sound);
    };
    // What is registered in spite of a failure must be whole.
    std::string name = "n";
    auto const whole = [&](std::vector<float> const& wanted) {
        return [&, wanted] {
            EXPECT_EQ(cleaned(name), wanted);
            name += "+";
        };
    };
    auto const wanted = cleaned("nc");
    auto const size = static_cast<unsigned>(blob.size());
    failEachAllocation(
        "memory", [&] { return Morva_SDK_SetModel_Blob(blob.data(), size, name.c_str()); },
        whole(wanted));
    failEachAllocation(
        "control file", [&] { return Morva_SDK_SetModel(L"a.cfg", name.c_str()); },
        whole(cleaned("file")));

    auto const failOpening = [](char const* what, auto open, auto close) {
        void* session = open();  // makes what the model's sessions share
        close(session);
        failEachAllocation(
            what, [&] { return (session = open()) != nullptr ? 0 : -2; },
            [&] { EXPECT_EQ(close(session), 0); });
    };
    failOpening(
        "noise", [] { return openNc(44100, 48000, 10, "nc"); }, Morva_NC_CloseSession);
    failOpening(
        "voice", [] { return Morva_VAD_CreateSession(rate(44100), duration(10), "vad"); },
        Morva_VAD_CloseSession);
    failOpening(
        "level", [] { return Morva_NoiseDB_CreateSession(rate(44100), duration(10), "db"); },
        Morva_NoiseDB_CloseSession);
    EXPECT_EQ(cleaned("nc"), wanted);
}

// The first session of a model makes the objects that all of them share.
TEST(AllocationFailure, OfAFirstSessionIsMadeUpForByTheNext) {
    auto const sound = voice(16000, 0.1, 1);
    std::vector<float> wanted;
    bool fired = true;
    for (std::size_t n = 0; n == 0 || fired; ++n) {
        Engine engine;
        Engine::add("nc", randomNcWeight({}));
        observe([&] {
            failingAllocation = n;
            openNc(48000, 44100, 10, "nc");
            fired = failingAllocation == 0;
            return failingAllocation = 0;
        });
        auto const got = cleanAll(openNc(16000, 16000, 10, "nc"), sound);
        if (n == 0) wanted = got;
        ASSERT_EQ(got, wanted) << n;
    }
}
