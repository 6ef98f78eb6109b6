// Counts the engine calls in flight; closing waits for zero.
#include "native_modules/quorral_valto/src/valto_wrapper/process_gate.h"

#include <atomic>
#include <chrono>
#include <thread>

namespace quorral {
namespace {

std::atomic<unsigned> gInFlight{0};
std::atomic<bool> gClosed{false};

// A frame takes well under a millisecond; a call that has not come back after this long hangs, and
// then so would the exit.
constexpr auto kLongestWait = std::chrono::seconds(2);
constexpr auto kPoll = std::chrono::microseconds(100);

}  // namespace

// The count goes up before the flag is read and the flag is set before the count is read, both in
// the one total order: either the call sees the closed gate or the closing sees the call.
ProcessGate::Pass::Pass() : entered_(true) {
    gInFlight.fetch_add(1);
    if (gClosed.load()) {
        gInFlight.fetch_sub(1);
        entered_ = false;
    }
}

ProcessGate::Pass::~Pass() {
    if (entered_) gInFlight.fetch_sub(1);
}

void ProcessGate::Close() {
    if (gClosed.exchange(true)) return;  // waited for already
    const auto deadline = std::chrono::steady_clock::now() + kLongestWait;
    while (gInFlight.load() != 0 && std::chrono::steady_clock::now() < deadline) {
        std::this_thread::sleep_for(kPoll);
    }
}

}  // namespace quorral
