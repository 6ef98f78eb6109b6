#include "utils/diagnostics.h"

#include <atomic>
#include <iostream>

namespace MORVA::UTILS {
namespace {

std::atomic<DiagnosticTaker> current{nullptr};

}  // namespace

void takeDiagnostics(DiagnosticTaker taker) noexcept {
    current.store(taker, std::memory_order_release);
}

void say(Channel channel, char const* text, char const* end) noexcept {
    try {
        if (auto* const taker = current.load(std::memory_order_acquire)) {
            taker(static_cast<int>(channel), text);
            return;
        }
        (channel == Channel::output ? std::cout : std::cerr) << text << end << std::flush;
    } catch (...) {  // a stream that throws is set up by the host; there is nobody left to tell
    }
}

}  // namespace MORVA::UTILS
