// Hand-over of the plugin's one engine between threads, with a stand-in for the engine that takes
// its time to end.
#include "shared_engine.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <memory>
#include <thread>

namespace {
std::atomic<bool> alive = false;
std::atomic<bool> ending = false;
}  // namespace

extern "C" {
int Morva_SDK_GlobalInit(wchar_t const*, unsigned) {
    return alive.exchange(true) ? -3 : 0;
}
int Morva_SDK_GlobalDestroy() {
    ending = true;
    ending.notify_all();
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
    return alive.exchange(false) ? 0 : -3;
}
int Morva_SDK_SetModel_Blob(char const*, unsigned, char const*) {
    return 0;
}
char const* MorvaExt_LastError() {
    return "two engines at a time";
}
void MorvaExt_SetDiagnostics(void (*)(int, char const*)) {}
}

// The last user in one thread goes while the first in another comes.
TEST(SharedEngine, EndsBeforeItBeginsAnew) {
    auto last = std::make_unique<morva::plugins::SharedEngine>();
    std::jthread const next([] {
        ending.wait(false);
        EXPECT_NO_THROW(morva::plugins::SharedEngine());
    });
    last.reset();
}
