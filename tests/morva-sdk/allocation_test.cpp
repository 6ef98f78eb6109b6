// Memory: what sessions hold, and what happens when an allocation fails. (That frames take none:
// see reliability.)
#include <gtest/gtest.h>

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
    Engine::add("band", randomNcWeight({.version = "NC_1.0.0",
                                        .sampleRate = 48000,
                                        .frameLength = 960,
                                        .compressRate = 3,
                                        .hidden = 32,
                                        .gates = 16,
                                        .groupBands = 5}));
    for (char const* model : {"c6", "band"}) {
        openNc(48000, 48000, 10, model);
        std::size_t const before = test_support::heldBytes;
        openNc(48000, 48000, 10, model);
        std::size_t const held = test_support::heldBytes - before;
        EXPECT_LE(held, std::size_t{256} << 10) << model;
        EXPECT_GT(held, std::size_t{16} << 10) << model;
    }
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
    failEachAllocation(
        "init", [] { return Morva_SDK_GlobalInit(L"/folder", 0); }, Morva_SDK_GlobalDestroy);
    Engine engine;
    Engine::add("nc", randomNcWeight({}));
    auto const blob = randomNcWeight({.timeStamp = "x"});
    auto const sound = voice(16000, 0.1, 1);
    auto const cleaned = [&](std::string const& model) {
        return cleanAll(openNc(16000, 16000, 10, model.c_str()), sound);
    };
    auto const wanted = cleaned("nc");
    // What is registered in spite of a failure must be whole.
    std::string name = "n";
    failEachAllocation(
        "memory",
        [&] {
            auto const size = static_cast<unsigned>(blob.size());
            return Morva_SDK_SetModel_Blob(blob.data(), size, name.c_str());
        },
        [&] {
            EXPECT_EQ(cleaned(name), wanted);
            name += "+";
        });
    auto const open = [] { return openNc(44100, 48000, 10, "nc"); };
    void* session = open();  // makes what the model's sessions share
    failEachAllocation(
        "session", [&] { return (session = open()) != nullptr ? 0 : -2; },
        [&] { EXPECT_EQ(Morva_NC_CloseSession(session), 0); });
    EXPECT_EQ(cleaned("nc"), wanted);
}
