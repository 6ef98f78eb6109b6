// The resampling library may fail to open a filter: the session is refused with the engine's code,
// nothing leaks (see the address-sanitizer preset), and the engine goes on working.
#include "morva-sdk/engine.h"

using namespace sdk_test;

namespace {
int failingOpen = 0;  // which call from now on answers with null; 0: none
}

extern "C" {
void* __real_resample_open(int, double, double);
void* __wrap_resample_open(int quality, double low, double high) {
    return failingOpen != 0 && --failingOpen == 0 ? nullptr
                                                  : __real_resample_open(quality, low, high);
}
}

TEST(ResampleOpen, EachFailureRefusesTheSessionAndNothingElse) {
    Engine engine;
    Engine::addIdentity("identity", 16000, 20);
    auto const open = [] { return openNc(48000, 44100, 10, "identity"); };
    auto const sound = voice(48000, 0.2, 1);
    auto const wanted = cleanAll(open(), sound);
    int n = 0;
    for (bool fired = true; fired;) {
        failingOpen = ++n;
        auto const opened = observe(open);
        fired = failingOpen == 0;
        failingOpen = 0;
        EXPECT_EQ(opened.result == nullptr, fired);
        if (fired) EXPECT_THAT(opened.err, ::testing::HasSubstr("could not be opened"));
        EXPECT_EQ(cleanAll(open(), sound), wanted);
    }
    EXPECT_GT(n, 2);
}
