// Memory: what sessions hold, and what happens when an allocation fails. (That frames take none:
// see reliability.)
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <memory>
#include <type_traits>

#include "engine.h"
#include "support/allocation_counter.h"

using namespace sdk_test;
using test_support::randomNcWeight;
using test_support::randomVadWeight;
using test_support::TempDir;

// What a session holds beside the weights and tables that it shares with the first one.
TEST(SessionMemory, IsSmallBesideTheModel) {
    Engine engine;
    ASSERT_EQ(Engine::addShipped(MORVA_TEST_MODELS "c6.xs.f.ca03f4.mvw", "c6"), 0);
    std::vector<void*> sessions = {openNc(48000, 48000, 10, "c6")};
    std::size_t const before = test_support::heldBytes;
    sessions.push_back(openNc(48000, 48000, 10, "c6"));
    std::size_t const held = test_support::heldBytes - before;
    std::printf("[   memory ] one session of the full model at 48 kHz: %zu bytes\n", held);
    EXPECT_LE(held, std::size_t{256} << 10);
    EXPECT_GT(held, std::size_t{16} << 10);
    for (int i = 0; i < 1000; ++i) sessions.push_back(openNc(48000, 48000, 10, "c6"));
    auto const sound = voice(48000, 0.05, 1);
    auto const wanted = cleanAll(sessions.front(), sound);
    EXPECT_EQ(cleanAll(sessions.back(), sound), wanted);
    for (void* session : sessions) EXPECT_EQ(Morva_NC_CloseSession(session), 0);
}

namespace {

using test_support::failingAllocation;

// Calls `call` with its first, second, ... allocation failing until one call meets no failure any
// more. A failed call must leave no memory behind; a successful one is given to `undo`.
template <class Call, class Undo>
void failEachAllocation(char const* what, Call call, Undo undo) {
    std::size_t n = 0;
    for (bool fired = true; fired;) {
        std::ptrdiff_t kept = 0;
        auto const result = observe([&] {
                                auto const live =
                                    test_support::allocations - test_support::releases;
                                failingAllocation = ++n;
                                auto const code = call();
                                fired = failingAllocation == 0;
                                failingAllocation = 0;
                                kept = static_cast<std::ptrdiff_t>(test_support::allocations -
                                                                   test_support::releases - live);
                                return code;
                            }).result;
        bool succeeded = false;
        if constexpr (std::is_pointer_v<decltype(call())>) {
            succeeded = result != nullptr;
        } else {
            succeeded = result == 0;
            // A stream may take a failure for bad data.
            EXPECT_TRUE(succeeded || result == -2 || result == 2)
                << what << " " << n << ": " << result;
        }
        if (succeeded) {
            undo(result);
        } else {
            EXPECT_TRUE(fired) << what << " fails although allocation " << n << " is not reached";
            EXPECT_EQ(kept, 0) << what << " keeps memory when allocation " << n << " fails";
        }
    }
    std::printf("[ failures ] %s: %zu allocations\n", what, n - 1);
    EXPECT_GT(n, 2U) << what;
}

}  // namespace

TEST(AllocationFailure, IsReportedLeaksNothingAndTheEngineGoesOn) {
    TempDir dir;
    dir.write("a.mvw", randomNcWeight({}));
    dir.write("a.cfg", "WEIGHT a.mvw\nMORVA_SMOOT_COEF_v0_0_6 0.5\n");
    auto const folder = dir.path().wstring();
    failEachAllocation(
        "init", [&] { return Morva_SDK_GlobalInit(folder.c_str(), 0); },
        [](int) { EXPECT_EQ(Morva_SDK_GlobalDestroy(), 0); });

    Engine engine(folder.c_str());
    auto const sound = voice(16000, 0.1, 1);
    ASSERT_EQ(Engine::add("nc", randomNcWeight({.timeStamp = "x"})), 0);
    auto const wanted = cleanAll(openNc(16000, 16000, 10, "nc"), sound);
    auto const blob = randomNcWeight({.timeStamp = "x"});
    std::string name;
    int taken = 0;
    auto const nextName = [&] { return (name = "n" + std::to_string(++taken)).c_str(); };
    nextName();
    failEachAllocation(
        // What is registered in spite of a failure must be whole.
        "memory",

        [&] {
            return Morva_SDK_SetModel_Blob(blob.data(), static_cast<unsigned>(blob.size()),
                                           name.c_str());
        },
        [&](int) {
            auto* const session =
                observe([&] { return openNc(16000, 16000, 10, name.c_str()); }).result;
            ASSERT_NE(session, nullptr);
            EXPECT_EQ(cleanAll(session, sound), wanted);
            nextName();
        });
    for (wchar_t const* file : {L"a.mvw", L"a.cfg"}) {
        nextName();
        failEachAllocation(
            file == std::wstring(L"a.mvw") ? "weight file" : "control file",
            [&] { return Morva_SDK_SetModel(file, name.c_str()); },
            [&](int) {
                EXPECT_NE(observe([&] { return openNc(16000, 16000, 10, name.c_str()); }).result,
                          nullptr);
                nextName();
            });
    }

    ASSERT_EQ(Engine::add("vad", randomVadWeight({})), 0);
    ASSERT_EQ(Engine::add("db", randomNcWeight({.version = "0.0.5"})), 0);
    auto const vadOpen = [] { return Morva_VAD_CreateSession(rate(44100), duration(10), "vad"); };
    auto const dbOpen = [] { return Morva_NoiseDB_CreateSession(rate(44100), duration(10), "db"); };
    Morva_VAD_CloseSession(vadOpen());  // makes what the model's sessions share
    Morva_NoiseDB_CloseSession(dbOpen());
    failEachAllocation(
        "noise session", [] { return openNc(44100, 48000, 10, "nc"); },
        [](void* s) { EXPECT_EQ(Morva_NC_CloseSession(s), 0); });
    failEachAllocation("voice session", vadOpen,
                       [](void* s) { EXPECT_EQ(Morva_VAD_CloseSession(s), 0); });
    failEachAllocation("level session", dbOpen,
                       [](void* s) { EXPECT_EQ(Morva_NoiseDB_CloseSession(s), 0); });
    EXPECT_EQ(cleanAll(openNc(16000, 16000, 10, "nc"), sound), wanted);
}

// The first session of a model makes the objects that all of them share.
TEST(AllocationFailure, OfAFirstSessionIsMadeUpForByTheNext) {
    auto const sound = voice(16000, 0.1, 1);
    std::vector<float> wanted;
    for (std::size_t n = 0;; ++n) {
        Engine engine;
        ASSERT_EQ(Engine::add("nc", randomNcWeight({})), 0);
        bool fired = false;
        observe([&] {
            failingAllocation = n;
            openNc(48000, 44100, 10, "nc");
            fired = failingAllocation == 0;
            failingAllocation = 0;
            return 0;
        });
        auto const got = cleanAll(openNc(16000, 16000, 10, "nc"), sound);
        if (n == 0) wanted = got;
        ASSERT_EQ(got, wanted) << n;
        if (!fired) break;
    }
}
