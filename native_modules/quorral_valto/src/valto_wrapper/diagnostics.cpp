#include "native_modules/quorral_valto/src/valto_wrapper/diagnostics.h"

#include <unistd.h>

#include <atomic>
#include <cstdio>

namespace quorral {
namespace {

std::atomic<MorvaExtDiagnostic> gTake{nullptr};

}  // namespace

void Say(const std::string& line) {
    if (const MorvaExtDiagnostic take = gTake.load(std::memory_order_acquire)) {
        take(STDOUT_FILENO, line.c_str());
    } else {
        std::puts(line.c_str());
        std::fflush(stdout);
    }
}

void TakeDiagnostics(MorvaExtDiagnostic take) {
    gTake.store(take, std::memory_order_release);
    MorvaExt_SetDiagnostics(take);
}

}  // namespace quorral
